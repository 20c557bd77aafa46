// IFile, an open file that no handler serves, such as a memory file, and the adapter that lets FileAccessor work on
// one.
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

    // actual may be null. Each class decides whether a read at the very end succeeds.
    virtual bool Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) = 0;
    virtual bool Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) = 0;

    // written may be null.
    virtual bool Write(VFS::FileSize position, UInt64 size, const void* buffer, UInt64* written) = 0;
    virtual bool Write(UInt64 size, const void* buffer, UInt64* written) = 0;

    // Each class decides how kFileOriginEnd counts and whether a position past the end is refused.
    virtual bool Seek(VFS::FileOffset offset, FileOrigin origin) = 0;
    virtual VFS::FileSize Position() const = 0;
    virtual bool SetLength(VFS::FileSize length) = 0;
    virtual VFS::FileSize Size() const = 0;
};

// Lets one FileAccessor work on an IFile: make it the accessorHandler of the entry that the accessor opens. Close
// destroys the adapter, and the file too if the adapter owns it; nothing may touch either afterwards.
class IFileAdapter : public FileAccessorHandler {
public:
    // The adapter must have been made by New under memLabel, and so must an owned file.
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
