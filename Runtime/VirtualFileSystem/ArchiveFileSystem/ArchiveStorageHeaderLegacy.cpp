// The layouts from before the block-based one: ZarvoWeb, ZarvoRaw and ZarvoArchive.
#include "Runtime/Utilities/Compression/Compression.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveFieldReading.h"

namespace ArchiveStorageHeader {

constexpr UInt32 kFirstVersionWithTotalSize = 2;
constexpr UInt32 kFirstVersionWithTrailer = 3;
constexpr UInt32 kFirstVersionWithHash = 4;

constexpr UInt64 kStoredLevelSize = 8;
constexpr UInt64 kStoredLegacyNodeMinSize = 9;
constexpr UInt64 kStoredRunningPositionsSize = 24;

// Size     Field
// 4        version
// Lv + 1   engineVersion
// Lr + 1   engineRevision
// 16 + 4   unused, from version 4 on
// 4        unused
// 4        header size: the data's position, from the archive's start
// 4        a number up to the level count
// 4        level count L
// 8 each   L levels: compressed size, uncompressed size; the last one gives the sizes of the whole data
// 4        size of the archive, from version 2 on
// 4        unused, from version 3 on
HeaderResult ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(FileAccessor& file, Header& header, BlocksInfo& blocks) {
    if (!ReadBigEndian(file, &header.version)) return kHeaderShortRead;
    if (!ReadString(file, &header.engineVersion)) return kHeaderShortRead;
    if (!ReadString(file, &header.engineRevision)) return kHeaderShortRead;
    if (header.version >= kFirstVersionWithHash && !SkipBytes(file, 16 + 4)) return kHeaderShortRead;
    if (!SkipBytes(file, 4)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &header.uncompressedBlocksInfoSize)) return kHeaderShortRead;

    UInt32 boundedByLevelCount = 0;
    UInt32 levelCount = 0;
    if (!ReadBigEndian(file, &boundedByLevelCount)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &levelCount)) return kHeaderShortRead;
    if (boundedByLevelCount > levelCount) return kHeaderShortRead;
    UInt32 compressedSize = 0;
    UInt32 uncompressedSize = 0;
    if (levelCount != 0) {
        const SInt64 lastLevel = static_cast<SInt64>(levelCount - 1) * static_cast<SInt64>(kStoredLevelSize);
        if (!file.Seek(lastLevel, kFileOriginCurrent)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &compressedSize)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &uncompressedSize)) return kHeaderShortRead;
    }

    UInt32 totalSize = 0;
    if (header.version >= kFirstVersionWithTotalSize && !ReadBigEndian(file, &totalSize)) return kHeaderShortRead;
    header.size = totalSize;
    if (header.version >= kFirstVersionWithTrailer && !SkipBytes(file, 4)) return kHeaderShortRead;

    header.compressedBlocksInfoSize = header.uncompressedBlocksInfoSize;
    header.flags = 0;
    if (!blocks.storageBlocks.resize_initialized(1, kResizeExact)) return kHeaderShortRead;
    StorageBlock& block = blocks.storageBlocks[0];
    block.uncompressedSize = uncompressedSize;
    block.compressedSize = compressedSize;
    const UInt32 type = header.signature == kSignatureWeb ? kCompressionLzma : kCompressionNone;
    block.flags = static_cast<UInt16>(kStorageBlockStreamed | type);
    return kHeaderOk;
}

static UInt32 GetLegacyNodeFlags(const core::string& path) {
    const core::string_ref extension = GetPathNameExtension(path);
    const bool isAssetData = extension.empty() || extension == "assets" || extension == "sharedAssets";
    return isAssetData ? UInt32{kNodeAssetData} : 0;
}

// Size      Field
// 4         entry count E
// each of E:
//   variable  path
//   4         offset, in the data stream, which starts with this directory
//   4         size
HeaderResult ReadDirectoryInfo_ZarvoWebAndZarvoRaw(FileAccessor& file, const Header&, DirectoryInfo& directory) {
    UInt32 count = 0;
    if (!ReadBigEndian(file, &count)) return kHeaderShortRead;
    if (!CanHoldEntries(file, count, kStoredLegacyNodeMinSize)) return kHeaderShortRead;
    if (!directory.nodes.resize_initialized(count, kResizeExact)) return kHeaderShortRead;
    core::string path(kMemLabelGeneral);
    for (Node& node : directory.nodes) {
        UInt32 offset = 0;
        UInt32 size = 0;
        if (!ReadPath(file, &path, &node.path)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &offset)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &size)) return kHeaderShortRead;
        node.offset = offset;
        node.size = size;
        node.flags = GetLegacyNodeFlags(node.path);
    }
    return kHeaderOk;
}

// A block's size is the difference of two running positions. A difference above 32 bits is reported, and its low 32
// bits are kept.
static UInt32 GetBlockSize(UInt64 start, UInt64 end) { return VFS::FileSize(end - start).Cast<UInt32>(); }

