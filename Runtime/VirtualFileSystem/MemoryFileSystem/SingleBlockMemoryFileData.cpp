#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"

#include <algorithm>
#include <cstring>

dynamic_array<UInt8> SingleBlockMemoryFileData::MakeBuffer(MemLabelId memLabel, void* data, size_t size,
                                                           bool takeOwnership) {
    if (data != nullptr && size != 0) {
        auto* const bytes = static_cast<UInt8*>(data);
        return takeOwnership ? dynamic_array<UInt8>::adopt(bytes, size, size, memLabel)
                             : dynamic_array<UInt8>::wrap(bytes, size, size, memLabel);
    }
    dynamic_array<UInt8> empty(memLabel);
    (void)empty.reserve(size); // if memory is refused, the first write asks again
    return empty;
}

SingleBlockMemoryFileData::SingleBlockMemoryFileData(MemLabelId memLabel, void* data, size_t size, bool takeOwnership)
    : MemoryFileData(memLabel), label(memLabel), buffer(MakeBuffer(memLabel, data, size, takeOwnership)) {}

bool SingleBlockMemoryFileData::Lock(void** contents) VARNEX_NO_THREAD_SAFETY_ANALYSIS {
    mutex.Lock();
    *contents = buffer.empty() ? nullptr : buffer.data();
    return true;
}

void SingleBlockMemoryFileData::Unlock(void*) VARNEX_NO_THREAD_SAFETY_ANALYSIS { mutex.Unlock(); }

UInt64 SingleBlockMemoryFileData::Read(VFS::FileSize position, UInt64 size, void* out) const {
    Mutex::AutoLock lock(mutex);
    const UInt64 from = position.Cast<UInt64>();
    if (from >= buffer.size()) return 0;
    const UInt64 count = std::min<UInt64>(size, buffer.size() - from);
    if (count != 0) memcpy(out, buffer.data() + from, count);
    return count;
}

UInt64 SingleBlockMemoryFileData::Write(VFS::FileSize position, UInt64 size, const void* in) {
    Mutex::AutoLock lock(mutex);
    const UInt64 from = position.Cast<UInt64>();
    UInt64 count = size;
    // An array without a buffer does not own its data either, but wraps nothing.
    const bool isWrapped = buffer.data() != nullptr && !buffer.owns_data();
    if (isWrapped) count = from < buffer.capacity() ? std::min<UInt64>(size, buffer.capacity() - from) : 0;
    if (count == 0 || count > ~UInt64{0} - from) return 0;
    if (from + count > buffer.size() && !buffer.resize_uninitialized(from + count)) return 0;
    memcpy(buffer.data() + from, in, count);
    return count;
}

void SingleBlockMemoryFileData::SetLength(VFS::FileSize newLength) {
    Mutex::AutoLock lock(mutex);
    const UInt64 length = newLength.Cast<UInt64>();
    (void)buffer.resize_uninitialized(length, kResizeExact); // when refused, nothing changes
}

VFS::FileSize SingleBlockMemoryFileData::Size() const {
    Mutex::AutoLock lock(mutex);
    return buffer.size();
}

MemoryFileData* SingleBlockMemoryFileData::Clone() const {
    Mutex::AutoLock lock(mutex);
    auto* const copy =
        New<SingleBlockMemoryFileData>(kMemLabelFileSystem, kMemLabelFileSystem, nullptr, buffer.size(), true);
    if (copy == nullptr) return nullptr;
    if (copy->Write(0, buffer.size(), buffer.data()) == buffer.size()) return copy;
    copy->Release();
    return nullptr;
}
