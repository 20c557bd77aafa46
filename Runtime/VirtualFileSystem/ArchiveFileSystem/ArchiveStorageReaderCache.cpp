// The block cache: records that hold decompressed data, who may use them, and how they are filled.
#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/BatchingFileReader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/CachedBlock.h"

#include <algorithm>
#include <cstring>

using namespace ArchiveStorageHeader;

constexpr double kFillPollSeconds = 0.01;

IDecompressor* ArchiveStorageReader::GetDecompressor(CompressionType type) {
    if (!Check(type < kCompressionCount, FixedReports::kUnknownCompressionType)) return nullptr;
    std::atomic<IDecompressor*>& slot = m_Decompressors[type];
    IDecompressor* decompressor = slot.load(std::memory_order_acquire); // sees what its maker wrote
    if (decompressor != nullptr) return decompressor;
    Owned<IDecompressor> made(CreateDecompressor(type, m_Label), m_Label);
    // No lock is held here: when two threads make one at once, the second drops its own and takes the first one's.
    if (!made || !slot.compare_exchange_strong(decompressor, made.get(), std::memory_order_acq_rel))
        return decompressor;
    return made.release();
}

void ArchiveStorageReader::StampCachedBlock(CachedBlock* block) {
    // Relaxed: whole-block reads take stamps without the cache lock, and a stamp orders no other access.
    block->lastAccess = m_AccessCounter.fetch_add(1, std::memory_order_relaxed);
}

ArchiveStorageReader::CachedBlock* ArchiveStorageReader::FindChunk(UInt32 blockIndex) {
    for (CachedBlock* block : m_CachedBlocks)
        if (block->blockIndex == blockIndex) return block;
    return nullptr;
}

// Claims the idle record from which the stream reaches the offset soonest: of those whose window starts at or before
// the offset, the one whose window starts last.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::ClaimStream(UInt32 blockIndex, UInt32 offsetInBlock) {
    CachedBlock* nearest = nullptr;
    for (CachedBlock* block : m_CachedBlocks) {
        if (block->blockIndex != blockIndex || !block->TryToClaim()) continue;
        if (block->blockOffset > offsetInBlock || (nearest != nullptr && block->blockOffset <= nearest->blockOffset)) {
            block->Unclaim();
            continue;
        }
        if (nearest != nullptr) nearest->Unclaim();
        nearest = block;
    }
    return nearest;
}

ArchiveStorageReader::CachedBlock* ArchiveStorageReader::AcquireCachedBlock(UInt32 blockIndex, UInt32 offsetInBlock) {
    const bool isStreamed = IsBlockStreamed(blockIndex);
    m_CacheLock.Lock();
    CachedBlock* found = isStreamed ? ClaimStream(blockIndex, offsetInBlock) : FindChunk(blockIndex);
    if (found != nullptr && isStreamed) {
        Check(!found->HasReaders(), FixedReports::kClaimedStreamHasReaders);
        found->AddReader();
    } else if (found != nullptr) {
        // Count in first, so that nobody points the record at another block while this thread waits for its filler.
        found->AddReader();
        // Under the lock, a claimed record is being filled: a victim scan gives its marks back before it unlocks.
        if (found->IsClaimed()) {
            m_CacheLock.Unlock();
            while (found->IsClaimed())
                CurrentThread::SleepForSeconds(kFillPollSeconds);
            m_CacheLock.Lock();
            if (found->blockIndex == kNoBlock) {
                found->RemoveReader();
                found = nullptr;
            }
        }
    }

    if (found != nullptr) {
        Check(found->blockIndex == blockIndex, "Acquired block must have the same index as requested");
        StampCachedBlock(found);
    }
    m_CacheLock.Unlock();
    return found;
}

// Claims the idle record that was used least recently; null when every record is in use.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::ClaimVictim() {
    CachedBlock* victim = nullptr;
    for (CachedBlock* block : m_CachedBlocks) {
        if (!block->TryToClaim()) continue;
        const bool isOlder =
            victim == nullptr || static_cast<SInt32>(block->lastAccess) < static_cast<SInt32>(victim->lastAccess);
        if (block->HasReaders() || !isOlder) {
            block->Unclaim();
            continue;
        }
        Check(block->IsClaimed(), "ArchiveStorage block must be marked as being written!");
        if (victim != nullptr) victim->Unclaim();
        victim = block;
    }
    return victim;
}

