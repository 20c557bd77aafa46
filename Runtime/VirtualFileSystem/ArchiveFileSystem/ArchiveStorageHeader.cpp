#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include "Runtime/Utilities/ZarvoConfig.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveFieldReading.h"

#include <algorithm>
#include <cstring>

namespace ArchiveStorageHeader {

const char* const kSignature = "ZarvoFS";

constexpr size_t kStringPieceSize = 64;
constexpr size_t kLongestSignatureSize = 13; // "ZarvoArchive" and its NUL
constexpr UInt64 kAlignment = 16;

constexpr UInt64 kStoredBlockSize = 10;
constexpr UInt64 kStoredNodeMinSize = 21;

Header::Header(MemLabelId label)
    : signature(kSignature, label),
      version(kNewestVersion),
      engineVersion("5.x.x", label),
      engineRevision(ZarvoConfig::ZarvoVersion, label),
      size(0),
      compressedBlocksInfoSize(0),
      uncompressedBlocksInfoSize(0),
      flags(0) {}

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
            break; // a failed read ends the text as the file's end does: what is read next fails, too
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

// Signature, with its NUL    layout
// "ZarvoFS"                  block-based
// "ZarvoWeb"                 legacy, one LZMA stream; block-based when version 6 follows
// "ZarvoRaw"                 legacy, stored as is
// "ZarvoArchive"             old, its own header, directory and block tables
HeaderResult ReadHeaderSignature(FileAccessor& file, Header& header) {
    constexpr UInt32 kTypeAndDirectoryMask = kArchiveCompressionTypeMask | kArchiveDirectoryInBlocksInfo;

    // What can't be read leaves an empty signature, which matches nothing.
    if (!ReadString(file, &header.signature, kLongestSignatureSize)) header.signature.clear();
    if (header.signature == kSignature) return kHeaderOk;
    if (header.signature == kSignatureArchive || header.signature == kSignatureRaw) {
        header.flags = (header.flags & ~kTypeAndDirectoryMask) | kArchiveDirectoryInBlocksInfo;
        return kHeaderOk;
    }
    if (header.signature != kSignatureWeb) return kHeaderNotAnArchive;

    const VFS::FileOffset afterSignature(file.Position());
    // A version that is cut short is no 6, and the parser that is called next meets the same end.
    const bool hasVersion = ReadBigEndian(file, &header.version);
    if (hasVersion && header.version == kWebSignatureVersion) {
        header.signature = kSignature;
        header.flags |= kArchiveWebSignatureHeader;
    }
    header.flags &= ~kTypeAndDirectoryMask;
    return file.Seek(afterSignature, kFileOriginBegin) ? kHeaderOk : kHeaderNotAnArchive;
}

// Offset           Size    Field (under the ZarvoWeb signature, offsets from 8 on are one more)
// 0                8       signature
// 8                4       version
// 12               Lv + 1  engineVersion
// 13 + Lv          Lr + 1  engineRevision
// 14 + Lv + Lr     8       size
// 22 + Lv + Lr     4       compressedBlocksInfoSize
// 26 + Lv + Lr     4       uncompressedBlocksInfoSize
// 30 + Lv + Lr     4       flags
HeaderResult ReadHeader(FileAccessor& file, Header& header) {
    if (header.signature != kSignature) return kHeaderNotAnArchive;
    if (!ReadBigEndian(file, &header.version)) return kHeaderShortRead;
    if (header.version > kNewestVersion) return kHeaderNotAnArchive;
    if (!ReadString(file, &header.engineVersion)) return kHeaderShortRead;
    if (!ReadString(file, &header.engineRevision)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &header.size)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &header.compressedBlocksInfoSize)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &header.uncompressedBlocksInfoSize)) return kHeaderShortRead;
    if (header.compressedBlocksInfoSize > header.uncompressedBlocksInfoSize) return kHeaderNotAnArchive;
    if (!ReadBigEndian(file, &header.flags)) return kHeaderShortRead;
    return kHeaderOk;
}

// The header's length, with the padding that its version asks for.
static UInt64 GetHeaderLength(const Header& header) {
    // The two strings' NULs, the signature's NUL, and the integers.
    constexpr UInt64 kFixedLength = 27;
    // A header under the ZarvoWeb signature counts one byte more than its fields, which nothing reads.
    constexpr UInt64 kWebSignatureFixedLength = 36;

    UInt64 length = header.engineVersion.size() + header.engineRevision.size();
    if ((header.flags & kArchiveWebSignatureHeader) != 0)
        length += kWebSignatureFixedLength;
    else
        length += header.signature.size() + kFixedLength;
    if (header.version >= kFirstPaddedVersion) length = (length + kAlignment - 1) / kAlignment * kAlignment;
    return length;
}

UInt64 GetBlocksInfoOffset(const Header& header) {
    constexpr UInt64 kNoPosition = ~UInt64{0};
    constexpr UInt64 kAfterLegacySignature = 9;

    if ((header.flags & kArchiveBlocksInfoAtEnd) != 0)
        return header.size == 0 ? kNoPosition : header.size - header.compressedBlocksInfoSize;
    if (header.signature == kSignatureWeb || header.signature == kSignatureRaw) return kAfterLegacySignature;
    return GetHeaderLength(header);
}

// Order on disk: header, section, data; or, with the section at the end: header, data, section.
UInt64 GetDataOffset(const Header& header) {
    if (header.signature == kSignatureArchive) return header.compressedBlocksInfoSize;
    const UInt64 headerLength = header.signature == kSignature ? GetHeaderLength(header) : 0;
    if ((header.flags & kArchiveBlocksInfoAtEnd) != 0) return headerLength;
    UInt32 sectionRoom = header.compressedBlocksInfoSize;
    // In 32 bits: a size within 15 of 2^32 wraps to 0.
    if ((header.flags & kArchiveBlocksInfoPadded) != 0) sectionRoom = (sectionRoom + 15) & ~UInt32{15};
    return headerLength + sectionRoom;
}

// Offset      Size     Field
// 0           16       hash
// 16          4        N
// 20          10 each  N blocks: uncompressedSize 4, compressedSize 4, flags 2
HeaderResult ReadBlocksInfo(FileAccessor& file, const Header&, BlocksInfo& blocks) {
    if (!ReadBytes(file, blocks.hash, sizeof(blocks.hash))) return kHeaderShortRead;
    UInt32 count = 0;
    if (!ReadBigEndian(file, &count)) return kHeaderShortRead;
    if (!CanHoldEntries(file, count, kStoredBlockSize)) return kHeaderShortRead;
    if (!blocks.storageBlocks.resize_initialized(count, kResizeExact)) return kHeaderShortRead;
    for (StorageBlock& block : blocks.storageBlocks) {
        if (!ReadBigEndian(file, &block.uncompressedSize)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &block.compressedSize)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &block.flags)) return kHeaderShortRead;
    }
    return kHeaderOk;
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

HeaderResult ReadDirectoryInfo(FileAccessor& file, const Header& header, DirectoryInfo& directory) {
    if (header.signature == kSignatureWeb || header.signature == kSignatureRaw)
        return ReadDirectoryInfo_ZarvoWebAndZarvoRaw(file, header, directory);
    if (header.signature == kSignatureArchive) return kHeaderNotAnArchive;
    UInt32 count = 0;
    if (!ReadBigEndian(file, &count)) return kHeaderShortRead;
    return ReadNodes(file, count, directory);
}

} // namespace ArchiveStorageHeader
