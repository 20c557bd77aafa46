// A record of the reader's block cache. Private to the reader.
#pragma once

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

// Decompressed data of one block: the whole of a chunk block, or a window of a streamed one.
//
// States by operations (w: beingWritten, r: bufferReaders):
//
//                       acquire of its block    victim scan     release or end of fill      EmptyCache
//   idle     w 0, r 0   chunk: r 1, shared      w 1, r 1,       (not held)                  freed
//                       streamed: w 1, r 1,     filling another
//                       owned                   block
//   filling  w 1, r 1   chunk: r + 1, then      skipped         filled: owned, or a chunk   kept
//                       waits for w 0                           w 0, shared; failed: names
//                       streamed: skipped                       no block, r - 1, w 0
//   shared   w 0, r n   r + 1                   given back      r - 1                       kept
//   owned    w 1, r 1   skipped                 skipped         r 0, w 0                    kept
//
// m_CacheLock is held to acquire, to scan, to name a block or none, and to stamp. The other members belong to the
// filler or owner, and are only read while the record is shared. A record with readers is never pointed at another
// block; only its filler or owner, when a fill has failed, makes it name none, which the threads that wait then see.
//
// The mark and the count change by sequentially consistent operations only, so that all threads see the changes of both
// in one order. The verbs say which part of that order they need.
struct ArchiveStorageReader::CachedBlock {
    explicit CachedBlock(MemLabelId label) : buffer(label), compressedBuffer(label) {}

    // Marks the record as this thread's to write. False when another thread has the mark.
    // Acquires what the thread that last gave up the mark has written to the record.
    bool TryToClaim() {
        SInt32 unclaimed = 0;
        return beingWritten.compare_exchange_strong(unclaimed, 1, std::memory_order_seq_cst);
    }

    // Gives up the mark. Releases the record's data to the thread that sees it unclaimed, with or without the cache
    // lock.
    void Unclaim() { beingWritten.exchange(0, std::memory_order_seq_cst); }

    // Acquires the data when it is false: a thread that waits for a fill asks this without the cache lock.
    bool IsClaimed() const { return beingWritten.load(std::memory_order_seq_cst) != 0; }

    // Counts a reader in, under the cache lock. It comes before the reader asks for the mark, while a victim scan takes
    // the mark and then asks for readers: in one order of all four, one of them sees the other.
    void AddReader() { bufferReaders.fetch_add(1, std::memory_order_seq_cst); }

    // Counts a reader out, without the lock. Releases: its copying ends before another thread sees no readers.
    void RemoveReader() { bufferReaders.fetch_sub(1, std::memory_order_seq_cst); }

    // Acquires when it is false: a claimant that sees no readers overwrites what they have copied.
    bool HasReaders() const { return bufferReaders.load(std::memory_order_seq_cst) != 0; }

    UInt32 blockIndex = kNoBlock;
    UInt32 blockOffset = ~UInt32{0}; // of buffer's first byte, in the block's data
    dynamic_array<UInt8> buffer;
    std::atomic<SInt32> bufferReaders{0};
    std::atomic<SInt32> beingWritten{1};   // a new record is its maker's
    UInt32 lastAccess = 0;                 // a smaller stamp is less recently used
    void* streamState = nullptr;           // of a streamed block whose kind can be streamed
    dynamic_array<UInt8> compressedBuffer; // stored bytes: a whole chunk, or a piece of a stream
    UInt32 compressedPos = 0;              // streamed: how many bytes of compressedBuffer have been consumed
    UInt32 compressedLoaded = 0;           // streamed: how many of the block's stored bytes have been loaded
};
