#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include "Runtime/Utilities/ZarvoConfig.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveFieldReading.h"

namespace ArchiveStorageHeader {

const char* const kSignature = "ZarvoFS";

constexpr size_t kLongestSignatureSize = 13; // "ZarvoArchive" and its NUL
constexpr UInt64 kAlignment = 16;

constexpr UInt64 kStoredBlockSize = 10;

Header::Header(MemLabelId label)
    : signature(kSignature, label),
      version(kNewestVersion),
      engineVersion("5.x.x", label),
      engineRevision(ZarvoConfig::ZarvoVersion, label),
      size(0),
      compressedBlocksInfoSize(0),
      uncompressedBlocksInfoSize(0),
      flags(0) {}

// Signature, with its NUL    layout
// "ZarvoFS"                  block-based
// "ZarvoWeb"                 legacy, one LZMA stream; block-based when version 6 follows
// "ZarvoRaw"                 legacy, stored as is
// "ZarvoArchive"             old, its own header, directory and block tables
HeaderResult ReadHeaderSignature(FileAccessor& file, Header& header) {
    constexpr UInt32 kTypeAndDirectoryMask = kArchiveCompressionTypeMask | kArchiveDirectoryInBlocksInfo;

    // A failed read leaves an empty signature, which is unknown.
    if (!ReadString(file, &header.signature, kLongestSignatureSize)) header.signature.clear();
    if (header.signature == kSignature) return kHeaderOk;
    if (header.signature == kSignatureArchive || header.signature == kSignatureRaw) {
        header.flags = (header.flags & ~kTypeAndDirectoryMask) | kArchiveDirectoryInBlocksInfo;
        return kHeaderOk;
    }
    if (header.signature != kSignatureWeb) return kHeaderNotAnArchive;

    const VFS::FileOffset afterSignature(file.Position());
    // A truncated version is not 6; the next parser fails on it too.
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

// The length of the header, padded as its version requires.
static UInt64 GetHeaderLength(const Header& header) {
    // The two strings' NULs, the signature's NUL, and the integers.
    constexpr UInt64 kFixedLength = 27;
    // Under the ZarvoWeb signature, the header has one byte after its fields, which nothing reads.
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

// Order in the file: header, section, data; or, with the section at the end: header, data, section.
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

HeaderResult ReadDirectoryInfo(FileAccessor& file, const Header& header, DirectoryInfo& directory) {
    if (header.signature == kSignatureWeb || header.signature == kSignatureRaw)
        return ReadDirectoryInfo_ZarvoWebAndZarvoRaw(file, header, directory);
    if (header.signature == kSignatureArchive) return kHeaderNotAnArchive;
    UInt32 count = 0;
    if (!ReadBigEndian(file, &count)) return kHeaderShortRead;
    return ReadNodes(file, count, directory);
}

} // namespace ArchiveStorageHeader
