#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"

#include "Runtime/Utilities/FixedReports.h"

#include <algorithm>
#include <cstring>

static constexpr size_t kReservedSlots = 64;
static constexpr size_t kBlockAlignment = 16;

MultiBlocksMemoryFileData::MultiBlocksMemoryFileData(MemLabelId memLabel, size_t sizeOfBlock)
    : MultiBlocksMemoryFileData(memLabel, memLabel, sizeOfBlock) {}

MultiBlocksMemoryFileData::MultiBlocksMemoryFileData(MemLabelId objectLabel, MemLabelId contentsLabel,
                                                     size_t sizeOfBlock)
    : MemoryFileData(objectLabel), label(contentsLabel), blockSize(sizeOfBlock), blocks(contentsLabel) {
    (void)blocks.reserve(kReservedSlots); // if memory is refused, the first write asks again
}

MultiBlocksMemoryFileData::~MultiBlocksMemoryFileData() {
    for (UInt8* block : blocks)
        free_alloc_internal(block, label, __FILE__, __LINE__);
}

// Makes the table hold lastSlot. When memory is refused, returns false and changes nothing.
bool MultiBlocksMemoryFileData::ReserveSlots(UInt64 lastSlot) {
    if (lastSlot < blocks.size()) return true;
    return lastSlot != ~UInt64{0} && blocks.resize_initialized(lastSlot + 1);
}

UInt8* MultiBlocksMemoryFileData::GetOrMakeBlock(UInt64 slot) {
    UInt8*& block = blocks[slot];
    if (block != nullptr) return block;
    block = static_cast<UInt8*>(
        malloc_internal(blockSize, kBlockAlignment, label, kAllocateOptionNone, __FILE__, __LINE__));
    // A write may cover only part of a block, but reads deliver all of it: don't leak what the heap held before.
    if (block != nullptr) memset(block, 0, blockSize);
    return block;
}

UInt64 MultiBlocksMemoryFileData::Read(VFS::FileSize position, UInt64 size, void* out) const {
    Mutex::AutoLock lock(mutex);
    const UInt64 from = position.Cast<UInt64>();
    if (from >= length) return 0;
    const UInt64 wanted = std::min(size, length - from);
    auto* const bytes = static_cast<UInt8*>(out);
    UInt64 done = 0;
    UInt64 offset = from % blockSize;
    for (UInt64 slot = from / blockSize; done < wanted && slot < blocks.size(); ++slot) {
        const UInt64 count = std::min(wanted - done, blockSize - offset);
        if (blocks[slot] != nullptr) {
            memcpy(bytes + done, blocks[slot] + offset, count);
        } else {
            Report(FixedReports::kMemoryFileDirtyRead);
            memset(bytes + done, 0, count);
        }
        done += count;
        offset = 0;
    }
    return done;
}

UInt64 MultiBlocksMemoryFileData::Write(VFS::FileSize position, UInt64 size, const void* in) {
    Mutex::AutoLock lock(mutex);
    const UInt64 from = position.Cast<UInt64>();
    if (size > ~UInt64{0} - from || !ReserveSlots((from + size) / blockSize)) return 0;
    const auto* const bytes = static_cast<const UInt8*>(in);
    UInt64 done = 0;
    UInt64 offset = from % blockSize;
    for (UInt64 slot = from / blockSize; done < size; ++slot) {
        UInt8* const block = GetOrMakeBlock(slot);
        if (block == nullptr) break;
        const UInt64 count = std::min(size - done, blockSize - offset);
        memcpy(block + offset, bytes + done, count);
        done += count;
        offset = 0;
    }
    if (done != 0 || size == 0) length = std::max(length, from + done);
    return done;
}

void MultiBlocksMemoryFileData::SetLength(VFS::FileSize newLength) {
    Mutex::AutoLock lock(mutex);
    const UInt64 lastSlot = newLength.Cast<UInt64>() / blockSize;
    if (!ReserveSlots(lastSlot)) return;
    for (UInt64 slot = lastSlot + 1; slot < blocks.size(); ++slot)
        free_alloc_internal(blocks[slot], label, __FILE__, __LINE__);
    blocks.truncate(lastSlot + 1);
    length = newLength.Cast<UInt64>();
}

VFS::FileSize MultiBlocksMemoryFileData::Size() const {
    Mutex::AutoLock lock(mutex);
    return length;
}

bool MultiBlocksMemoryFileData::Lock(void** contents) VARNEX_NO_THREAD_SAFETY_ANALYSIS {
    mutex.Lock();
    if (length == 0) {
        *contents = nullptr;
    } else if (length <= blockSize) {
        *contents = GetFirstBlock();
    } else {
        *contents = malloc_internal(length, kBlockAlignment, label, kAllocateOptionNone, __FILE__, __LINE__);
        if (*contents != nullptr) (void)Read(0, length, *contents); // delivers all bytes
    }
    return true;
}

void MultiBlocksMemoryFileData::Unlock(void* contents) VARNEX_NO_THREAD_SAFETY_ANALYSIS {
    if (contents != GetFirstBlock()) free_alloc_internal(contents, label, __FILE__, __LINE__);
    mutex.Unlock();
}

MemoryFileData* MultiBlocksMemoryFileData::Clone() const {
    Mutex::AutoLock lock(mutex);
    auto* const copy =
        New<MultiBlocksMemoryFileData>(kMemLabelFileSystem, kMemLabelFileSystem, label, size_t{blockSize});
    if (copy == nullptr) return nullptr;
    bool isComplete;
    {
        Mutex::AutoLock copyLock(copy->mutex);
        isComplete = blocks.empty() || copy->ReserveSlots(blocks.size() - 1);
        for (size_t slot = 0; isComplete && slot < blocks.size(); ++slot) {
            if (blocks[slot] == nullptr) continue;
            UInt8* const block = copy->GetOrMakeBlock(slot);
            isComplete = block != nullptr;
            if (isComplete) memcpy(block, blocks[slot], blockSize);
        }
        copy->length = length;
    }
    if (isComplete) return copy;
    copy->Release();
    return nullptr;
}
