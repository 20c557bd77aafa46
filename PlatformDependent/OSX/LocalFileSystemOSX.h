// The local back end of macOS: the POSIX one, with the platform's own services where it has them. Folders are listed in
// bulk, a file flag marks files as hidden, the platform's file manager and workspace create, copy and trash files, and
// the platform names the folders of the application and the user.
//
// No operation here records a lastError. Any thread. Differences from the POSIX back end:
//  - The platform's services take only valid UTF-8. Other paths are listed, but can't be created, copied or trashed.
//  - A name that starts with "." is listed as hidden, but filters and IsHidden look at the file flag only.
//  - A folder that can't be opened is listed as empty, with success.
//  - A listed folder has size 0. A listed link that does not lead to a folder has the size and time of the link itself.
//    No listed entry is marked read-only.
//  - A relative path is listed from the process's working directory. The listed paths are relative too if that is the
//    file system's current directory or lies in it; if the current directory is empty, they only lose the leading "/".
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"

class LocalFileSystemOSX : public LocalFileSystemPosix {
public:
    ~LocalFileSystemOSX() override;

    bool IsHidden(const FileEntryData& entry) const override;

    // Only kFileEntryIsHidden counts, in mask and in flags. A bit in flags is set even if mask does not hold it.
    bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) override;

    bool CreateAsFile(FileEntryData& entry) override;

    // Trashes the target of a link. The entry's path becomes the resolved one, even on failure. A resolved path that is
    // too long for an entry, not valid UTF-8, contains a backslash, or is "/" is refused. What the trash refuses is
    // deleted. True when the path is gone.
    bool MoveToTrash(FileEntryData& entry) override;

    // Always true: the target need not exist. A resolved path that is too long for an entry is cut.
    bool Target(const FileEntryData& entry, FileSystemEntry& target) const override;

    // Copies folders too, with their contents. False when the destination exists.
    bool Copy(FileEntryData& from, FileEntryData& to) override;

    bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                   FileEnumerationFlag flags) const override;

    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override;

    core::string GetApplicationPath() const override;   // the bundle, cached under a lock
    core::string GetApplicationFolder() const override; // the folder that holds it
    core::string GetApplicationManagedPath() const override;
    core::string GetApplicationContentsPath() const override;
    core::string GetExecutablePath() const override;
    core::string GetUserAppCacheFolder() const override; // not created
    core::string GetUserAppDataFolder() const override;
    core::string GetSharedApplicationDataFolder() const override;

    core::string LastErrorMessage() override; // the text for the current errno
};
