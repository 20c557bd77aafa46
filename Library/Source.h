// Where an archive's bytes come from: a file, memory or a caller's callbacks. Each read names its position, so any
// number of threads may read at once. Position 0 is the archive's first byte.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <sys/types.h>

class Source : private NonCopyable {
public:
    virtual ~Source() = default;

    // Reads up to size bytes at position into buffer. *count is less than size only where the source ends. After a
    // failure *count means nothing. Any thread.
    zarvo_code ReadAt(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const;

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
    UInt64 m_Offset = 0;
    UInt64 m_Size = 0;
};

// Each opens a source, which the caller frees: Delete(source, kMemLabelFileSystem).
zarvo_code OpenPath(const char* path, UInt64 offset, Source** source, Failure* failure);
zarvo_code OpenDescriptor(int descriptor, UInt64 offset, Source** source, Failure* failure);
zarvo_code OpenMemory(const void* data, size_t size, UInt64 offset, Source** source, Failure* failure);
zarvo_code OpenCallbacks(const zarvo_source& callbacks, UInt64 offset, Source** source, Failure* failure);
