#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveFieldReading.h"

#include <algorithm>
#include <cstring>

namespace ArchiveStorageHeader {

constexpr size_t kStringPieceSize = 64;
constexpr UInt64 kStoredNodeMinSize = 21;

bool ReadBytes(FileAccessor& file, void* buffer, size_t size) {
    UInt64 actual = 0;
    return file.Read(size, buffer, &actual) && actual == size;
}

bool ReadString(FileAccessor& file, core::string* out, size_t maxSize) {
    out->clear();
    if (out->capacity() <= kStringPieceSize && out->grow(kStringPieceSize) == nullptr) return false;
    const UInt64 start = file.Position().Cast<UInt64>();
    char piece[kStringPieceSize];
    size_t terminatorLength = 0;
    while (terminatorLength == 0 && out->size() != maxSize) {
        UInt64 actual = 0;
        if (!file.Read(std::min(sizeof(piece), maxSize - out->size()), piece, &actual) || actual == 0) {
            if (out->empty()) return false;
            break; // a failed read ends the text, as the end of the file does; the next read fails too
        }
        const size_t count = static_cast<size_t>(actual);
        const void* terminator = memchr(piece, '\0', count);
        const size_t length =
            terminator != nullptr ? static_cast<size_t>(static_cast<const char*>(terminator) - piece) : count;
        if (terminator != nullptr) terminatorLength = 1;
        while (out->size() + length > out->capacity())
            if (out->grow(2 * (out->capacity() + 1)) == nullptr) return false;
        out->append(piece, length);
    }
    return file.Seek(VFS::FileOffset(VFS::FileSize(start + out->size() + terminatorLength)), kFileOriginBegin);
}

bool ReadPath(FileAccessor& file, core::string* scratch, core::string* path) {
    if (!ReadString(file, scratch)) return false;
    if (path->grow(scratch->size()) == nullptr) return false;
    *path = *scratch;
    return true;
}

bool SkipBytes(FileAccessor& file, size_t size) {
    char dropped[16];
    for (; size > sizeof(dropped); size -= sizeof(dropped))
        if (!ReadBytes(file, dropped, sizeof(dropped))) return false;
    return ReadBytes(file, dropped, size);
}

bool CanHoldEntries(FileAccessor& file, UInt64 count, UInt64 entrySize) {
    if (count == 0) return true;
    const UInt64 position = file.Position().Cast<UInt64>();
    if (!file.Seek(0, kFileOriginEnd)) return false;
    const UInt64 end = file.Position().Cast<UInt64>();
    if (!file.Seek(VFS::FileOffset(VFS::FileSize(position)), kFileOriginBegin)) return false;
    return end > position && count <= (end - position) / entrySize;
}

// Offset      Size      Field (each node)
// 0           8         offset
// 8           8         size
// 16          4         flags
// 20          variable  path
HeaderResult ReadNodes(FileAccessor& file, UInt32 count, DirectoryInfo& directory) {
    if (!CanHoldEntries(file, count, kStoredNodeMinSize)) return kHeaderShortRead;
    if (!directory.nodes.resize_initialized(count, kResizeExact)) return kHeaderShortRead;
    core::string path(kMemLabelGeneral);
    for (Node& node : directory.nodes) {
        if (!ReadBigEndian(file, &node.offset)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &node.size)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &node.flags)) return kHeaderShortRead;
        if (!ReadPath(file, &path, &node.path)) return kHeaderShortRead;
    }
    return kHeaderOk;
}

} // namespace ArchiveStorageHeader
