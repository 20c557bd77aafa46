// The contents of memory files, held apart from the files so that several can share them. Two forms:
// SingleBlockMemoryFileData (one buffer, which may be the caller's) and MultiBlocksMemoryFileData (a chain of blocks
// that grows without copying).
//
// Reference counted: a new object has one reference, its maker's. Any thread; every operation holds the object's lock.
// Lock keeps it until Unlock, so that one thread can work on the whole contents while the others wait:
//
//                       operation or Lock by the holder    by another thread    Unlock by the holder
//   not locked          (no holder)                        proceeds             (not allowed)
//   locked n times      proceeds; Lock: n + 1              waits                n - 1; at 0 a waiting thread proceeds
#pragma once

#include "Runtime/Core/SharedObject.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

// The order of the virtual operations is fixed.
class MemoryFileData : public ThreadSharedObject<MemoryFileData, SharedObjectFactory<MemoryFileData>> {
public:
    // The object itself was allocated under objectLabel.
    explicit MemoryFileData(MemLabelId objectLabel) : ThreadSharedObject(objectLabel) {}
    virtual ~MemoryFileData() = default;

    // Stores the address of the whole contents in *contents, null when they are empty. Always true. Each Lock is paired
    // with one Unlock of that address on the same thread.
    virtual bool Lock(void** contents) = 0;
    virtual void Unlock(void* contents) = 0;

    // Copies up to size bytes from position on to out, and returns how many there were. Neither out, nor in of Write,
    // may overlap the contents that Lock returns.
    virtual UInt64 Read(VFS::FileSize position, UInt64 size, void* out) const = 0;

    // Stores bytes at position, which may lie past the end. Returns how many: fewer than size when there is no room, or
    // memory is refused.
    virtual UInt64 Write(VFS::FileSize position, UInt64 size, const void* in) = 0;

    // When memory is refused, the length does not change.
    virtual void SetLength(VFS::FileSize length) = 0;
    virtual VFS::FileSize Size() const = 0;

    // An independent copy with one reference, the caller's; null when memory is refused.
    virtual MemoryFileData* Clone() const = 0;
};
