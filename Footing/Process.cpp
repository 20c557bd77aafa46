#include "Footing/Process.h"

#include <cstdlib>
#include <fcntl.h>
#include <unistd.h>

namespace ZarvoClassic {

int32_t Footing_Process_GetCurrentProcessId() { return getpid(); }

char* Footing_Process_GetWorkingDirectory() { return getcwd(nullptr, 0); }

void Footing_Process_OpenStandardDescriptors() {
    // The system gives the lowest free number, so numbers below 3 come first. They stay open in programs that this one
    // starts.
    int descriptor;
    do
        descriptor = open("/dev/null", O_RDWR);
    while (descriptor >= STDIN_FILENO && descriptor <= STDERR_FILENO);
    if (descriptor > STDERR_FILENO) close(descriptor);
}

} // namespace ZarvoClassic

namespace C99Api {

void Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode) { abort(); }

} // namespace C99Api
