// An open file whose contents live in memory. Several files may share one MemoryFileData; each has its own position and
// sees what the others write.
//
//   MemoryFile file(label, nullptr, kFilePermissionReadWrite);   // contents of its own, which grow
//   FileSystemEntry entry = MemoryFile::CreateFileSystemEntry(label, kFilePermissionRead, data, size, false);
//   accessor.Open(entry, kFilePermissionRead);                   // as if data were a file on disk
//
// A file belongs to one thread at a time; threads that share contents use a file each.
#pragma once

#include "Runtime/VirtualFileSystem/IFile.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

class MemoryFileData;

class MemoryFile : public IFile {
public:
    // Takes a reference to contents; for null it makes a MultiBlocksMemoryFileData of its own. The file is open from
    // the start. A read, write or change of length that filePermission forbids is reported as a failed check and
    // answers false.
    MemoryFile(MemLabelId memLabel, MemoryFileData* contents, FilePermission filePermission);
    ~MemoryFile() override;

    // An entry through which one FileAccessor opens a memory file over data. See SingleBlockMemoryFileData for data,
    // size and takeOwnership. The entry can be opened once: the Close that follows frees the file, and data too if it
    // was taken over, so neither the entry nor a copy may be opened again. Destroying an entry frees nothing: if it was
    // never opened and closed, its file leaks.
    static FileSystemEntry CreateFileSystemEntry(MemLabelId memLabel, FilePermission filePermission, void* data,
                                                 size_t size, bool takeOwnership);

    bool IsOpen() const override;

    // Always true. A closed file fails every read, write and seek, and has size 0.
    bool Close() override;

    // Reading at the end answers true with 0 bytes, reading past it false.
    bool Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;
    bool Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;

    // True even if fewer bytes than size were stored, or none: compare *written.
    bool Write(VFS::FileSize from, UInt64 size, const void* in, UInt64* written) override;
    bool Write(UInt64 size, const void* in, UInt64* written) override;

    // kFileOriginEnd counts backwards: an offset of 10 is 10 bytes before the end. A position past the end is refused.
    bool Seek(VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position() const override;

    // Leaves the position alone, even past the new end.
    bool SetLength(VFS::FileSize length) override;
    VFS::FileSize Size() const override;

    virtual bool Flush();

private:
    bool IsReadable() const { return permission == kFilePermissionRead || permission == kFilePermissionReadWrite; }
    bool IsWritable() const { return permission != kFilePermissionRead; }

    MemoryFileData* data; // one reference; null once closed
    FilePermission permission;
    MemLabelId label; // of contents made by the file itself
    UInt64 position = 0;
};
