// What every local back end has in common: it serves every path, and it is the one that is asked for the folders of the
// application and the user, for error texts and for free disk space. The order of the virtual operations is fixed.
#pragma once

#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

class LocalFileSystemHandler : public FileSystemHandler {
public:
    bool CanHandle(core::string_ref path) const override;
    bool IsAbsoluteFilePath(core::string_ref path) const override;
    void InitializeFileEntry(FileEntryData& entry) override;
    void DestroyFileEntry(FileEntryData& entry) override;
    const char* Name() override;
    bool MakeLocal(FileEntryData& entry, bool flag) override;
    bool ToLocal(const FileEntryData& entry, core::string& path, VFS::FileSize& offset,
                 VFS::FileSize& size) const override;
    bool CanConvertToAbsolutePath(core::string_ref path) const override;

    virtual core::string GetApplicationPath() const = 0;
    virtual core::string GetApplicationFolder() const = 0;
    virtual core::string GetApplicationManagedPath() const = 0;
    virtual core::string GetApplicationContentsPath() const = 0;
    virtual core::string GetExecutablePath() const;
    virtual core::string GetUserAppCacheFolder() const = 0;
    virtual core::string GetUserAppDataFolder() const = 0;
    virtual core::string GetUserConfigFolder() const = 0;
    virtual core::string GetSharedApplicationDataFolder() const;
    virtual core::string LastErrorMessage();
    virtual int LastError();
    // Bytes free for unprivileged users; unchanged on failure.
    virtual bool GetAvailableDiskSpace(const char* path, UInt64& bytes) const = 0;

    // See FileSystem::SetCurrentDirectory.
    static core::string SetCurrentDirectory(core::string_ref path);

    static char currentDirectory[kPathBufferSize]; // set at start-up, before other threads use paths
    static char applicationPath[kPathBufferSize];  // nothing here sets it
};

// A new back end for the registry, which owns it: the one place that chooses which.
LocalFileSystemHandler* CreateLocalFileSystem(MemLabelId label);
