// The virtual file system: a registry that finds the handler of a path, entries that ask questions about a path, and
// accessors that open it.
//
//   FileAccessor file;
//   if (!file.Open("archive.zarvo", kFilePermissionRead)) return;
//   UInt64 count = 0;
//   if (!file.Read(sizeof(buffer), buffer, &count)) return;   // false: failed, or at the end of the file
//
// Call GetFileSystem once, and set the current directory, before a second thread starts: from then on any thread may
// use the registry. An entry or accessor belongs to one thread at a time.
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

    // The path from the root; "." and ".." are not resolved. Empty when the handler that is asked returns that.
    core::string ToAbsolute(core::string_ref path) const;

    // Sets the directory that ToAbsolute puts before relative paths, cut at kMaxPathLength, and returns the previous
    // one. The process's working directory does not change.
    core::string SetCurrentDirectory(core::string_ref path);
    core::string CurrentDirectory() const;

    [[nodiscard]] bool Delete(core::string_ref path, bool recursive) const;
    [[nodiscard]] bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                                 FileEnumerationFlag flags) const;
    core::string LastErrorMessage() const;

    // A registered handler is asked before all registered earlier. It stays the caller's, and must outlive its
    // registration and every entry bound to it. The registry calls its CanHandle, IsAbsoluteFilePath,
    // CanConvertToAbsolutePath and ToAbsolute under a lock: these four must not use the registry.
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

// A path bound to its handler. A copy is bound to the same path and handler, but never open.
class FileSystemEntry : public FileEntryData {
public:
    FileSystemEntry() = default;
    explicit FileSystemEntry(core::string_ref path);
    FileSystemEntry(const FileEntryData& other);
    FileSystemEntry(const FileSystemEntry& other);
    FileSystemEntry& operator=(const FileSystemEntry& other);

    // Binds the entry to another path, cut at kMaxPathLength, with every backslash turned into "/". The text may be
    // part of the entry's own path. The handler is chosen by the path as given.
    void Set(core::string_ref path);
    const char* Path() const { return path; }

    // Without a handler all of these answer false, 0 or a default DateTime.
    bool Exists() const;
    bool IsDir() const;
    bool IsFile() const;
    bool IsLocked();
    [[nodiscard]] bool CreateAsDir();
    [[nodiscard]] bool SetFlags(UInt32 mask, UInt32 flags);
    [[nodiscard]] FileEntryInfoQueryFlags GetFileEntryInfo(FileEntryInfo& info, FileEntryInfoQueryFlags query) const;
    DateTime LastModified() const; // 0 when unknown; a handler may say why in lastError
    bool FolderExists() const;
};

// An open file: closed when destroyed. Close it before opening it again.
class FileAccessor {
public:
    FileAccessor() = default;
    virtual ~FileAccessor();

    // False for an entry without an accessor handler.
    [[nodiscard]] bool Open(FileSystemEntry& target, FilePermission permission,
                            FileAutoBehavior behavior = kFileAutoBehaviorNone);
    [[nodiscard]] bool Open(const char* path, FilePermission permission,
                            FileAutoBehavior behavior = kFileAutoBehaviorNone);

    // True with *actual bytes in buffer; fewer than size are a success too. False when nothing could be read, with
    // *actual 0 or unchanged. At their end, files on disk answer false, memory files true with 0 bytes.
    [[nodiscard]] bool Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags = kFileReadFlagsNone);
    [[nodiscard]] bool Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
                            FileReadFlags flags = kFileReadFlagsNone);

    // True when *written bytes were taken; fewer than size are a success too.
    [[nodiscard]] bool Write(UInt64 size, const void* data, UInt64* written);

    [[nodiscard]] bool Seek(VFS::FileOffset offset, FileOrigin origin);
    VFS::FileSize Position() const;
    VFS::FileSize Size() const;

    // True when nothing was open. Data can turn out to be unwritten only here: ask after writing.
    [[nodiscard]] bool Close();

private:
    FileEntryData entry;
    bool opened = false;        // an open was attempted
    bool openSucceeded = false; // the handler's answer to it
};
