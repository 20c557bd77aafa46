// Runs the program that ARCHITECTURE.md shows with a back end that is derived from the library's, and says who was
// asked.
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <cstdio>
#include <typeinfo>

class CountingFileSystem : public LocalFileSystemPosix {
public:
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        ++opened;
        return LocalFileSystemPosix::Open(entry, permission, behavior);
    }

    int opened = 0;
};

static int RunShownProgram() {
#include <ShownProgram.inc>
    return 0;
}

int RunPlugin() {
    CountingFileSystem fileSystem;
    GetFileSystem()->RegisterHandler(&fileSystem);
    const int status = RunShownProgram();

    FileSystemHandler* handler = GetFileSystem()->GetHandlerForPath("game.zarvo");
    printf("%s opened %d for %s\n", typeid(*handler).name(), fileSystem.opened, typeid(ArchiveStorageReader).name());
    if (dynamic_cast<LocalFileSystemPosix*>(handler) != &fileSystem) printf("and is no local back end\n");
    GetFileSystem()->UnregisterHandler(&fileSystem);
    return status;
}
