// Allocation with a memory label. Every block is aligned to at least 16 bytes. All labels share one heap; label,
// options and source position do not change where a block comes from. A refused request returns null; nothing here
// throws, and only RequireMemory ends the program. Any thread.
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

// Allocates a new block, copies as much of the old one as fits, and frees the old one. A null pointer makes it a plain
// allocation. Null when memory is refused; the old block is unchanged then. With a size of 0 the answer is that of the
// platform's realloc(pointer, 0).
void* realloc_internal(void* pointer, size_t size, size_t align, MemLabelId label, AllocateOptions options,
                       const char* file, int line);

// How many requests of the calling thread have been refused so far: for callers of code that answers only that it
// failed.
UInt64 CountRefusedRequests();

// Null is allowed.
void free_alloc_internal(void* pointer, MemLabelId label, const char* file, int line);

// Whether a block may change its label in place: always, as all labels share one heap.
bool try_to_transfer_between_label(void* pointer, MemLabelId from, MemLabelId to, size_t size, size_t align,
                                   AllocateOptions options, const char* file, int line);

// noexcept, so that a new expression runs no constructor when memory is refused.
void* operator new(size_t size, MemLabelId label, size_t align, const char* file, int line) noexcept;
void operator delete(void* pointer, MemLabelId label, size_t align, const char* file, int line) noexcept;

// A label and the source position of the call that passes it.
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

// Destroys an object that New returned and frees it under its label; null is allowed. T may be a base class with a
// virtual destructor, if it is the first base.
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

// For standard containers: allocates with the label and alignment of its template arguments. The program ends when
// memory is refused, because a standard container can't handle null.
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
