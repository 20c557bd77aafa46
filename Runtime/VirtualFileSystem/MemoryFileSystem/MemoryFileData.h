// The contents of memory files, held apart from the files so that several can share them. Two forms:
// SingleBlockMemoryFileData (one buffer, which may be the caller's) and MultiBlocksMemoryFileData (a chain of blocks
// that grows without copying).
//
// Reference counted: made with one reference, which is the maker's. Any thread; every operation holds the object's
// lock. Lock keeps it until Unlock, so that one thread can work on the whole contents while the others wait:
//
//                          operation or Lock by the keeper    by another thread    Unlock by the keeper
//   nobody keeps it        (no keeper)                        goes on              (not allowed)
//   kept n times over      goes on; Lock: n + 1               waits                n - 1; at 0 the next one goes on
#pragma once

#include "Runtime/Core/SharedObject.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

// The order of the virtual operations is fixed.
class MemoryFileData : public ThreadSharedObject<MemoryFileData, SharedObjectFactory<MemoryFileData>> {
public:
    // The object itself was allocated under objectLabel.
    explicit MemoryFileData(MemLabelId objectLabel) : ThreadSharedObject(objectLabel) {}
    virtual ~MemoryFileData() = default;

    // *contents becomes the address of the whole contents, null when there are none. Always true. To be paired with
    // one Unlock of that address on the same thread; until then the other threads' operations wait, while this
    // thread's own go on.
    virtual bool Lock(void** contents) = 0;
    virtual void Unlock(void* contents) = 0;

    // Copies the bytes from position on, as far as there are any, and returns their count. What is read into, or
    // written from, is no part of the contents that Lock hands out.
    virtual UInt64 Read(VFS::FileSize position, UInt64 size, void* out) const = 0;

    // Stores bytes at position, which may lie past the end; returns the count stored, which is less than size when
    // room or memory is refused.
    virtual UInt64 Write(VFS::FileSize position, UInt64 size, const void* in) = 0;

    // When memory is refused the length stays as it is.
    virtual void SetLength(VFS::FileSize length) = 0;
    virtual VFS::FileSize Size() const = 0;

    // An independent copy with one reference, the caller's; null when memory is refused.
    virtual MemoryFileData* Clone() const = 0;
};
