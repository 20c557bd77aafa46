// The block cache: records that hold decompressed data, who may use them, and how they are filled.
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/LogAssert.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

constexpr double kFillPollSeconds = 0.01;

static bool TryToClaim(std::atomic<SInt32>& beingWritten) {
    SInt32 expected = 0;
    return beingWritten.compare_exchange_strong(expected, 1);
}

IDecompressor* ArchiveStorageReader::GetDecompressor(CompressionType type) {
    if (!Check(type < kCompressionCount, "Assertion failed on expression: 't < kCompressionCount'")) return nullptr;
    std::atomic<IDecompressor*>& slot = m_Decompressors[type];
    IDecompressor* decompressor = slot.load(std::memory_order_acquire);
    if (decompressor != nullptr) return decompressor;
    IDecompressor* made = CreateDecompressor(type, m_Label);
    // No lock is held here: of two threads that make one at once, the second takes the first one's.
    if (made == nullptr || slot.compare_exchange_strong(decompressor, made, std::memory_order_acq_rel)) return made;
    Delete(made, m_Label);
    return decompressor;
}

CompressionType ArchiveStorageReader::GetBlockType(UInt32 blockIndex) const {
    if (blockIndex == kNoBlock) return kCompressionNone;
    const UInt32 flags = m_BlocksInfo.storageBlocks[blockIndex].flags;
    return static_cast<CompressionType>(flags & kStorageBlockCompressionTypeMask);
}

bool ArchiveStorageReader::IsBlockStreamed(UInt32 blockIndex) const {
    return blockIndex != kNoBlock && (m_BlocksInfo.storageBlocks[blockIndex].flags & kStorageBlockStreamed) != 0;
}

void ArchiveStorageReader::StampCachedBlock(CachedBlock* block) {
    // Whole-block reads take stamps without the cache lock; a stamp orders nothing else.
    block->lastAccess = m_AccessCounter.fetch_add(1, std::memory_order_relaxed);
}

ArchiveStorageReader::CachedBlock* ArchiveStorageReader::FindChunk(UInt32 blockIndex) {
    for (CachedBlock* block : m_CachedBlocks)
        if (block->blockIndex == blockIndex) return block;
    return nullptr;
}

// The idle record of a streamed block from which the offset is reached soonest, claimed: the one whose window starts
// last of those that start at or before it. The stream goes on from there.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::ClaimStream(UInt32 blockIndex, UInt32 offsetInBlock) {
    CachedBlock* nearest = nullptr;
    for (CachedBlock* block : m_CachedBlocks) {
        if (block->blockIndex != blockIndex || !TryToClaim(block->beingWritten)) continue;
        if (block->blockOffset > offsetInBlock || (nearest != nullptr && block->blockOffset <= nearest->blockOffset)) {
            block->beingWritten.exchange(0);
            continue;
        }
        if (nearest != nullptr) nearest->beingWritten.exchange(0);
        nearest = block;
    }
    return nearest;
}

