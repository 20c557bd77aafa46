// Bytes opened as a file, without a disk. The bytes must outlive it.
#pragma once

#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <string>

class BytesFile {
public:
    explicit BytesFile(const std::string& bytes) {
        FileSystemEntry entry = MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionRead,
                                                                  const_cast<char*>(bytes.data()), bytes.size(), false);
        (void)accessor.Open(entry, kFilePermissionRead); // an open memory file can be opened
    }
    explicit BytesFile(std::string&&) = delete;

    UInt64 Position() const { return accessor.Position().Cast<UInt64>(); }

    FileAccessor accessor;
};