// Makes a record, which starts claimed.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::AddCachedBlock() {
    CachedBlock* block = RequireMemory(New<CachedBlock>(m_Label, m_Label));
    StampCachedBlock(block);
    m_CachedBlocks.push_back(block);
    return block;
}

ArchiveStorageReader::CachedBlock*
ArchiveStorageReader::AcquireAndPrefillUnusedBlock(UInt32 blockIndex, CacheResult* result, BatchingFileReader* reader) {
    CachedBlock* record;
    {
        Mutex::AutoLock lock(m_CacheLock);
        record = ClaimVictim();
        if (record == nullptr) record = AddCachedBlock();
        ReinitCachedBlock(record, blockIndex);
        Check(record->IsClaimed(), "ArchiveStorage block must be marked as being written!");
        Check(!record->HasReaders(), "ArchiveStorage block must have no readers before write!");
        record->AddReader();
    }

    const bool isStreamed = IsBlockStreamed(blockIndex);
    *result =
        isStreamed ? FillStreamCachedBlock(record, kStreamWindowSize, reader) : FillChunkCachedBlock(record, reader);
    if (isStreamed ? *result < kCacheResultOk : *result != kCacheResultOk) {
        // A half-filled record names no block, which the readers that wait for it see when it is unclaimed.
        Mutex::AutoLock lock(m_CacheLock);
        ReinitCachedBlock(record, kNoBlock);
        record->RemoveReader();
        record->Unclaim();
        return nullptr;
    }
    if (!isStreamed) {
        Check(record->IsClaimed(), "ArchiveStorage block must be marked as being written by us!");
        record->Unclaim();
    }
    return record;
}

// Copies out of a record that the caller holds, moving the window of a streamed one forward as far as needed.
ArchiveStorageReader::CacheResult ArchiveStorageReader::CopyFromCachedBlock(CachedBlock* record, UInt64 offsetInBlock,
                                                                            UInt64 size, void* destination,
                                                                            UInt64* delivered,
                                                                            BatchingFileReader* reader) {
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
        result = FillStreamCachedBlock(record, kStreamWindowSize, reader);
        if (result < kCacheResultOk) break;
        if (record->buffer.empty()) {
            Check(result == kCacheResultIncomplete, "Must have a data after decompression");
            break;
        }
    }
    *delivered = copied;
    return result;
}

// Ends the use that one of the two acquire operations began. result: of CopyFromCachedBlock.
void ArchiveStorageReader::ReleaseCachedBlock(CachedBlock* block, CacheResult result) {
    const bool isStreamed = IsBlockStreamed(block->blockIndex);
    if (result < kCacheResultOk) {
        // A failed decoder can't continue; the next reader starts the stream over.
        Mutex::AutoLock lock(m_CacheLock);
        ReinitCachedBlock(block, kNoBlock);
    }
    block->RemoveReader();
    if (!isStreamed) return;
    Check(block->IsClaimed(), "ArchiveStorage block must be marked as being written by us!");
    block->Unclaim();
}

void ArchiveStorageReader::ReinitCachedBlock(CachedBlock* block, UInt32 blockIndex) {
    const CompressionType oldType = GetBlockType(block->blockIndex);
    const CompressionType newType = GetBlockType(blockIndex);
    const bool isStreamed = IsBlockStreamed(blockIndex);

    // The state is kept, and only reset, when both blocks are streamed and of one kind.
    if (IsBlockStreamed(block->blockIndex) && !(isStreamed && newType == oldType)) {
        DeinitCachedBlock(block);
        block->streamState = nullptr;
    }
    block->blockIndex = blockIndex;
    block->blockOffset = 0;
    block->buffer.clear();
    if (isStreamed && newType != kCompressionNone) {
        if (IDecompressor* decompressor = GetDecompressor(newType))
            Check(decompressor->DecompressStreamInit(&block->streamState),
                  "Decompressor's stream must be initialized!");
    }
    block->compressedBuffer.clear();
    block->compressedPos = 0;
    block->compressedLoaded = 0;
    StampCachedBlock(block);
}

