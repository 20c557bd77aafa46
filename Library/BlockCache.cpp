#include "Library/BlockCache.h"

#include "Runtime/Allocator/Allocator.h"

struct BlockCache::Record {
    Record(UInt32 index, UInt64 size) : blockIndex(index), bytes(sizeof(*this) + size), data(kMemLabelFileSystem) {}

    const UInt32 blockIndex;
    const UInt64 bytes;

    // Under the cache's lock.
    SInt32 uses = 1;
    UInt64 lastUse = 0;
    bool isListed = true;

    // Held by the filler from the start; what follows is its own until then, and only read afterwards.
    Mutex filling;
    std::atomic<bool> isFilled{false};
    dynamic_array<UInt8> data;
    size_t readable = 0;
    Failure failure;
};

BlockCache::Use::~Use() { m_Cache->Release(m_Record); }
const UInt8* BlockCache::Use::Data() const { return m_Record->data.data(); }
size_t BlockCache::Use::Readable() const { return m_Record != nullptr ? m_Record->readable : 0; }

BlockCache::BlockCache(const BlockDecoder* decoder, UInt64 maxIdleBytes)
    : m_Decoder(decoder), m_MaxIdleBytes(maxIdleBytes), m_Slots(kMemLabelFileSystem), m_Cursors(kMemLabelFileSystem) {}

BlockCache::~BlockCache() {
    Mutex::AutoLock lock(m_Lock);
    FreeIdle(0, 0, 0, nullptr);
}

BlockCache::Record* BlockCache::Find(UInt32 blockIndex) {
    for (const Slot& slot : m_Slots)
        if (slot.blockIndex == blockIndex) return slot.record;
    return nullptr;
}

bool BlockCache::Has(UInt32 blockIndex) {
    Mutex::AutoLock lock(m_Lock);
    return Find(blockIndex) != nullptr;
}

zarvo_code BlockCache::Acquire(UInt32 blockIndex, Use* use, Failure* failure) {
    Record* record;
    bool isFiller = false;
    {
        Mutex::AutoLock lock(m_Lock);
        record = Find(blockIndex);
        if (record == nullptr) {
            const UInt64 size = m_Decoder->GetBlock(blockIndex).size;
            FreeIdle(BytesLeftFor(size), kMaxRecords - 1, kMaxIdleCursors, nullptr);
            record = New<Record>(kMemLabelFileSystem, blockIndex, size);
            if (record == nullptr || !m_Slots.try_push_back({blockIndex, record})) {
                Delete(record, kMemLabelFileSystem);
                return failure->SetMemory();
            }
            m_Bytes += record->bytes;
            isFiller = true;
            record->filling.Lock(); // nobody else knows of it yet
        } else {
            ++record->uses;
        }
        record->lastUse = m_Uses++;
    }
    use->m_Record = record;
    if (isFiller) {
        Fill(record);
        record->isFilled.store(true, std::memory_order_release); // the data comes before it
        record->filling.Unlock();
    } else if (!record->isFilled.load(std::memory_order_acquire)) {
        Mutex::AutoLock wait(record->filling);
    }
    if (record->failure.code != ZARVO_OK) *failure = record->failure;
    return record->failure.code;
}

void BlockCache::Fill(Record* record) {
    zarvo_code code = ZARVO_ERROR_MEMORY;
    if (record->data.resize_uninitialized(m_Decoder->GetBlock(record->blockIndex).size, kResizeExact))
        code = m_Decoder->DecodeWhole(record->blockIndex, record->data.data(), &record->readable, &record->failure);
    else
        (void)record->failure.SetMemory();
    if (code == ZARVO_OK || code == ZARVO_ERROR_DAMAGED || code == ZARVO_ERROR_UNSUPPORTED) return;
    // Another time may be luckier.
    if (code != ZARVO_ERROR_SYSTEM) record->readable = 0;
    Mutex::AutoLock lock(m_Lock);
    Unlist(record);
}

void BlockCache::Unlist(Record* record) {
    for (Slot& slot : m_Slots) {
        if (slot.record != record) continue;
        slot = m_Slots[m_Slots.size() - 1];
        m_Slots.truncate(m_Slots.size() - 1);
        break;
    }
    record->isListed = false;
    m_Bytes -= record->bytes;
}

void BlockCache::Release(Record* record) {
    if (record == nullptr) return;
    bool isLast = false;
    {
        Mutex::AutoLock lock(m_Lock);
        isLast = --record->uses == 0 && !record->isListed;
        if (!isLast) FreeIdle(m_MaxIdleBytes, kMaxRecords, kMaxIdleCursors, record);
    }
    if (isLast) Delete(record, kMemLabelFileSystem);
}

// Frees idle records and cursors, the least recently used first, until no more than that is left or none is idle.
void BlockCache::FreeIdle(UInt64 maxBytes, size_t maxRecords, size_t maxCursors, const Record* kept) {
    while (m_Bytes > maxBytes || m_Slots.size() > maxRecords || m_Cursors.size() > maxCursors) {
        Record* record = nullptr;
        for (const Slot& slot : m_Slots)
            if (slot.record->uses == 0 && slot.record != kept &&
                (record == nullptr || slot.record->lastUse < record->lastUse))
                record = slot.record;
        IdleCursor* idle = nullptr;
        for (IdleCursor& candidate : m_Cursors)
            if (idle == nullptr || candidate.lastUse < idle->lastUse) idle = &candidate;

        if (idle != nullptr && (record == nullptr || idle->lastUse < record->lastUse)) {
            Delete(RemoveCursor(idle), kMemLabelFileSystem);
        } else if (record != nullptr) {
            Unlist(record);
            Delete(record, kMemLabelFileSystem);
        } else {
            return;
        }
    }
}

StreamCursor* BlockCache::RemoveCursor(IdleCursor* idle) {
    StreamCursor* const cursor = idle->cursor;
    m_Bytes -= idle->bytes;
    *idle = m_Cursors[m_Cursors.size() - 1];
    m_Cursors.truncate(m_Cursors.size() - 1);
    return cursor;
}

StreamCursor* BlockCache::TakeCursor(UInt32 blockIndex, UInt64 offset) {
    Mutex::AutoLock lock(m_Lock);
    IdleCursor* best = nullptr;
    for (IdleCursor& idle : m_Cursors)
        if (idle.cursor->BlockIndex() == blockIndex && idle.cursor->Position() <= offset &&
            (best == nullptr || idle.cursor->Position() > best->cursor->Position()))
            best = &idle;
    if (best != nullptr) return RemoveCursor(best);
    return New<StreamCursor>(kMemLabelFileSystem, m_Decoder, blockIndex);
}

void BlockCache::GiveCursorBack(StreamCursor* cursor) {
    if (cursor == nullptr) return;
    Mutex::AutoLock lock(m_Lock);
    const UInt64 bytes = cursor->MemoryUsed();
    FreeIdle(BytesLeftFor(bytes), kMaxRecords, kMaxIdleCursors - 1, nullptr);
    if (m_Cursors.try_push_back({cursor, m_Uses++, bytes}))
        m_Bytes += bytes;
    else
        Delete(cursor, kMemLabelFileSystem);
}
