// The local disk on a POSIX system. Operations hand the entry's path to system calls, so relative paths are relative to
// the process's working directory. A call that a signal interrupts is repeated.
//
// Open, Read, Write, Close and CreateAsDir leave lastError in the entry, AtomicMove in from, and SynchronizeMode in the
// entry whose call failed; other operations change it only by calling these. Any thread: the only shared data is the
// home folder, which does not change.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemHandler.h"

struct stat;

class LocalFileSystemPosix : public LocalFileSystemHandler {
public:
    // Takes the home folder from "HOME", or from the password database when that is unset.
    LocalFileSystemPosix();

    // Contents. The handlerState of an open entry is a heap cell of one int: the descriptor, or -1 after a failed Open.
    // The position is the descriptor's own. Open does not close an entry that is already open.
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override;
    bool Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
              FileReadFlags flags) override;
    // One system call: a short count is a success, the end of the file a failure.
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override;
    bool Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer, UInt64* written) override;
    bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) override;
    bool Close(FileEntryData& entry) override;
    bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position(const FileEntryData& entry) const override;
    bool SetLength(FileEntryData& entry, VFS::FileSize length) override; // by path; the file need not be open
    VFS::FileSize Size(const FileEntryData& entry) const override;       // by path; 0 when unknown

    // Attributes.
    bool IsDir(const FileEntryData& entry) const override;
    bool IsFile(const FileEntryData& entry) const override; // anything that exists but a folder
    bool IsHidden(const FileEntryData& entry) const override;
    bool IsSymLink(const FileEntryData& entry) const override;
    bool IsReadOnly(const FileEntryData& entry) const override; // does not follow links
    bool Exists(const FileEntryData& entry) const override;
    DateTime LastModified(const FileEntryData& entry) const override; // whole seconds; 0 when unknown
    bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) override;
    // Takes away every right to write, or gives the owner's back. The new mode is computed from the path's own mode,
    // even if that is a link, and set on what the path leads to.
    bool SetReadOnly(FileEntryData& entry, bool readOnly) override;
    bool Touch(FileEntryData& entry) override;
    bool SetFileTimeStamp(FileEntryData& entry, const DateTime& time) override;
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override;
    // The same, from a status of the entry's path that the caller already has.
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, const struct stat& status, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const;

    // Files and folders.
    bool CreateAsFile(FileEntryData& entry) override;
    bool CreateAsDir(FileEntryData& entry) override; // the last component only
    // Deletes a link, never its target. With recursive, deletes as much of a folder as it can; it leaves children whose
    // path doesn't survive in an entry (too long, or with a backslash in the name). True when the path itself was
    // deleted.
    bool Delete(FileEntryData& entry, bool recursive) override;
    bool Target(const FileEntryData& entry, FileSystemEntry& target) const override;
    // Advisory, per descriptor. A closed entry is opened with kFilePermissionReadWrite first. If the lock can't be
    // taken, the entry is closed, even if the caller had opened it. kFileLockUnlock unlocks and closes.
    bool Lock(FileEntryData& entry, FileLockMode mode) override;
    // True when the file is locked through another descriptor, or can't be opened; for a folder, when that holds for
    // any of its entries.
    bool IsLocked(const FileEntryData& entry) override;
    bool AtomicMove(FileEntryData& from, FileEntryData& to) override;
    // Copies the contents and mode of a file. False when from and to are the same file.
    bool Copy(FileEntryData& from, FileEntryData& to) override;
    static bool SynchronizeMode(const FileEntryData& from, const FileEntryData& to);
    // Depth first, a folder before its contents, in the system's order. Links to folders are followed, except into a
    // folder that the listing is already inside.
    bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                   FileEnumerationFlag flags) const override;

    // Paths.
    core::string ToAbsolute(core::string_ref path) const override; // expands a leading "~"
    bool Parent(const FileEntryData& entry, core::string& parent) const override;
    const char* Filename(const FileEntryData& entry) const override;
    core::string GetApplicationPath() const override;
    core::string GetApplicationFolder() const override;
    core::string GetApplicationManagedPath() const override;
    core::string GetApplicationContentsPath() const override;
    core::string GetUserAppCacheFolder() const override; // created
    core::string GetUserAppDataFolder() const override;
    core::string GetUserConfigFolder() const override; // created
    bool GetAvailableDiskSpace(const char* path, UInt64& bytes) const override;

private:
    core::string m_HomeFolder;
};

// The lastError for an errno value; kFileSystemErrorNone for 0.
FileSystemError FileSystemErrorFromErrno(int error);

// Whether an enumeration with these flags skips a name. Any thread.
bool FlaggedAsSkipped(bool isDirectory, bool isHidden, core::string_ref name, FileEnumerationFlag flags);