// Frees the stream state of a record that is about to be freed or pointed at another block.
void ArchiveStorageReader::DeinitCachedBlock(CachedBlock* block) {
    if (block->streamState == nullptr) return;
    if (IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex)))
        decompressor->DecompressStreamDeinit(block->streamState);
}

// Frees every record that nobody uses, which is all of them when the callers of MakeStorageUnused keep its rules. Also
// forgets which blocks are damaged: the file may be whole when it is opened again.
void ArchiveStorageReader::EmptyCache() {
    Mutex::AutoLock lock(m_CacheLock);
    m_HasBrokenBlocks.store(false, std::memory_order_relaxed);
    m_BrokenBlocks.Clear();
    size_t kept = 0;
    for (CachedBlock* block : m_CachedBlocks) {
        const bool isClaimed = block->TryToClaim();
        if (!isClaimed || block->HasReaders()) {
            if (isClaimed) block->Unclaim();
            m_CachedBlocks[kept++] = block;
            continue;
        }
        DeinitCachedBlock(block);
        Delete(block, m_Label);
    }
    m_CachedBlocks.truncate(kept);
}

// Remembers until the file is closed that a block is damaged, and from where on. Call it only for a failure that would
// repeat at each read, and that nobody reports.
void ArchiveStorageReader::NoteBrokenBlock(const BrokenBlocks::Record& record) {
    Mutex::AutoLock lock(m_CacheLock);
    m_BrokenBlocks.Note(record);
    m_HasBrokenBlocks.store(true, std::memory_order_relaxed);
}

// Notes nothing for a kind that can't be streamed, because each read of the block must report it.
void ArchiveStorageReader::NoteBrokenStream(const CachedBlock& block, UInt64 from) {
    if (block.streamState != nullptr) NoteBrokenBlock({.from = from, .blockIndex = block.blockIndex});
}

BrokenBlocks::Record ArchiveStorageReader::FindBrokenBlock(UInt32 blockIndex) {
    // Relaxed: it only saves the lock. A thread that misses a new note reads the damaged block and fails by itself.
    if (!m_HasBrokenBlocks.load(std::memory_order_relaxed)) return {};
    Mutex::AutoLock lock(m_CacheLock);
    return m_BrokenBlocks.Find(blockIndex);
}

// Produces the next window of a streamed block: up to maxSize bytes that follow the window before.
ArchiveStorageReader::CacheResult ArchiveStorageReader::FillStreamCachedBlock(CachedBlock* block, UInt64 maxSize,
                                                                              BatchingFileReader* reader) {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[block->blockIndex];
    const IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex));
    if (decompressor == nullptr) return kCacheResultDecompressError;

    block->blockOffset += static_cast<UInt32>(block->buffer.size());
    const size_t want = static_cast<size_t>(std::min<UInt64>(stored.uncompressedSize - block->blockOffset, maxSize));
    if (!block->buffer.resize_uninitialized(want, kResizeExact)) {
        block->buffer.clear();
        return kCacheResultDecompressError;
    }
    const bool reachesBlockEnd = block->blockOffset + UInt64{want} == stored.uncompressedSize;
    // The failure of a whole block in one window doesn't tell where the damage is.
    const UInt64 brokenFrom = maxSize <= kStreamWindowSize ? block->blockOffset : stored.uncompressedSize;

    size_t produced = 0;
    CacheResult result = kCacheResultOk;
    while (produced < want && result == kCacheResultOk) {
        result = LoadStreamInput(block, brokenFrom, reader);
        if (result != kCacheResultOk) break;
        static constexpr UInt8 kNoInput = 0; // never read; the decoder is not given a null pointer
        size_t available = block->compressedBuffer.size() - block->compressedPos;
        size_t room = want - produced;
        const bool isLastInput = block->compressedLoaded == stored.compressedSize && reachesBlockEnd;
        const UInt8* const source = available != 0 ? block->compressedBuffer.data() + block->compressedPos : &kNoInput;
        const DecompressResult decoded = decompressor->TryDecompressStream(
            block->streamState, source, &available, block->buffer.data() + produced, &room, isLastInput);
        if (decoded != DecompressResult::kOk) {
            if (decoded == DecompressResult::kDamaged) NoteBrokenStream(*block, brokenFrom);
            result = kCacheResultDecompressError;
        } else if (available == 0 && room == 0) {
            result = kCacheResultIncomplete;
        } else {
            block->compressedPos += static_cast<UInt32>(available);
            produced += room;
        }
    }
    block->buffer.truncate(produced);
    return result;
}

