// Keeps what was decoded lately: whole blocks, and cursors, from which decoding of a large stream can go on. Files that
// are read in turns, in small pieces, then decode each block once. Any thread.
//
//   BlockCache::Use use(cache);
//   if (cache->Acquire(index, &use, failure) == ZARVO_OK) copy out of use.Data()
//
// The states of a block's record, and what operations do in each:
//
//              Acquire                         release                         room is needed
//   filling    waits until it is filled        (its filler's use)              kept
//   filled,    one more use                    one use less                    kept
//   in use
//   filled,    one more use                    (not held)                      the least recently used is freed
//   idle
//
// The record of a damaged block keeps the bytes that can be read, and the failure. A record that could not be filled,
// because memory was refused or the file could not be read to its end, is freed with its last use, and the next Acquire
// tries again.
#pragma once

#include "Library/BlockDecoder.h"
#include "Runtime/Threads/Mutex.h"

#include <algorithm>

class BlockCache : private NonCopyable {
    struct Record;

public:
    // A caller's hold on a record, which ends when it is destroyed.
    class Use : private NonCopyable {
    public:
        explicit Use(BlockCache* cache) : m_Cache(cache) {}
        ~Use();

        const UInt8* Data() const;
        size_t Readable() const; // bytes from the block's start; 0 while nothing is held

    private:
        friend class BlockCache;

        BlockCache* m_Cache;
        Record* m_Record = nullptr;
    };

    // decoder outlives the cache. maxIdleBytes: how much memory records and cursors may take while nobody uses them;
    // the one that was used last is always kept.
    BlockCache(const BlockDecoder* decoder, UInt64 maxIdleBytes);
    ~BlockCache(); // nobody holds a use or a cursor

    // Makes *use hold the whole block, decoded. After a failure it holds what can be read.
    zarvo_code Acquire(UInt32 blockIndex, Use* use, Failure* failure) VARNEX_NO_THREAD_SAFETY_ANALYSIS;

    // Whether the block is in the cache, or is being decoded into it.
    bool Has(UInt32 blockIndex);

    // Hands out the block's idle cursor that is nearest before offset, or a new one; null when memory is refused.
    StreamCursor* TakeCursor(UInt32 blockIndex, UInt64 offset);
    // cursor may be null.
    void GiveCursorBack(StreamCursor* cursor);

private:
    // A pointer to a record, and next to it the number that searches compare.
    struct Slot {
        UInt32 blockIndex;
        Record* record;
    };
    struct IdleCursor {
        StreamCursor* cursor;
        UInt64 lastUse;
        UInt64 bytes;
    };
    static constexpr size_t kMaxRecords = 256;
    static constexpr size_t kMaxIdleCursors = 16;

    void Release(Record* record);
    void Fill(Record* record);
    Record* Find(UInt32 blockIndex) VARNEX_REQUIRES(m_Lock);
    void Unlist(Record* record) VARNEX_REQUIRES(m_Lock);
    void FreeIdle(UInt64 maxBytes, size_t maxRecords, size_t maxCursors, const Record* kept) VARNEX_REQUIRES(m_Lock);
    StreamCursor* RemoveCursor(IdleCursor* idle) VARNEX_REQUIRES(m_Lock);
    UInt64 BytesLeftFor(UInt64 size) const { return m_MaxIdleBytes - std::min(m_MaxIdleBytes, size); }

    const BlockDecoder* m_Decoder;
    const UInt64 m_MaxIdleBytes;
    Mutex m_Lock; // never held while a block is read or decoded, or waited for
    dynamic_array<Slot> m_Slots VARNEX_GUARDED_BY(m_Lock);
    dynamic_array<IdleCursor> m_Cursors VARNEX_GUARDED_BY(m_Lock);
    UInt64 m_Bytes VARNEX_GUARDED_BY(m_Lock) = 0; // of listed records and idle cursors
    UInt64 m_Uses VARNEX_GUARDED_BY(m_Lock) = 0;  // counted so far: the next one's lastUse
};
