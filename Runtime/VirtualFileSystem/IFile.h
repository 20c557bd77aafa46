// An open file that is not reached through a handler, such as a memory file, and the adapter that lets code written
// against FileAccessor work on one.
#pragma once

#include "Runtime/Allocator/MemLabel.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

// The order of the virtual operations is fixed. One thread at a time.
class IFile : private NonCopyable {
public:
    virtual ~IFile() = default;

    virtual bool IsOpen() const = 0;
    virtual bool Close() = 0;

    // actual may be null. Whether a read at the very end is a success is for the file to say.
    virtual bool Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) = 0;
    virtual bool Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) = 0;

    // written may be null.
    virtual bool Write(VFS::FileSize position, UInt64 size, const void* buffer, UInt64* written) = 0;
    virtual bool Write(UInt64 size, const void* buffer, UInt64* written) = 0;

    // How kFileOriginEnd counts, and whether a target past the end is refused, is for the file to say.
    virtual bool Seek(VFS::FileOffset offset, FileOrigin origin) = 0;
    virtual VFS::FileSize Position() const = 0;
    virtual bool SetLength(VFS::FileSize length) = 0;
    virtual VFS::FileSize Size() const = 0;
};

// Serves one IFile to the one FileAccessor that opens the entry whose accessorHandler it is. The close that ends the
// use destroys the adapter (and, when it owns it, the file): nothing may touch either afterwards.
class IFileAdapter : public FileAccessorHandler {
public:
    // The adapter itself must have been allocated under the given label, and the file too if it is owned.
    IFileAdapter(IFile* servedFile, MemLabelId memLabel, bool owns);

    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override;
    bool Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
              FileReadFlags flags) override;
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override;
    bool Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer, UInt64* written) override;
    bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) override;
    bool Close(FileEntryData& entry) override;
    bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position(const FileEntryData& entry) const override;
    bool SetLength(FileEntryData& entry, VFS::FileSize length) override;
    VFS::FileSize Size(const FileEntryData& entry) const override;

private:
    IFile* file;
    MemLabelId label;
    bool ownsFile;
};
