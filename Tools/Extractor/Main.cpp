// Varnex <zarvowebfile>: the argument, start-up and clean-up around the road, and the exit status: 0 when every entry
// was written, 1 otherwise.
#include "Footing/Process.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tools/Extractor/Extractor.h"

#include <csignal>
#include <cstdio>
#include <cstdlib>

int main(int argumentCount, char** arguments) {
    // First of all, so that no file of ours becomes the standard output.
    ZarvoClassic::Footing_Process_OpenStandardDescriptors();
    // Who stops listening to our messages does not stop the extraction, and a file that grows past a limit is one that
    // can't be written.
    signal(SIGPIPE, SIG_IGN);
    signal(SIGXFSZ, SIG_IGN);

    if (argumentCount < 2) {
        puts("Usage: Varnex <zarvowebfile>");
        return 1;
    }
    const char* const archivePath = arguments[1];
    printf("Extracting file '%s'...\n", archivePath);
    if (char* workingDirectory = ZarvoClassic::Footing_Process_GetWorkingDirectory()) {
        GetFileSystem()->SetCurrentDirectory(workingDirectory);
        free(workingDirectory);
    }
    RegisterRuntimeInitializeAndCleanup::ExecuteInitializations();
    const bool isAllOk = ExtractArchive(archivePath);
    RegisterRuntimeInitializeAndCleanup::ExecuteCleanup();
    return isAllOk ? 0 : 1;
}
