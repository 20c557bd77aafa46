// How the archive parsers read fields, and the nodes that two layouts share. Private to them.
#pragma once

#include "Runtime/Core/Containers/String.h"
#include "Runtime/Utilities/ByteOrder.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

namespace ArchiveStorageHeader {

// Reads exactly size bytes.
[[nodiscard]] bool ReadBytes(FileAccessor& file, void* buffer, size_t size);

// Reads one integer. A short read leaves *value as it was.
template <typename T>
[[nodiscard]] bool ReadBigEndian(FileAccessor& file, T* value) {
    T stored;
    if (!ReadBytes(file, &stored, sizeof(stored))) return false;
    *value = FromBigEndian(stored);
    return true;
}

// Reads a string up to its NUL and leaves the position just past the NUL. After at least one character, the end of the
// file (or a failed read) ends the string, too; so do maxSize bytes without a NUL.
[[nodiscard]] bool ReadString(FileAccessor& file, core::string* out, size_t maxSize = ~size_t{0});

// Reads a node's path into scratch and copies it to *path, which so takes no more memory than it needs. Pass the same
// scratch for one path after another.
[[nodiscard]] bool ReadPath(FileAccessor& file, core::string* scratch, core::string* path);

// Reads and drops size bytes. False when the file doesn't hold them.
[[nodiscard]] bool SkipBytes(FileAccessor& file, size_t size);

// Whether the rest of the file can hold count entries of at least entrySize bytes. Ask before you size an array by a
// number from a file.
[[nodiscard]] bool CanHoldEntries(FileAccessor& file, UInt64 count, UInt64 entrySize);

// Reads count nodes as the block-based layout stores them.
HeaderResult ReadNodes(FileAccessor& file, UInt32 count, DirectoryInfo& directory);

} // namespace ArchiveStorageHeader
