#include "Runtime/Allocator/Allocator.h"

#include "PlatformDependent/Linux/MallocSize.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

constexpr size_t kMinAlignment = 16;

static constinit thread_local UInt64 t_RefusedRequests = 0;

UInt64 CountRefusedRequests() { return t_RefusedRequests; }

void* malloc_internal(size_t size, size_t align, MemLabelId, AllocateOptions, const char*, int) {
    void* pointer = nullptr;
    if (posix_memalign(&pointer, std::max(align, kMinAlignment), size) == 0) return pointer;
    ++t_RefusedRequests;
    return nullptr;
}

void* realloc_internal(void* pointer, size_t size, size_t align, MemLabelId label, AllocateOptions options,
                       const char* file, int line) {
    if (size == 0) return realloc(pointer, 0);
    void* moved = malloc_internal(size, align, label, options, file, line);
    if (moved == nullptr || pointer == nullptr) return moved;
    const size_t usableSize = malloc_size(pointer);
    if (usableSize != 0) {
        memcpy(moved, pointer, std::min(usableSize, size));
        free(pointer);
    }
    return moved;
}

void free_alloc_internal(void* pointer, MemLabelId, const char*, int) { free(pointer); }

bool try_to_transfer_between_label(void*, MemLabelId, MemLabelId, size_t, size_t, AllocateOptions, const char*, int) {
    return true;
}

void* operator new(size_t size, MemLabelId label, size_t align, const char* file, int line) noexcept {
    return malloc_internal(size, align, label, kAllocateOptionNone, file, line);
}

void operator delete(void* pointer, MemLabelId label, size_t, const char* file, int line) noexcept {
    free_alloc_internal(pointer, label, file, line);
}
