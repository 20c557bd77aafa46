// What every local back end has in common. It serves every path, and also answers for the folders of the application
// and the user, error texts and free disk space. The order of the virtual operations is fixed.
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
    // Stores the bytes free for unprivileged users; on failure bytes is unchanged.
    virtual bool GetAvailableDiskSpace(const char* path, UInt64& bytes) const = 0;

    // See FileSystem::SetCurrentDirectory.
    static core::string SetCurrentDirectory(core::string_ref path);

    static char currentDirectory[kPathBufferSize]; // set before a second thread uses paths
    static char applicationPath[kPathBufferSize];  // empty unless the embedding program sets it
};

// Makes the back end that the registry will own. Linking decides which class it is.
LocalFileSystemHandler* CreateLocalFileSystem(MemLabelId label);