// Size            Field
// 8 x (B + 1)     running positions U in the data stream
// 16 x (B + 1)    running stored position P 8, CompressionType 4, streamed word 4 (bit 0 counts)
static HeaderResult ReadRunningPositions(FileAccessor& file, UInt32 count, BlocksInfo& blocks) {
    if (!CanHoldEntries(file, UInt64{count} + 1, kStoredRunningPositionsSize)) return kHeaderShortRead;
    if (!blocks.storageBlocks.resize_initialized(count, kResizeExact)) return kHeaderShortRead;

    UInt64 previous = 0;
    if (!ReadBigEndian(file, &previous)) return kHeaderShortRead;
    for (StorageBlock& block : blocks.storageBlocks) {
        UInt64 position = 0;
        if (!ReadBigEndian(file, &position)) return kHeaderShortRead;
        block.uncompressedSize = GetBlockSize(previous, position);
        previous = position;
    }

    for (UInt64 index = 0; index <= count; ++index) {
        UInt64 position = 0;
        UInt32 type = 0;
        UInt32 streamed = 0;
        if (!ReadBigEndian(file, &position)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &type)) return kHeaderShortRead;
        if (!ReadBigEndian(file, &streamed)) return kHeaderShortRead;
        if (index > 0) blocks.storageBlocks[index - 1].compressedSize = GetBlockSize(previous, position);
        if (index < count)
            blocks.storageBlocks[index].flags = static_cast<UInt16>((type & kStorageBlockCompressionTypeMask) |
                                                                    ((streamed & 1) != 0 ? kStorageBlockStreamed : 0));
        previous = position;
    }
    return kHeaderOk;
}

// Position        Size     Field
// 13              8        H: the header's position
// H               4        version
// H + 4           Lv + 1   engineVersion
//                 Lr + 1   engineRevision
//                 16 + 8   unused
//                 4        D: the directory's position, from H
// H + D           4        the data's position
// H + D + 4       4        node count M
//                 variable M nodes, as in the block-based layout
//                 4        block count B
//                 24 each  B + 1 running positions, when B is not 0
static HeaderResult ReadZarvoArchive(FileAccessor& file, Header& header, BlocksInfo& blocks, DirectoryInfo& directory) {
    UInt64 headerPosition = 0;
    if (!ReadBigEndian(file, &headerPosition)) return kHeaderShortRead;
    if (!file.Seek(VFS::FileOffset(VFS::FileSize(headerPosition)), kFileOriginBegin)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &header.version)) return kHeaderShortRead;
    if (header.version != kZarvoArchiveVersion) return kHeaderNotAnArchive;
    if (!ReadString(file, &header.engineVersion)) return kHeaderShortRead;
    if (!ReadString(file, &header.engineRevision)) return kHeaderShortRead;
    if (!SkipBytes(file, 16 + 8)) return kHeaderShortRead;
    UInt32 directoryDistance = 0;
    if (!ReadBigEndian(file, &directoryDistance)) return kHeaderShortRead;

    // The first seek succeeded, so headerPosition is below 2^63 and the sum can't wrap.
    const VFS::FileSize directoryPosition(headerPosition + directoryDistance);
    if (!file.Seek(VFS::FileOffset(directoryPosition), kFileOriginBegin)) return kHeaderShortRead;
    UInt32 dataPosition = 0;
    UInt32 nodeCount = 0;
    if (!ReadBigEndian(file, &dataPosition)) return kHeaderShortRead;
    if (!ReadBigEndian(file, &nodeCount)) return kHeaderShortRead;
    if (const HeaderResult result = ReadNodes(file, nodeCount, directory); result != kHeaderOk) return result;
    UInt32 blockCount = 0;
    if (!ReadBigEndian(file, &blockCount)) return kHeaderShortRead;
    if (blockCount != 0) {
        const HeaderResult result = ReadRunningPositions(file, blockCount, blocks);
        if (result != kHeaderOk) return result;
    }

    header.compressedBlocksInfoSize = dataPosition;
    header.uncompressedBlocksInfoSize = dataPosition;
    header.flags = kArchiveDirectoryInBlocksInfo | kArchiveBlocksInfoPadded;
    return kHeaderOk;
}

HeaderResult ReadAll(FileAccessor& file, Header& header, BlocksInfo& blocks, DirectoryInfo& directory) {
    if (header.signature == kSignatureArchive) return ReadZarvoArchive(file, header, blocks, directory);
    if (header.signature != kSignatureRaw) return kHeaderNotAnArchive;
    const HeaderResult result = ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(file, header, blocks);
    if (result != kHeaderOk) return result;
    const VFS::FileSize dataPosition(GetDataOffset(header));
    if (!file.Seek(VFS::FileOffset(dataPosition), kFileOriginBegin)) return kHeaderShortRead;
    return ReadDirectoryInfo_ZarvoWebAndZarvoRaw(file, header, directory);
}

} // namespace ArchiveStorageHeader
