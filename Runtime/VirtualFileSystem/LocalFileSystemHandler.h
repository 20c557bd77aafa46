// What every local back end has in common: it serves every path, and it is the one that is asked for the folders of the
// application and the user, for error texts and for free disk space. The order of the virtual operations is fixed.
#pragma once

#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

class LocalFileSystemHandler : public FileSystemHandler {
public:
    bool CanHandle(core::basic_string_ref<char> path) const override;
    bool IsAbsoluteFilePath(core::basic_string_ref<char> path) const override;
    void InitializeFileEntry(FileEntryData& entry) override;
    void DestroyFileEntry(FileEntryData& entry) override;
    const char* Name() override;
    bool MakeLocal(FileEntryData& entry, bool flag) override;
    bool ToLocal(const FileEntryData& entry, core::basic_string<char>& path, VFS::FileSize& offset,
                 VFS::FileSize& size) const override;
    bool CanConvertToAbsolutePath(core::basic_string_ref<char> path) const override;

    virtual core::basic_string<char> GetApplicationPath() const = 0;
    virtual core::basic_string<char> GetApplicationFolder() const = 0;
    virtual core::basic_string<char> GetApplicationManagedPath() const = 0;
    virtual core::basic_string<char> GetApplicationContentsPath() const = 0;
    virtual core::basic_string<char> GetExecutablePath() const;
    virtual core::basic_string<char> GetUserAppCacheFolder() const = 0;
    virtual core::basic_string<char> GetUserAppDataFolder() const = 0;
    virtual core::basic_string<char> GetUserConfigFolder() const = 0;
    virtual core::basic_string<char> GetSharedApplicationDataFolder() const;
    virtual core::basic_string<char> LastErrorMessage();
    virtual int LastError();
    // Bytes free for unprivileged users; unchanged on failure.
    virtual bool GetAvailableDiskSpace(const char* path, UInt64& bytes) const = 0;

    // See FileSystem::SetCurrentDirectory.
    static core::basic_string<char> SetCurrentDirectory(core::basic_string_ref<char> path);

    static char currentDirectory[kPathBufferSize]; // set at start-up, before other threads use paths
    static char applicationPath[kPathBufferSize];  // nothing here sets it
};

// A new back end for the registry, which owns it: the one place that chooses which.
LocalFileSystemHandler* CreateLocalFileSystem(MemLabelId label);
