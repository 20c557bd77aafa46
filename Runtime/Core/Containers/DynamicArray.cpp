#include "Runtime/Core/Containers/DynamicArray.h"

#include <algorithm>
#include <cstdio>

namespace dynamic_array_detail {

// A product that overflows becomes a size that every allocation refuses; wrapped around, it would be a small one.
static size_t GetByteCount(size_t capacity, size_t elementSize) {
    size_t bytes = 0;
    return __builtin_mul_overflow(capacity, elementSize, &bytes) ? ~size_t{0} : bytes;
}

void* dynamic_array_data::resize_buffer(size_t capacity, ResizePolicy policy, size_t elementSize, size_t alignment) {
    if (policy == kResizeDouble) capacity = std::max(capacity, 2 * this->capacity());
    return reserve(capacity, elementSize, alignment);
}

void* dynamic_array_data::reserve(size_t capacity, size_t elementSize, size_t alignment) {
    const size_t byteCount = GetByteCount(capacity, elementSize);
    void* buffer = nullptr;
    if (!owns_data()) {
        if (capacity != 0)
            buffer = malloc_internal(byteCount, alignment, label, kAllocateOptionNone, __FILE__, __LINE__);
        if (const size_t kept = std::min(size, capacity); buffer != nullptr && kept != 0)
            memcpy(buffer, data, kept * elementSize);
    } else {
        if (static_cast<SInt64>(capacity) < 0) {
            char message[64];
            snprintf(message, sizeof(message), "Dynamic array capacity overflow: 0x%llx", UInt64{capacity});
            ReportFailedCheck(message);
        }
        buffer = realloc_internal(data, byteCount, alignment, label, kAllocateOptionNone, __FILE__, __LINE__);
    }
    // Memory was refused: the old buffer stays in use.
    if (buffer == nullptr && byteCount != 0) return data;
    data = buffer;
    capacityWord = capacity * 2;
    return buffer;
}

void* dynamic_array_data::grow(size_t elementSize, size_t alignment) {
    return reserve(std::max<size_t>(2 * capacity(), 1), elementSize, alignment);
}

void dynamic_array_data::free_buffer() { free_alloc_internal(data, label, __FILE__, __LINE__); }

void dynamic_array_data::reset() {
    data = nullptr;
    size = 0;
    capacityWord = kNotOwned;
}

} // namespace dynamic_array_detail
