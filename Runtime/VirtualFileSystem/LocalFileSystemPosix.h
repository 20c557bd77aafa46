// The local disk on a POSIX system. Operations work on the entry's path with the operating system's calls, so relative
// paths are relative to the process's working directory. Every call that a signal interrupts is repeated.
//
// lastError is recorded by Open, Read, Write, Close and CreateAsDir in the entry, by AtomicMove in from, and by
// SynchronizeMode in the one whose call failed; other operations change it only by calling these. Any thread: nothing
// here is shared but the home folder, which does not change.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemHandler.h"

struct stat;

class LocalFileSystemPosix : public LocalFileSystemHandler {
public:
    // Learns the home folder: "HOME", or else what the password database says of the real user.
    LocalFileSystemPosix();

    // Contents. An open entry's handlerState is a heap cell of one int: the descriptor, -1 after a failed open. The
    // position is the descriptor's own. Open does not close what the entry had open before.
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override;
    bool Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
              FileReadFlags flags) override;
    // One system call: a short count is a success, the end of the file is not.
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override;
    bool Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer, UInt64* written) override;
    bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) override;
    bool Close(FileEntryData& entry) override;
    bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position(const FileEntryData& entry) const override;
    bool SetLength(FileEntryData& entry, VFS::FileSize length) override; // by path; the file need not be open
    VFS::FileSize Size(const FileEntryData& entry) const override;       // by path; 0 when it can't be told

    // Attributes.
    bool IsDir(const FileEntryData& entry) const override;
    bool IsFile(const FileEntryData& entry) const override; // whatever is there and no folder
    bool IsHidden(const FileEntryData& entry) const override;
    bool IsSymLink(const FileEntryData& entry) const override;
    bool IsReadOnly(const FileEntryData& entry) const override; // of a link itself
    bool Exists(const FileEntryData& entry) const override;
    DateTime LastModified(const FileEntryData& entry) const override; // whole seconds; 0 when it can't be told
    bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) override;
    // Sets the mode that the path itself has, of a link too, on what the path leads to. Only the owner's right to
    // write comes back.
    bool SetReadOnly(FileEntryData& entry, bool readOnly) override;
    bool Touch(FileEntryData& entry) override;
    bool SetFileTimeStamp(FileEntryData& entry, const DateTime& time) override;
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override;
    // Fills info from a status that the caller has obtained of the entry's path.
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, const struct stat& status, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const;

    // Files and folders.
    bool CreateAsFile(FileEntryData& entry) override;
    bool CreateAsDir(FileEntryData& entry) override; // the last component alone
    // A link is deleted, never what it leads to. What can't be deleted is left; so are children whose path an entry
    // would change: one that it cuts, and a name with a backslash.
    bool Delete(FileEntryData& entry, bool recursive) override;
    bool Target(const FileEntryData& entry, FileSystemEntry& target) const override;
    // Advisory, per descriptor. Opens the entry (creating, or emptying a file that can't be opened to read) when it is
    // closed; a lock that is not had closes it, even one that the caller had opened.
    bool Lock(FileEntryData& entry, FileLockMode mode) override;
    // Somebody holds a lock on the file, or it can't be opened; of a folder, whether that is so of one entry in it.
    bool IsLocked(const FileEntryData& entry) override;
    bool AtomicMove(FileEntryData& from, FileEntryData& to) override;
    // Contents and mode of a file. A file is never copied onto itself.
    bool Copy(FileEntryData& from, FileEntryData& to) override;
    static bool SynchronizeMode(const FileEntryData& from, const FileEntryData& to);
    // Depth first, a folder before what it holds, in the order that the system gives. Links to folders are followed,
    // but not into a folder that the listing is already inside.
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

// What an errno value means to those who read lastError.
FileSystemError FileSystemErrorFromErrno(int error);

// Whether an enumeration with these flags leaves out a name. Any thread.
bool FlaggedAsSkipped(bool isDirectory, bool isHidden, core::string_ref name, FileEnumerationFlag flags);
