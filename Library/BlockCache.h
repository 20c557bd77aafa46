// What has been decoded lately: whole blocks, and places inside large streams from which decoding can go on. Files that
// are read in turns, in small pieces, cost one decoding of each block. Any thread.
//
//   BlockUse use(cache);
//   if (cache->Acquire(index, &use, failure) == ZARVO_OK) copy out of use.Data()
//
// A block's record, states by operations:
//
//              Acquire                         release                         room is needed
//   filling    waits until it is filled        (its filler's use)              kept
//   filled,    one more use                    one use less                    kept
//   in use
//   filled,    one more use                    (not held)                      the least recently used is freed
//   idle
//
// A record keeps what can be read of a damaged block, with the failure. One whose filling found no memory, or could not
// read the file, is freed with its last use, and the next Acquire tries again.
#pragma once

#include "Library/BlockDecoder.h"
#include "Runtime/Threads/Mutex.h"

#include <algorithm>

class BlockCache : private NonCopyable {
    struct Record;

public:
    // What a caller holds of a record. Released when it is destroyed.
    class Use : private NonCopyable {
    public:
        explicit Use(BlockCache* cache) : m_Cache(cache) {}
        ~Use();

        const UInt8* Data() const;
        size_t Readable() const; // bytes from the block's start

    private:
        friend class BlockCache;

        BlockCache* m_Cache;
        Record* m_Record = nullptr;
    };

    // decoder outlives the cache. maxIdleBytes: what records and cursors may take while nobody uses them; the one that
    // was used last stays in any case.
    BlockCache(const BlockDecoder* decoder, UInt64 maxIdleBytes);
    ~BlockCache(); // nobody holds a use or a cursor

    // The whole block, decoded. Of a damaged one *use holds what can be read, and the answer is ZARVO_ERROR_DAMAGED or
    // _UNSUPPORTED.
    zarvo_code Acquire(UInt32 blockIndex, Use* use, Failure* failure) VARNEX_NO_THREAD_SAFETY_ANALYSIS;

    // Whether the block is here, or being decoded.
    bool Has(UInt32 blockIndex);

    // The idle cursor of the block that is nearest before offset, or a new one; null when memory is refused.
    StreamCursor* TakeCursor(UInt32 blockIndex, UInt64 offset);
    // cursor may be null.
    void GiveCursorBack(StreamCursor* cursor);

private:
    // Beside the pointer, what a look at all of them needs.
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
    UInt64 m_Uses VARNEX_GUARDED_BY(m_Lock) = 0;  // so far: the stamp of the next
};
