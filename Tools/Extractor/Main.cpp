// Varnex <zarvowebfile>: takes the argument, runs ExtractArchive between start-up and clean-up, and exits with 0 when
// every entry was written, with 1 otherwise.
#include "Footing/Process.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tools/Extractor/Extractor.h"

#include <csignal>
#include <cstdio>
#include <cstdlib>

int main(int argumentCount, char** arguments) {
    // Comes first: a file that is opened while descriptor 1 is closed would become the standard output.
    ZarvoClassic::Footing_Process_OpenStandardDescriptors();
    // A closed stdout must not end the extraction (SIGPIPE). A file that hits the size limit fails like one on a full
    // disk (SIGXFSZ).
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
