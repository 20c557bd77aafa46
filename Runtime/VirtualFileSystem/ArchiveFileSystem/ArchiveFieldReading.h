// How the archive parsers read single fields. Private to them.
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

// Reads a string up to its NUL, or to the end of the file once there is a character, and leaves the position just past
// what was read. Any length, unless maxSize bytes, with the NUL, have come without one: what they hold is then the
// string. A read that fails behind the first characters counts as the end of the file.
[[nodiscard]] bool ReadString(FileAccessor& file, core::string* out, size_t maxSize = ~size_t{0});

// Reads a node's path by way of scratch, which is used for one path after another: *path then takes no more memory than
// it needs, and none when it is short.
[[nodiscard]] bool ReadPath(FileAccessor& file, core::string* scratch, core::string* path);

// Moves past size bytes that nothing here uses. They must be there.
[[nodiscard]] bool SkipBytes(FileAccessor& file, size_t size);

// Whether the rest of the file can hold count entries of at least entrySize bytes: asked before an array is sized by a
// number from a file.
[[nodiscard]] bool CanHoldEntries(FileAccessor& file, UInt64 count, UInt64 entrySize);

// Reads count nodes as the block-based layout stores them.
HeaderResult ReadNodes(FileAccessor& file, UInt32 count, DirectoryInfo& directory);

} // namespace ArchiveStorageHeader