ArchiveStorageReader::CachedBlock* ArchiveStorageReader::AcquireCachedBlock(UInt32 blockIndex, UInt32 offsetInBlock) {
    const bool isStreamed = IsBlockStreamed(blockIndex);
    m_CacheLock.Lock();
    CachedBlock* found = isStreamed ? ClaimStream(blockIndex, offsetInBlock) : FindChunk(blockIndex);
    if (found != nullptr && isStreamed) {
        Check(found->bufferReaders.load() == 0,
              "Assertion failed on expression: 'AtomicCompareExchange(&block->bufferReaders, 0, 0)'");
        found->bufferReaders.fetch_add(1);
    } else if (found != nullptr) {
        // As a reader first: the record can't be pointed at another block while this thread waits for its filler.
        found->bufferReaders.fetch_add(1);
        // Asked under the lock, where only a filler has the mark: a victim scan has given it back before it unlocks.
        if (found->beingWritten.load() != 0) {
            m_CacheLock.Unlock();
            while (found->beingWritten.load() != 0)
                CurrentThread::SleepForSeconds(kFillPollSeconds);
            m_CacheLock.Lock();
            if (found->blockIndex == kNoBlock) {
                found->bufferReaders.fetch_sub(1);
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

// The idle record that was used least recently, claimed; null when every record is in use.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::ClaimVictim() {
    CachedBlock* victim = nullptr;
    for (CachedBlock* block : m_CachedBlocks) {
        if (!TryToClaim(block->beingWritten)) continue;
        const bool isOlder =
            victim == nullptr || static_cast<SInt32>(block->lastAccess) < static_cast<SInt32>(victim->lastAccess);
        if (block->bufferReaders.load() != 0 || !isOlder) {
            block->beingWritten.exchange(0);
            continue;
        }
        Check(block->beingWritten.load() == 1, "ArchiveStorage block must be marked as being written!");
        if (victim != nullptr) victim->beingWritten.exchange(0);
        victim = block;
    }
    return victim;
}

// A new record, claimed; null when memory is refused.
ArchiveStorageReader::CachedBlock* ArchiveStorageReader::AddCachedBlock() {
    if (m_CachedBlocks.size() == m_CachedBlocks.capacity() && !m_CachedBlocks.grow()) return nullptr;
    CachedBlock* block = New<CachedBlock>(m_Label, m_Label);
    if (block == nullptr) return nullptr;
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
        if (record == nullptr) {
            *result = kCacheResultDecompressError;
            return nullptr;
        }
        ReinitCachedBlock(record, blockIndex);
        Check(record->beingWritten.load() == 1, "ArchiveStorage block must be marked as being written!");
        Check(record->bufferReaders.load() == 0, "ArchiveStorage block must have no readers before write!");
        record->bufferReaders.exchange(1);
    }

    const bool isStreamed = IsBlockStreamed(blockIndex);
    *result =
        isStreamed ? FillStreamCachedBlock(record, kStreamWindowSize, reader) : FillChunkCachedBlock(record, reader);
    if (isStreamed ? *result < kCacheResultOk : *result != kCacheResultOk) {
        // A half-filled record must not be taken for data of its block: readers that wait see that it names none.
        Mutex::AutoLock lock(m_CacheLock);
        ReinitCachedBlock(record, kNoBlock);
        record->bufferReaders.fetch_sub(1);
        record->beingWritten.exchange(0);
        return nullptr;
    }
    if (!isStreamed) {
        Check(record->beingWritten.load() == 1, "ArchiveStorage block must be marked as being written by us!");
        record->beingWritten.exchange(0);
    }
    return record;
}

// Ends the use that one of the two acquire operations began.
void ArchiveStorageReader::ReleaseCachedBlock(CachedBlock* block, bool isStreamed) {
    block->bufferReaders.fetch_sub(1);
    if (!isStreamed) return;
    Check(block->beingWritten.load() == 1, "ArchiveStorage block must be marked as being written by us!");
    block->beingWritten.exchange(0);
}

void ArchiveStorageReader::ReinitCachedBlock(CachedBlock* block, UInt32 blockIndex) {
    const CompressionType oldType = GetBlockType(block->blockIndex);
    const CompressionType newType = GetBlockType(blockIndex);
    const bool isStreamed = IsBlockStreamed(blockIndex);

    // Between streamed blocks of one kind the state is kept, and only reset.
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

// Releases the stream state of a record that is about to be freed or pointed elsewhere.
void ArchiveStorageReader::DeinitCachedBlock(CachedBlock* block) {
    if (block->streamState == nullptr) return;
    if (IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex)))
        decompressor->DecompressStreamDeinit(block->streamState);
}

// Frees every record that nobody uses; none is in use when the rules of MakeStorageUnused are kept. What is known to be
// damaged is forgotten, too: the file may be whole when it is opened again.
void ArchiveStorageReader::EmptyCache() {
    Mutex::AutoLock lock(m_CacheLock);
    m_HasBrokenBlocks = false;
    m_BrokenBlocks.Clear();
    size_t kept = 0;
    for (CachedBlock* block : m_CachedBlocks) {
        const bool isClaimed = TryToClaim(block->beingWritten);
        if (!isClaimed || block->bufferReaders.load() != 0) {
            if (isClaimed) block->beingWritten.exchange(0);
            m_CachedBlocks[kept++] = block;
            continue;
        }
        DeinitCachedBlock(block);
        Delete(block, m_Label);
    }
    m_CachedBlocks.truncate(kept);
}

// Remembers that a block's data can't be had from some place on. Only what would fail in the same way, and as silently,
// every time is noted. Kept until the file is closed.
void ArchiveStorageReader::NoteBrokenBlock(const BrokenBlocks::Record& record) {
    Mutex::AutoLock lock(m_CacheLock);
    m_BrokenBlocks.Note(record);
    m_HasBrokenBlocks = true;
}

BrokenBlocks::Record ArchiveStorageReader::FindBrokenBlock(UInt32 blockIndex) {
    if (!m_HasBrokenBlocks) return {};
    Mutex::AutoLock lock(m_CacheLock);
    return m_BrokenBlocks.Find(blockIndex);
}

// Produces the next window of a streamed block: up to maxSize bytes that follow the window before.
ArchiveStorageReader::CacheResult ArchiveStorageReader::FillStreamCachedBlock(CachedBlock* block, UInt64 maxSize,
                                                                              BatchingFileReader* reader) {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[block->blockIndex];
    const UInt64 storedStart = m_CompressedBlocksOffsets[block->blockIndex];
    const IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex));
    if (decompressor == nullptr) return kCacheResultDecompressError;

    block->blockOffset += static_cast<UInt32>(block->buffer.size());
    const size_t want = static_cast<size_t>(std::min<UInt64>(stored.uncompressedSize - block->blockOffset, maxSize));
    if (!block->buffer.resize_uninitialized(want, kResizeExact)) {
        block->buffer.clear();
        return kCacheResultDecompressError;
    }
    // A whole block that fails in one window says nothing of where.
    const UInt64 brokenFrom = maxSize <= kStreamWindowSize ? block->blockOffset : stored.uncompressedSize;
    // What has no stream has reported that, and does so each time.
    const auto noteDamage = [&] {
        if (block->streamState != nullptr) NoteBrokenBlock({.from = brokenFrom, .blockIndex = block->blockIndex});
    };
    const bool reachesBlockEnd = block->blockOffset + UInt64{want} == stored.uncompressedSize;

    size_t produced = 0;
    CacheResult result = kCacheResultOk;
    while (produced < want) {
        if (block->compressedPos >= block->compressedBuffer.size()) {
            const UInt32 piece = std::min(stored.compressedSize - block->compressedLoaded, kStreamWindowSize);
            block->compressedPos = 0;
            const bool hasRoom = block->compressedBuffer.resize_uninitialized(piece, kResizeExact);
            if (piece != 0) {
                const UInt64 position = storedStart + block->compressedLoaded;
                UInt64 delivered = 0;
                if (!hasRoom || !reader->Read(block->compressedBuffer.data(), position, piece, &delivered)) {
                    block->compressedBuffer.clear();
                    if (IsBehindStorageEnd(position)) noteDamage();
                    result = kCacheResultReadError;
                    break;
                }
                block->compressedBuffer.truncate(static_cast<size_t>(delivered));
                block->compressedLoaded += static_cast<UInt32>(delivered);
            }
        }

        size_t available = block->compressedBuffer.size() - block->compressedPos;
        const bool isAllLoaded = block->compressedLoaded == stored.compressedSize;
        // With all stored bytes used up the decoder may still hold output back; it is asked once more, for the rest.
        if (available == 0 && !isAllLoaded) {
            result = kCacheResultIncomplete;
            break;
        }
        static constexpr UInt8 kNoInput = 0; // never read: decoders are spared a null pointer
        const UInt8* source = available != 0 ? block->compressedBuffer.data() + block->compressedPos : &kNoInput;
        size_t room = want - produced;
        const DecompressResult decoded =
            decompressor->TryDecompressStream(block->streamState, source, &available, block->buffer.data() + produced,
                                              &room, isAllLoaded && reachesBlockEnd);
        if (decoded != DecompressResult::kOk) {
            if (decoded == DecompressResult::kDamaged) noteDamage();
            result = kCacheResultDecompressError;
            break;
        }
        if (available == 0 && room == 0) {
            result = kCacheResultIncomplete;
            break;
        }
        block->compressedPos += static_cast<UInt32>(available);
        produced += room;
    }
    block->buffer.truncate(produced);
    return result;
}

