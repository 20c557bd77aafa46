// A memory file's contents as a chain of blocks of equal size. Growing adds blocks and copies nothing, blocks never
// move, and a block is allocated when something is first written to it. Byte b lies in block b / blockSize at offset
// b % blockSize. Any thread.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Threads/Mutex.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFileData.h"

class MultiBlocksMemoryFileData : public MemoryFileData {
public:
    static constexpr size_t kDefaultBlockSize = 8192;

    // Starts empty. The object itself must have been allocated under memLabel; sizeOfBlock is not 0.
    MultiBlocksMemoryFileData(MemLabelId memLabel, size_t sizeOfBlock);
    // The same, with a label of their own for the contents.
    MultiBlocksMemoryFileData(MemLabelId objectLabel, MemLabelId contentsLabel, size_t sizeOfBlock);
    ~MultiBlocksMemoryFileData() override;

    // Contents that fit into one block are not copied: the address is the first block, null if nothing was written to
    // it. Longer contents are copied into a buffer, null when memory is refused; changes made there are lost.
    bool Lock(void** contents) override;
    void Unlock(void* contents) override;

    // A block that nothing was written to reads as zeros and is reported as a failed check.
    UInt64 Read(VFS::FileSize position, UInt64 size, void* out) const override;

    // A write of 0 bytes past the end extends the length to position.
    UInt64 Write(VFS::FileSize position, UInt64 size, const void* in) override;

    // Bytes of the last block past the new length are not cleared.
    void SetLength(VFS::FileSize newLength) override;
    VFS::FileSize Size() const override;

    // The copy is made under kMemLabelFileSystem, its blocks under the label of the original's blocks.
    MemoryFileData* Clone() const override;

private:
    bool ReserveSlots(UInt64 lastSlot) VARNEX_REQUIRES(mutex);
    UInt8* GetFirstBlock() const VARNEX_REQUIRES(mutex) { return blocks.empty() ? nullptr : blocks[0]; }
    UInt8* GetOrMakeBlock(UInt64 slot) VARNEX_REQUIRES(mutex);

    MemLabelId label; // of the blocks and of their table
    const UInt64 blockSize;
    dynamic_array<UInt8*> blocks VARNEX_GUARDED_BY(mutex); // in file order; null until written to
    UInt64 length VARNEX_GUARDED_BY(mutex) = 0;            // of the file
    mutable Mutex mutex;
};
