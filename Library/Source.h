// Where an archive's bytes come from: a file, memory or a caller's callbacks. Each read names its position, so any
// number of threads may read at once. Position 0 is the archive's first byte.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Allocator/Owned.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <algorithm>
#include <sys/types.h>

class Source : private NonCopyable {
public:
    virtual ~Source() = default;

    // Reads up to size bytes at position into buffer. *count is less than size only where the source ends. After a
    // failure *count is how many bytes were read before it. Any thread.
    zarvo_code ReadAt(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const;

    // As ReadAt. Where a part of the source can't be read (EIO), *count is how many bytes lie before the first page of
    // the source that can't be: however the reads are cut, the same bytes are lost.
    zarvo_code ReadBeforeDamage(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const;

    // The page at position can't be read. Where, up to end, the next one that can be begins.
    UInt64 FindEndOfDamage(UInt64 position, UInt64 end) const;

    // Bytes from the archive's start to the source's end, as they were when it was opened.
    UInt64 Size() const { return m_Size; }

    // Whether the bytes come from this file.
    virtual bool IsFile(dev_t, ino_t) const { return false; }

protected:
    // A single read at a position of the whole source, inside its size. *count: how many bytes; 0 if it ends there.
    virtual zarvo_code ReadSome(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const = 0;

    // Called after each ReadAt: whether the source is still what was opened.
    virtual zarvo_code CheckUnchanged(Failure*) const { return ZARVO_OK; }

    // The whole source has wholeSize bytes, and the archive begins at offset.
    zarvo_code SetRange(UInt64 wholeSize, UInt64 offset, Failure* failure);

private:
    static constexpr UInt64 kPageSize = 4'096; // the least that systems read

    // Where the page that a position lies in begins, and where it ends.
    UInt64 PageBegin(UInt64 position) const { return position - std::min(position, (m_Offset + position) % kPageSize); }
    UInt64 PageEnd(UInt64 position) const { return position + kPageSize - (m_Offset + position) % kPageSize; }

    UInt64 m_Offset = 0;
    UInt64 m_Size = 0;
};

// Each opens a source. After a failure there may be one, too, which is of no use.
zarvo_code OpenPath(const char* path, UInt64 offset, Owned<Source>* source, Failure* failure);
zarvo_code OpenDescriptor(int descriptor, UInt64 offset, Owned<Source>* source, Failure* failure);
zarvo_code OpenMemory(const void* data, size_t size, UInt64 offset, Owned<Source>* source, Failure* failure);
zarvo_code OpenCallbacks(const zarvo_source& callbacks, UInt64 offset, Owned<Source>* source, Failure* failure);
