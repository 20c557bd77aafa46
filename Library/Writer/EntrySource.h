// Where the bytes of entries come from while an archive is made.
#pragma once

#include "Library/Failure.h"
#include "Library/Writer/EntryList.h"

class EntrySource {
public:
    virtual ~EntrySource() = default;

    // Called once per archive, before it is read. False when memory is refused.
    [[nodiscard]] virtual bool PrepareToRead(UInt32 threads) = 0;

    // Reads size bytes at offset of an entry's bytes, which has them; size may be 0. That the entry has changed its
    // size meanwhile is a failure. Several threads call it at once, each with its own number.
    virtual zarvo_code Read(UInt32 thread, const EntryList& list, const EntryList::Entry& entry, UInt64 offset,
                            UInt8* bytes, size_t size, Failure* failure) = 0;

    // For dry runs, on one thread: whether Read can get at an entry, as far as can be known without reading.
    virtual zarvo_code CheckCanRead(const EntryList&, const EntryList::Entry&, Failure*) { return ZARVO_OK; }
};
