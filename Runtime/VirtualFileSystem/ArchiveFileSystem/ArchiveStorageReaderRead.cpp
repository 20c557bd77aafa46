// Reads of the data stream: which blocks a range touches, and how the bytes of each reach the caller.
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include "Runtime/Utilities/LogAssert.h"

#include <algorithm>
#include <cstring>

using namespace ArchiveStorageHeader;

// The block that holds a position of the stream; false when the position lies behind the stream's end.
bool ArchiveStorageReader::FindBlock(UInt64 position, UInt32* blockIndex) const {
    if (position >= m_UncompressedBlocksOffsets.back()) return false;
    const UInt64* const first = m_UncompressedBlocksOffsets.begin();
    const UInt64* const behind = std::upper_bound(first, m_UncompressedBlocksOffsets.end(), position);
    *blockIndex = static_cast<UInt32>(behind - first - 1);
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
    // Of a last block that is stored as is, no more is wanted than the range holds.
    UInt64 wantedEnd = storedEnd;
    if (GetBlockType(end) == kCompressionNone)
        wantedEnd =
            std::min(storedEnd, m_CompressedBlocksOffsets[end] + (from + size - m_UncompressedBlocksOffsets[end]));
    BatchingFileReader batch(this, start != end ? kBatchSize : 0, m_CompressedBlocksOffsets[start], storedEnd,
                             wantedEnd);
    UInt8* const destination = static_cast<UInt8*>(buffer);
    UInt64 delivered = 0;
    for (UInt32 index = start; index <= end; index = NextBlock(index)) {
        const UInt64 blockStart = m_UncompressedBlocksOffsets[index];
        const UInt64 blockSize = m_BlocksInfo.storageBlocks[index].uncompressedSize;
        Check(blockStart <= from + delivered && blockStart + blockSize >= from + delivered,
              "Assertion failed on expression: 'm_UncompressedBlocksOffsets[blockInd] <= from.Cast<UInt64>() + dstPos "
              "&& m_UncompressedBlocksOffsets[blockInd] + uncompressedBlockSize >= from.Cast<UInt64>() + dstPos'");
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

// A whole block straight into the caller's memory: no cached record, no copy.
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

// A part of a block: stored bytes from the file, compressed ones through the cache.
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
    if (result < kCacheResultOk) {
        // A stream that has failed can't be gone on with: the next reader starts it anew.
        Mutex::AutoLock lock(m_CacheLock);
        ReinitCachedBlock(record, kNoBlock);
    }
    ReleaseCachedBlock(record, IsBlockStreamed(blockIndex));
    return result >= kCacheResultOk;
}

// Copies out of a record that the caller holds, moving the window of a streamed one forward as far as it takes.
ArchiveStorageReader::CacheResult ArchiveStorageReader::CopyFromCachedBlock(CachedBlock* record, UInt64 offsetInBlock,
                                                                            UInt64 size, void* destination,
                                                                            UInt64* delivered,
                                                                            BatchingFileReader* batch) {
    UInt8* const to = static_cast<UInt8*>(destination);
    UInt64 copied = 0;
    CacheResult result = kCacheResultOk;
    while (copied < size) {
        const UInt64 position = offsetInBlock + copied;
        const UInt64 windowStart = record->blockOffset;
        const UInt64 windowEnd = windowStart + record->buffer.size();
        if (position >= windowStart && position < windowEnd) {
            const UInt64 count = std::min(size - copied, windowEnd - position);
            memcpy(to + copied, record->buffer.data() + (position - windowStart), static_cast<size_t>(count));
            copied += count;
            continue;
        }
        if (!Check(IsBlockStreamed(record->blockIndex),
                   "Only streamed block can be partially decompressed to the buffer"))
            break;
        if (!Check(position >= windowStart, "Decompressed buffer must have new data")) break;
        result = FillStreamCachedBlock(record, kStreamWindowSize, batch);
        if (result < kCacheResultOk) break;
        if (record->buffer.empty()) {
            Check(result == kCacheResultIncomplete, "Must have a data after decompression");
            break;
        }
    }
    *delivered = copied;
    return result;
}

// Reads stored bytes of the file. With a hidden LZMA size field, stored positions 0 to 4 are the properties, and
// position 5 is what follows the field.
bool ArchiveStorageReader::ReadFromStorage(UInt64 position, UInt64 size, void* destination, UInt64* delivered) {
    UInt8* to = static_cast<UInt8*>(destination);
    UInt64 filePosition = m_DataOffset + position;
    UInt64 firstPart = 0;
    Mutex::AutoLock lock(m_StorageLock);
    if (m_HideLzmaSizeField) {
        if (position < kLzmaPropertiesSize && size != 0) {
            const UInt64 wanted = std::min<UInt64>(kLzmaPropertiesSize - position, size);
            if (!m_File.Read(VFS::FileSize(filePosition), wanted, to, &firstPart)) return false;
            to += firstPart;
            size -= firstPart;
            filePosition += firstPart;
            // A first part that is cut short ends the file; nothing behind the field may take its place.
            if (firstPart < wanted || size == 0) {
                *delivered = firstPart;
                return true;
            }
        }
        filePosition += kLzmaSizeFieldSize;
    }
    UInt64 got = 0;
    const bool isRead = m_File.Read(VFS::FileSize(filePosition), size, to, &got);
    if (isRead) *delivered = firstPart + got;
    return isRead;
}

ArchiveStorageReader::Block ArchiveStorageReader::GetBlock(UInt32 index) const {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[index];
    const CompressionType type = GetBlockType(index);
    const UInt64 storedPosition = m_CompressedBlocksOffsets[index];
    Block block{
        .position = m_UncompressedBlocksOffsets[index],
        .size = stored.uncompressedSize,
        .storedSize = stored.compressedSize,
        .type = type,
        .isStreamed = type != kCompressionNone && IsBlockStreamed(index),
        .pieces = {{m_DataOffset + storedPosition, stored.compressedSize}, {0, 0}},
    };
    if (m_HideLzmaSizeField && stored.compressedSize > kLzmaPropertiesSize) { // the only block
        block.pieces[0].size = kLzmaPropertiesSize;
        block.pieces[1] = {m_DataOffset + kLzmaPropertiesSize + kLzmaSizeFieldSize,
                           stored.compressedSize - kLzmaPropertiesSize};
    }
    return block;
}

// Whether the file has no stored byte at or behind this position.
bool ArchiveStorageReader::IsBehindStorageEnd(UInt64 position) {
    if (m_HideLzmaSizeField && position >= kLzmaPropertiesSize) position += kLzmaSizeFieldSize;
    Mutex::AutoLock lock(m_StorageLock);
    return m_File.Seek(0, kFileOriginEnd) && m_File.Position() <= VFS::FileSize(m_DataOffset + position);
}

ArchiveStorageReader::BatchingFileReader::BatchingFileReader(ArchiveStorageReader* reader, UInt64 batchSize,
                                                             UInt64 startPos, UInt64 endPos, UInt64 wantedEnd)
    : m_Reader(reader),
      m_BatchSize(batchSize),
      m_StartPos(startPos),
      m_EndPos(endPos),
      m_WantedEnd(wantedEnd),
      m_Buffer(kMemLabelReadBatch) {}

bool ArchiveStorageReader::BatchingFileReader::Read(void* destination, UInt64 position, UInt64 size,
                                                    UInt64* delivered) {
    Check(position >= m_StartPos, "Assertion failed on expression: 'position >= m_StartPos'");
    Check(position <= m_EndPos && size <= m_EndPos - position,
          "Assertion failed on expression: 'position + size <= m_EndPos'");
    // What nothing would be read ahead of needs no window.
    const bool isRest = size != 0 && position >= m_LoadedWindowEnd && size == m_WantedEnd - position;
    if (m_BatchSize <= size || m_LoadedWindowStart > position || isRest)
        return m_Reader->ReadFromStorage(position, size, destination, delivered);

    UInt64 current = position;
    UInt64 remaining = size;
    while (remaining != 0) {
        if (current >= m_LoadedWindowEnd) {
            const UInt64 end = current < m_WantedEnd ? m_WantedEnd : m_EndPos;
            const UInt64 length = std::min(m_BatchSize, end - current);
            if (!m_Buffer.resize_uninitialized(static_cast<size_t>(length), kResizeExact)) return false;
            UInt64 got = 0;
            if (!m_Reader->ReadFromStorage(current, length, m_Buffer.data(), &got)) return false;
            m_LoadedWindowStart = current;
            m_LoadedWindowEnd = current + got;
            if (got < remaining && got < length) remaining = got; // the file has ended
            if (got == 0) break;
        }
        const UInt64 count = std::min(remaining, m_LoadedWindowEnd - current);
        Check(current >= m_LoadedWindowStart && current + count <= m_LoadedWindowEnd,
              "Assertion failed on expression: 'curPosition >= m_LoadedWindowStart && curPosition + readSize <= "
              "m_LoadedWindowEnd'");
        memcpy(static_cast<UInt8*>(destination) + (current - position),
               m_Buffer.data() + (current - m_LoadedWindowStart), static_cast<size_t>(count));
        current += count;
        remaining -= count;
    }
    *delivered = current - position;
    return true;
}
