// The handler interface: what a back end of the virtual file system supplies. FileAccessorHandler reads and writes
// the contents of an open entry; FileSystemHandler adds every other operation on a path.
//
// Every operation receives an entry whose handler (for the content operations, accessorHandler) is the object itself.
// On failure the result is false, empty or zero, and some handlers leave a code in the entry's lastError. The order of
// the virtual operations is fixed.
#pragma once

#include "Runtime/Core/Containers/DynamicBlockArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/Containers/StringRef.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Utilities/Hash128.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

class FileSystemEntry;

class FileAccessorHandler : private NonCopyable {
public:
    virtual ~FileAccessorHandler() = default;

    virtual bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) = 0;

    // Both Reads store the bytes read in *actual; fewer than size are a success.
    virtual bool Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
                      FileReadFlags flags) = 0;
    virtual bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) = 0;

    // Both Writes store the bytes taken in *written; fewer than size are a success.
    virtual bool Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer,
                       UInt64* written) = 0;
    virtual bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) = 0;

    virtual bool Close(FileEntryData& entry) = 0;
    virtual bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) = 0;
    virtual VFS::FileSize Position(const FileEntryData& entry) const = 0;
    virtual bool SetLength(FileEntryData& entry, VFS::FileSize length) = 0;
    virtual VFS::FileSize Size(const FileEntryData& entry) const = 0;
};

// A 16-byte identifier of an asset; all zero means none.
struct AssetGUID {
    UInt8 bytes[16] = {};

    friend constexpr bool operator==(const AssetGUID&, const AssetGUID&) = default;
};

class FileSystemHandler : public FileAccessorHandler {
public:
    // Whether this handler serves path; asked from the last registered handler to the first.
    virtual bool CanHandle(core::string_ref path) const = 0;
    virtual core::string ToAbsolute(core::string_ref path) const = 0;
    virtual bool IsAbsoluteFilePath(core::string_ref path) const = 0;

    // Bind an entry to this handler, and undo that.
    virtual void InitializeFileEntry(FileEntryData& entry) = 0;
    virtual void DestroyFileEntry(FileEntryData& entry) = 0;

    virtual const char* Name() = 0;

    // The folder part of the entry's path; false (parent unchanged) when it has none.
    virtual bool Parent(const FileEntryData& entry, core::string& parent) const = 0;
    // The last component: a pointer into the entry's path.
    virtual const char* Filename(const FileEntryData& entry) const = 0;

    virtual bool IsDir(const FileEntryData& entry) const = 0;
    virtual bool IsFile(const FileEntryData& entry) const = 0;
    virtual bool IsHidden(const FileEntryData& entry) const = 0;
    virtual bool IsSymLink(const FileEntryData& entry) const = 0;
    virtual bool IsReadOnly(const FileEntryData& entry) const = 0;
    virtual DateTime LastModified(const FileEntryData& entry) const = 0;
    virtual bool IsLocked(const FileEntryData& entry) = 0;

    // A hash of the contents that is cheaper than reading them; false when the handler has none.
    virtual bool HasFastHash(const FileEntryData&, Hash128&) { return false; }

    // Sets the FileEntryFlags that mask names to their values in flags, as far as the platform stores them.
    virtual bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) = 0;
    virtual bool CreateAsFile(FileEntryData& entry) = 0;
    virtual bool CreateAsDir(FileEntryData& entry) = 0;
    virtual bool Delete(FileEntryData& entry, bool recursive) = 0;

    // By default there is no trash: the entry is deleted, and the answer is true even if that fails.
    virtual bool MoveToTrash(FileEntryData& entry) {
        (void)Delete(entry, true);
        return true;
    }

    virtual bool Target(const FileEntryData& entry, FileSystemEntry& target) const = 0;
    virtual bool Lock(FileEntryData& entry, FileLockMode mode) = 0;
    virtual bool SetReadOnly(FileEntryData& entry, bool readOnly) = 0;
    virtual bool Copy(FileEntryData& from, FileEntryData& to) = 0;
    virtual bool AtomicMove(FileEntryData& from, FileEntryData& to) = 0;
    virtual AssetGUID GetAssetGUID(const FileEntryData&) const { return {}; }
    virtual bool MakeLocal(FileEntryData& entry, bool flag) = 0;

    // The file on the local disk that holds the entry's contents, and the range of it; false when there is none.
    virtual bool ToLocal(const FileEntryData& entry, core::string& path, VFS::FileSize& offset,
                         VFS::FileSize& size) const = 0;

    // Appends the entries of the folder to *out. With kFileEnumerationSumSizes it adds the sizes of the files to the
    // UInt64 that *handlerData points to instead.
    virtual bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                           void** handlerData, FileEnumerationFlag flags) const = 0;

    // Fills the fields of info that query names, and returns which ones were filled.
    virtual FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                                     FileEntryInfoQueryFlags query) const = 0;

    virtual bool Touch(FileEntryData& entry) = 0;
    virtual bool SetFileTimeStamp(FileEntryData& entry, const DateTime& time) = 0;
    virtual bool Exists(const FileEntryData& entry) const = 0;

    // Not implemented: reports that, leaves kFileSystemErrorNotSupported in lastError and returns false.
    virtual bool CreateFileWithContentAtomically(const FileEntryData& entry, const void* data, UInt64 size) const;

    virtual bool CanConvertToAbsolutePath(core::string_ref path) const = 0;
    virtual core::string ToPhysicalPath(const core::string&) const { return {}; }
    virtual core::string ToLogicalPath(const core::string&) const { return {}; }
};