// Loads the next piece of a streamed block's stored bytes, once the last one is used up. After all of them, Ok without
// input: the decoder may still hold output back. Incomplete when the file ends before the block does.
ArchiveStorageReader::CacheResult ArchiveStorageReader::LoadStreamInput(CachedBlock* block, UInt64 brokenFrom,
                                                                        BatchingFileReader* reader) {
    if (block->compressedPos < block->compressedBuffer.size()) return kCacheResultOk;
    const UInt32 left = m_BlocksInfo.storageBlocks[block->blockIndex].compressedSize - block->compressedLoaded;
    const UInt32 piece = std::min(left, kStreamWindowSize);
    block->compressedPos = 0;
    const bool hasRoom = block->compressedBuffer.resize_uninitialized(piece, kResizeExact);
    if (piece == 0) return kCacheResultOk;

    const UInt64 position = m_CompressedBlocksOffsets[block->blockIndex] + block->compressedLoaded;
    UInt64 delivered = 0;
    if (!hasRoom || !reader->Read(block->compressedBuffer.data(), position, piece, &delivered)) {
        block->compressedBuffer.clear();
        if (m_Storage.EndsBy(position)) NoteBrokenStream(*block, brokenFrom);
        return kCacheResultReadError;
    }
    block->compressedBuffer.truncate(static_cast<size_t>(delivered));
    block->compressedLoaded += static_cast<UInt32>(delivered);
    return delivered != 0 ? kCacheResultOk : kCacheResultIncomplete;
}

// Decompresses a whole chunk block into the record.
ArchiveStorageReader::CacheResult ArchiveStorageReader::FillChunkCachedBlock(CachedBlock* block,
                                                                             BatchingFileReader* reader) {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[block->blockIndex];
    const UInt64 storedStart = m_CompressedBlocksOffsets[block->blockIndex];
    const IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex));
    if (decompressor == nullptr) return kCacheResultDecompressError;
    Check(block->blockOffset == 0 && block->buffer.empty(), FixedReports::kChunkHasData);

    const bool isStoredAsIs = stored.compressedSize == stored.uncompressedSize;
    dynamic_array<UInt8>& loaded = isStoredAsIs ? block->buffer : block->compressedBuffer;
    if (!block->buffer.resize_uninitialized(stored.uncompressedSize, kResizeExact) ||
        !loaded.resize_uninitialized(stored.compressedSize, kResizeExact))
        return kCacheResultDecompressError;

    UInt64 delivered = 0;
    const bool isRead = reader->Read(loaded.data(), storedStart, stored.compressedSize, &delivered);
    if (!isRead || delivered != stored.compressedSize) {
        // Without its last byte, the block will fail again; any other failure may pass.
        if (stored.compressedSize != 0 && m_Storage.EndsBy(storedStart + stored.compressedSize - 1))
            NoteBrokenBlock({.from = 0, .blockIndex = block->blockIndex, .isCut = isRead});
        return isRead ? kCacheResultIncomplete : kCacheResultReadError;
    }
    if (!isStoredAsIs) {
        size_t consumed = stored.compressedSize;
        size_t produced = stored.uncompressedSize;
        const DecompressResult decoded =
            decompressor->TryDecompressMemory(loaded.data(), &consumed, block->buffer.data(), &produced);
        if (decoded != DecompressResult::kOk || produced != stored.uncompressedSize) {
            // Sizes that LZ4 doesn't take are reported each time.
            if (decoded != DecompressResult::kOutOfMemory &&
                std::max(stored.uncompressedSize, stored.compressedSize) < Lz4Decompressor::kSizeLimit)
                NoteBrokenBlock({.from = 0, .blockIndex = block->blockIndex});
            return kCacheResultDecompressError;
        }
    }
    block->blockOffset = 0;
    return kCacheResultOk;
}
