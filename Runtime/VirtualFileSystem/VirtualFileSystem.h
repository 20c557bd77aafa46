// The virtual file system: a registry that finds the handler of a path, entries that ask questions about a path, and
// accessors that open it.
//
//   FileAccessor file;
//   if (!file.Open("archive.zarvo", kFilePermissionRead)) return;
//   UInt64 count = 0;
//   if (!file.Read(sizeof(buffer), buffer, &count)) return;   // false: failed, or nothing left
//
// The registry may be used from any thread once it exists (make the first call of GetFileSystem before a second thread
// starts); the current directory is set before that too. An entry or accessor belongs to one thread at a time.
#pragma once

#include "Runtime/Allocator/MemLabel.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Threads/ThreadAnnotations.h"
#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

class LocalFileSystemHandler;
class ReadWriteLock;

// Paths that no registered handler claims are served by the local back end.
class FileSystem : private NonCopyable {
public:
    explicit FileSystem(MemLabelId label);
    ~FileSystem() = delete; // lives until the process ends

    // Never null.
    FileSystemHandler* GetHandlerForPath(core::string_ref path) const;

    // The path from the root; "." and ".." are not resolved. Empty when a handler makes nothing of the path, and when
    // memory is refused.
    core::string ToAbsolute(core::string_ref path) const;
    // The same, and whether the local back end has answered, because no registered handler did.
    core::string ToAbsolute(core::string_ref path, bool* isLocal) const;

    // The directory that ToAbsolute puts before relative paths (cut at kMaxPathLength); returns the one before it.
    // The process's working directory is not changed.
    core::string SetCurrentDirectory(core::string_ref path);
    core::string CurrentDirectory() const;

    bool Delete(core::string_ref path, bool recursive) const;
    bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                   FileEnumerationFlag flags) const;
    core::string LastErrorMessage() const;

    // Puts a handler before those there are, and takes one out. The handler stays the caller's, and must outlive its
    // registration and every entry bound to it. What it answers about paths (CanHandle, IsAbsoluteFilePath,
    // CanConvertToAbsolutePath, ToAbsolute) is asked under the registry's lock: there it must not use the registry.
    void RegisterHandler(FileSystemHandler* handler);
    void UnregisterHandler(FileSystemHandler* handler);

private:
    FileSystemHandler* defaultHandler;
    LocalFileSystemHandler* localHandler; // the same object as defaultHandler, owned
    dynamic_array<FileSystemHandler*> handlers VARNEX_GUARDED_BY(*handlersLock); // in order of registration
    ReadWriteLock* handlersLock;                                                 // owned
};

// The one registry; made by the first call and never destroyed.
FileSystem* GetFileSystem();
extern FileSystem* gFileSystem; // null until then

// A path bound to its handler. Copies are bound anew and never open.
class FileSystemEntry : public FileEntryData {
public:
    FileSystemEntry() = default;
    explicit FileSystemEntry(core::string_ref path);
    FileSystemEntry(const FileEntryData& other);
    FileSystemEntry(const FileSystemEntry& other);
    FileSystemEntry& operator=(const FileSystemEntry& other);

    // Binds the entry to another path: cut at kMaxPathLength, every backslash turned into "/".
    void Set(core::string_ref path);
    const char* Path() const { return path; }

    // Without a handler, all of these answer false (or 0, or a default DateTime).
    bool Exists() const;
    bool IsDir() const;
    bool IsFile() const;
    bool IsLocked();
    bool CreateAsDir();
    bool SetFlags(UInt32 mask, UInt32 flags);
    FileEntryInfoQueryFlags GetFileEntryInfo(FileEntryInfo& info, FileEntryInfoQueryFlags query) const;
    DateTime LastModified() const; // 0 when it can't be told; a handler may say why in lastError
    bool FolderExists() const;
};

// An open file: closed when destroyed. Close it before opening it again.
class FileAccessor {
public:
    FileAccessor() = default;
    virtual ~FileAccessor();

    // The entry must have an accessor handler.
    bool Open(FileSystemEntry& target, FilePermission permission, FileAutoBehavior behavior = kFileAutoBehaviorNone);
    bool Open(const char* path, FilePermission permission, FileAutoBehavior behavior = kFileAutoBehaviorNone);

    // False: nothing could be read, and *actual is 0 or as it was; a count below size is a success. Files on
    // disk answer false at their end, memory files true with 0 bytes.
    bool Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags = kFileReadFlagsNone);
    bool Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
              FileReadFlags flags = kFileReadFlagsNone);

    // A count in *written below size is a success.
    bool Write(UInt64 size, const void* data, UInt64* written);

    bool Seek(VFS::FileOffset offset, FileOrigin origin);
    VFS::FileSize Position() const;
    VFS::FileSize Size() const;

    // True when nothing was open.
    bool Close();

private:
    FileEntryData entry;
    bool opened = false;        // an open was attempted
    bool openSucceeded = false; // the handler's answer to it
};
