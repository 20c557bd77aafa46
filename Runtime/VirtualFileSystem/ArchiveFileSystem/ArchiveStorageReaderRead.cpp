// Reads of the data stream: which blocks a range touches, and how the bytes of each reach the caller.
#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/BatchingFileReader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/CachedBlock.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

// The block that holds a position of the stream; false when the position is at or past the stream's end.
bool ArchiveStorageReader::FindBlock(UInt64 position, UInt32* blockIndex) const {
    if (position >= m_UncompressedBlocksOffsets.back()) return false;
    const UInt64* const first = m_UncompressedBlocksOffsets.begin();
    const UInt64* const next = std::upper_bound(first, m_UncompressedBlocksOffsets.end(), position);
    *blockIndex = static_cast<UInt32>(next - first - 1);
    return true;
}

UInt32 ArchiveStorageReader::NextBlock(UInt32 blockIndex) const {
    return m_NextBlocks.empty() ? blockIndex + 1 : m_NextBlocks[blockIndex + 1];
}

bool ArchiveStorageReader::Read(VFS::FileSize fromPosition, UInt64 size, void* buffer, UInt64* read,
                                FileReadFlags flags) {
    if (m_UncompressedBlocksOffsets.empty()) return false;
    const UInt64 from = fromPosition.Cast<UInt64>();
    UInt32 start;
    if (!FindBlock(from, &start)) return false;
    if (size == 0) {
        *read = 0;
        return true;
    }
    // A range that passes the end is refused whole. Compared by subtraction: from + size may wrap.
    UInt32 end;
    if (size > m_UncompressedBlocksOffsets.back() - from || !FindBlock(from + (size - 1), &end)) return false;

    const UInt64 storedEnd = m_CompressedBlocksOffsets[end + 1];
    // Don't read past the range in a stored last block.
    UInt64 wantedEnd = storedEnd;
    if (GetBlockType(end) == kCompressionNone)
        wantedEnd =
            std::min(storedEnd, m_CompressedBlocksOffsets[end] + (from + size - m_UncompressedBlocksOffsets[end]));
    BatchingFileReader batch(&m_Storage, start != end ? BatchingFileReader::kBatchSize : 0,
                             m_CompressedBlocksOffsets[start], storedEnd, wantedEnd);
    UInt8* const destination = static_cast<UInt8*>(buffer);
    UInt64 delivered = 0;
    for (UInt32 index = start; index <= end; index = NextBlock(index)) {
        const UInt64 blockStart = m_UncompressedBlocksOffsets[index];
        const UInt64 blockSize = m_BlocksInfo.storageBlocks[index].uncompressedSize;
        Check(blockStart <= from + delivered && blockStart + blockSize >= from + delivered,
              FixedReports::kReadOutsideBlock);
        const UInt64 offsetInBlock = index == start ? from - blockStart : 0;
        const UInt64 amount = std::min(size - delivered, blockSize - offsetInBlock);
        UInt64 got = 0;
        if (offsetInBlock == 0 && amount == blockSize && (flags & kFileReadFlagsThroughCache) == 0) {
            if (!ReadCompleteBlock(index, destination + delivered, &got, &batch)) return false;
        } else if (!ReadBlock(index, offsetInBlock, amount, destination + delivered, &got, &batch)) {
            *read = delivered;
            return delivered != 0;
        }
        delivered += got;
        if (got < amount || delivered == size) break;
    }

    if (delivered != 0 && !IsDirectoryReady())
        TryToReadDirectoryFromBlockData(from, buffer, static_cast<size_t>(delivered));
    *read = delivered;
    return delivered != 0;
}

// Decodes a whole block straight into the caller's memory, without a cached record and without a copy.
bool ArchiveStorageReader::ReadCompleteBlock(UInt32 blockIndex, void* destination, UInt64* delivered,
                                             BatchingFileReader* batch) {
    const UInt32 uncompressedSize = m_BlocksInfo.storageBlocks[blockIndex].uncompressedSize;
    if (GetBlockType(blockIndex) == kCompressionNone)
        return batch->Read(destination, m_CompressedBlocksOffsets[blockIndex], uncompressedSize, delivered);

    if (const BrokenBlocks::Record broken = FindBrokenBlock(blockIndex); broken.IsKnown()) return broken.isCut;
    CachedBlock temporary(kMemLabelGeneral);
    temporary.buffer = dynamic_array<UInt8>::wrap(static_cast<UInt8*>(destination), uncompressedSize, uncompressedSize,
                                                  kMemLabelGeneral);
    ReinitCachedBlock(&temporary, blockIndex);
    const CacheResult result = IsBlockStreamed(blockIndex) ? FillStreamCachedBlock(&temporary, uncompressedSize, batch)
                                                           : FillChunkCachedBlock(&temporary, batch);
    if (result == kCacheResultOk) *delivered = uncompressedSize;
    DeinitCachedBlock(&temporary);
    return result >= kCacheResultOk;
}

// Reads a part of a block: from the file when it is stored as is, else through the cache.
bool ArchiveStorageReader::ReadBlock(UInt32 blockIndex, UInt64 offsetInBlock, UInt64 size, void* destination,
                                     UInt64* delivered, BatchingFileReader* batch) {
    if (GetBlockType(blockIndex) == kCompressionNone)
        return batch->Read(destination, m_CompressedBlocksOffsets[blockIndex] + offsetInBlock, size, delivered);

    if (const BrokenBlocks::Record broken = FindBrokenBlock(blockIndex); offsetInBlock >= broken.from) {
        *delivered = 0;
        return broken.isCut;
    }
    CacheResult result = kCacheResultOk;
    CachedBlock* record = AcquireCachedBlock(blockIndex, static_cast<UInt32>(offsetInBlock));
    if (record == nullptr) record = AcquireAndPrefillUnusedBlock(blockIndex, &result, batch);
    if (record == nullptr) {
        *delivered = 0;
        return result >= kCacheResultOk;
    }
    result = CopyFromCachedBlock(record, offsetInBlock, size, destination, delivered, batch);
    ReleaseCachedBlock(record, result);
    return result >= kCacheResultOk;
}

ArchiveStorageReader::Block ArchiveStorageReader::GetBlock(UInt32 index) const {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[index];
    const CompressionType type = GetBlockType(index);
    Block block{
        .position = m_UncompressedBlocksOffsets[index],
        .size = stored.uncompressedSize,
        .storedSize = stored.compressedSize,
        .type = type,
        .isStreamed = type != kCompressionNone && IsBlockStreamed(index),
        .pieces = {},
    };
    m_Storage.Locate(m_CompressedBlocksOffsets[index], stored.compressedSize, block.pieces);
    return block;
}
