// The local back end of macOS: the POSIX one with what the platform has services of its own for. Folders are listed in
// bulk, the hidden mark is a file flag, files are made, copied and thrown away by the platform's file manager and
// workspace, and the folders of application and user are the platform's.
//
// No operation here records a lastError. Any thread, as for the POSIX back end. Where it differs from that one:
//  - a path that is not valid UTF-8, which the platform's own disks do not hold, can't be handed to its services. It is
//    listed as it stands, but nothing is made, copied or thrown away there;
//  - a name that starts with "." is listed as hidden, but only the file flag counts for the filters and for IsHidden;
//  - a folder that can't be opened is listed as empty, with success; a listed folder has size 0, and a listed link that
//    does not lead to a folder the size and time of the link itself; no listed entry is ever marked read-only;
//  - a relative listing is relative to the process's working directory, and its paths are relative again when that is,
//    or lies in, the file system's current directory. With an empty current directory they lose their "/" alone.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"

class LocalFileSystemOSX : public LocalFileSystemPosix {
public:
    ~LocalFileSystemOSX() override;

    bool IsHidden(const FileEntryData& entry) const override;

    // Of mask and flags only kFileEntryIsHidden counts; a bit in flags is set whether or not mask holds it.
    bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) override;

    bool CreateAsFile(FileEntryData& entry) override;

    // Of a link, what it leads to goes to the trash. The entry's path becomes the resolved one, also on failure; when
    // that is longer than an entry holds it is cut and nothing is thrown away, nor is what is not valid UTF-8, has a
    // backslash, or is "/". What the trash does not take is deleted. True when the path is gone.
    bool MoveToTrash(FileEntryData& entry) override;

    // Always true: the target need not exist. A path that is longer than an entry holds is cut.
    bool Target(const FileEntryData& entry, FileSystemEntry& target) const override;

    // Copies folders too, with their contents; false when the destination exists.
    bool Copy(FileEntryData& from, FileEntryData& to) override;

    bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                   FileEnumerationFlag flags) const override;

    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override;

    core::string GetApplicationPath() const override;   // the bundle; takes a lock of its own
    core::string GetApplicationFolder() const override; // the folder that holds it
    core::string GetApplicationManagedPath() const override;
    core::string GetApplicationContentsPath() const override;
    core::string GetExecutablePath() const override;
    core::string GetUserAppCacheFolder() const override; // not created
    core::string GetUserAppDataFolder() const override;
    core::string GetSharedApplicationDataFolder() const override;

    core::string LastErrorMessage() override; // of errno as it stands
};