// Decompresses a whole chunk block into the record.
ArchiveStorageReader::CacheResult ArchiveStorageReader::FillChunkCachedBlock(CachedBlock* block,
                                                                             BatchingFileReader* reader) {
    const StorageBlock& stored = m_BlocksInfo.storageBlocks[block->blockIndex];
    const UInt64 storedStart = m_CompressedBlocksOffsets[block->blockIndex];
    const IDecompressor* decompressor = GetDecompressor(GetBlockType(block->blockIndex));
    if (decompressor == nullptr) return kCacheResultDecompressError;
    Check(block->blockOffset == 0 && block->buffer.empty(),
          "Assertion failed on expression: 'cachedBlock->blockOffset == 0 && cachedBlock->buffer.size() == 0'");

    const bool isStoredAsIs = stored.compressedSize == stored.uncompressedSize;
    dynamic_array<UInt8>& loaded = isStoredAsIs ? block->buffer : block->compressedBuffer;
    if (!block->buffer.resize_uninitialized(stored.uncompressedSize, kResizeExact) ||
        !loaded.resize_uninitialized(stored.compressedSize, kResizeExact))
        return kCacheResultDecompressError;

    UInt64 delivered = 0;
    const bool isRead = reader->Read(loaded.data(), storedStart, stored.compressedSize, &delivered);
    if (!isRead || delivered != stored.compressedSize) {
        // A block whose last byte is missing stays what it is now; any other failure may pass.
        if (stored.compressedSize != 0 && IsBehindStorageEnd(storedStart + stored.compressedSize - 1))
            NoteBrokenBlock({.from = 0, .blockIndex = block->blockIndex, .isCut = isRead});
        return isRead ? kCacheResultIncomplete : kCacheResultReadError;
    }
    if (!isStoredAsIs) {
        size_t consumed = stored.compressedSize;
        size_t produced = stored.uncompressedSize;
        const DecompressResult decoded =
            decompressor->TryDecompressMemory(loaded.data(), &consumed, block->buffer.data(), &produced);
        if (decoded != DecompressResult::kOk || produced != stored.uncompressedSize) {
            // Sizes that LZ4 does not take are reported each time.
            if (decoded != DecompressResult::kOutOfMemory &&
                std::max(stored.uncompressedSize, stored.compressedSize) < Lz4Decompressor::kSizeLimit)
                NoteBrokenBlock({.from = 0, .blockIndex = block->blockIndex});
            return kCacheResultDecompressError;
        }
    }
    block->blockOffset = 0;
    return kCacheResultOk;
}
