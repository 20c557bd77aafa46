// Allocation with a memory label. Every block is aligned to 16 bytes at least, all labels share one heap, and label,
// options and source position change nothing about where a block comes from. A refused request gives null: nothing
// here throws, and only RequireMemory ends the program. Any thread.
//
//   Thing* thing = New<Thing>(label, constructorArguments...);   // null when memory is refused
//   Delete(thing, label);
#pragma once

#include "Footing/Process.h"
#include "Runtime/Allocator/MemLabel.h"
#include "Runtime/Core/SourceLocation.h"
#include "Runtime/Core/Types.h"

#include <utility>

enum AllocateOptions : UInt32 { kAllocateOptionNone = 0 };

void* malloc_internal(size_t size, size_t align, MemLabelId label, AllocateOptions options, const char* file, int line);

// Always moves: the result is a fresh block that holds what fits of the old one, which is freed. A null pointer gives a
// plain allocation. When the new block is refused the answer is null and the old block stays as it is. A new size of 0
// gives what the platform's realloc(pointer, 0) gives.
void* realloc_internal(void* pointer, size_t size, size_t align, MemLabelId label, AllocateOptions options,
                       const char* file, int line);

// Null is allowed.
void free_alloc_internal(void* pointer, MemLabelId label, const char* file, int line);

// Whether a block may change its label in place: always, as all labels share one heap.
bool try_to_transfer_between_label(void* pointer, MemLabelId from, MemLabelId to, size_t size, size_t align,
                                   AllocateOptions options, const char* file, int line);

// noexcept, so that no constructor runs on a refused block.
void* operator new(size_t size, MemLabelId label, size_t align, const char* file, int line) noexcept;
void operator delete(void* pointer, MemLabelId label, size_t align, const char* file, int line) noexcept;

// A label and the place that names it.
struct MemLabelHere {
    MemLabelHere(MemLabelId id, SourceLocation location = SourceLocation::current()) : label(id), where(location) {}
    MemLabelHere(MemLabelIdentifier id, SourceLocation location = SourceLocation::current())
        : label(id), where(location) {}

    MemLabelId label;
    SourceLocation where;
};

template <typename T, typename... Arguments>
[[nodiscard]] T* New(MemLabelHere here, Arguments&&... arguments) {
    return new (here.label, alignof(T), here.where.file, here.where.line) T(std::forward<Arguments>(arguments)...);
}

// Destroys what New made (null is allowed) and frees it under its label. T may be a base with a virtual destructor
// whose object starts where the whole object starts.
template <typename T>
void Delete(T* object, MemLabelHere here) {
    if (object == nullptr) return;
    object->~T();
    free_alloc_internal(object, here.label, here.where.file, here.where.line);
}

// Ends the program unless memory was granted. Sizes that come from a file or a caller are asked for with operations
// that answer; whoever needs a few bytes to go on asks here, so that nobody writes a way out for a case that never
// comes.
inline void RequireMemory(bool isGranted) {
    if (!isGranted) [[unlikely]]
        C99Api::Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode_OutOfMemory);
}

// The same for a pointer, which it returns.
template <typename T>
T* RequireMemory(T* pointer) {
    RequireMemory(pointer != nullptr);
    return pointer;
}

// For standard containers: allocates under the label and alignment of its template arguments. Memory that is refused
// ends the program, as a standard container can't go on without it.
template <typename T, MemLabelIdentifier label, int align>
struct stl_allocator {
    using value_type = T;
    template <typename U>
    struct rebind {
        using other = stl_allocator<U, label, align>;
    };

    stl_allocator() = default;
    template <typename U>
    stl_allocator(const stl_allocator<U, label, align>&) {}

    T* allocate(size_t count) {
        return static_cast<T*>(
            RequireMemory(malloc_internal(count * sizeof(T), align, label, kAllocateOptionNone, __FILE__, __LINE__)));
    }
    void deallocate(T* pointer, size_t) { free_alloc_internal(pointer, label, __FILE__, __LINE__); }

    template <typename U>
    friend bool operator==(const stl_allocator&, const stl_allocator<U, label, align>&) {
        return true;
    }
};
