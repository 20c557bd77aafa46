// An open file whose contents live in memory. Several files may share one MemoryFileData; each has a position of its
// own and sees what the others write.
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
    // Takes a reference to contents. Without contents (null) it makes its own, a MultiBlocksMemoryFileData.
    // The file is open until it is closed; a read that filePermission forbids (or a write, or a change of the length)
    // answers false and is reported as a failed check.
    MemoryFile(MemLabelId memLabel, MemoryFileData* contents, FilePermission filePermission);
    ~MemoryFile() override;

    // An entry through which one FileAccessor opens a memory file over data (see SingleBlockMemoryFileData for data,
    // size and takeOwnership). It serves one open: the close that ends it frees the file, and data if it was taken
    // over; neither the entry nor a copy of it may be opened again. Copies share the file, so destroying an entry
    // frees nothing: one that is never opened and closed leaks its file. When memory is refused the entry can't be
    // opened, and data that was to be taken over is freed.
    static FileSystemEntry CreateFileSystemEntry(MemLabelId memLabel, FilePermission filePermission, void* data,
                                                 size_t size, bool takeOwnership);

    bool IsOpen() const override;

    // Always true. A closed file answers false, and 0 for its size.
    bool Close() override;

    // A read at the very end delivers 0 bytes and answers true; one beyond it answers false.
    bool Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;
    bool Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;

    // True also when less than size was stored, down to nothing at all: compare *written.
    bool Write(VFS::FileSize from, UInt64 size, const void* in, UInt64* written) override;
    bool Write(UInt64 size, const void* in, UInt64* written) override;

    // kFileOriginEnd counts backwards: 10 is 10 bytes before the end. A target past the end is refused.
    bool Seek(VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position() const override;

    // The position stays, even past the new end.
    bool SetLength(VFS::FileSize length) override;
    VFS::FileSize Size() const override;

    virtual bool Flush();

private:
    bool IsReadable() const { return permission == kFilePermissionRead || permission == kFilePermissionReadWrite; }
    bool IsWritable() const { return permission != kFilePermissionRead; }

    MemoryFileData* data; // one reference; null once closed
    FilePermission permission;
    MemLabelId label; // of the contents that it makes itself
    UInt64 position = 0;
};
