// A memory file's contents in one buffer, which may be memory of the caller's, used in place:
//
//   auto* contents = New<SingleBlockMemoryFileData>(label, label, data, size, false);  // data stays the caller's
//
// Contents that wrap the caller's memory do not grow by writing: bytes that don't fit are not stored. Any thread.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Threads/Mutex.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFileData.h"

class SingleBlockMemoryFileData : public MemoryFileData {
public:
    // The object itself must have been allocated under memLabel. If neither data nor size is 0, the contents are the
    // size bytes at data, used in place. With takeOwnership the destructor frees data, which must come from
    // malloc_internal; without it, data must outlive the object. Otherwise the contents start empty, with room for size
    // bytes.
    SingleBlockMemoryFileData(MemLabelId memLabel, void* data, size_t size, bool takeOwnership);

    // The address is the buffer itself, valid until the contents grow.
    bool Lock(void** contents) override;
    void Unlock(void* contents) override;

    UInt64 Read(VFS::FileSize position, UInt64 size, void* out) const override;

    // Bytes between the old end and a position past it are not cleared.
    UInt64 Write(VFS::FileSize position, UInt64 size, const void* in) override;

    // Added bytes are not cleared. If wrapped memory is too short, the contents move to memory of their own.
    void SetLength(VFS::FileSize newLength) override;
    VFS::FileSize Size() const override;

    // Made under kMemLabelFileSystem, in memory of its own.
    MemoryFileData* Clone() const override;

private:
    static dynamic_array<UInt8> MakeBuffer(MemLabelId memLabel, void* data, size_t size, bool takeOwnership);

    MemLabelId label;                                     // of the contents
    dynamic_array<UInt8> buffer VARNEX_GUARDED_BY(mutex); // its size is the file's length
    mutable Mutex mutex;
};
