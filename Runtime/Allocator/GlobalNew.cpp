// The global operators new and delete: blocks aligned to 16 bytes or what was asked, null when memory is refused.
// Every form is replaced. A form that is left out would throw, and under the address sanitizer it would be the
// sanitizer's, whose blocks only the sanitizer's delete may free.
// Linked into the command, the tests and the archive writer, but not into the library: a program that embeds it keeps
// its own operators. Standard containers can't handle null; the runtime itself uses only the labelled form.
#include <algorithm>
#include <cstdlib>
#include <new>

// clang's thread sanitizer has its own operators and does not link with a second set.
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define VARNEX_KEEP_SANITIZER_NEW
#endif
#endif

#ifndef VARNEX_KEEP_SANITIZER_NEW

namespace {

void* Allocate(size_t size, std::align_val_t alignment = std::align_val_t{16}) {
    void* pointer = nullptr;
    if (posix_memalign(&pointer, std::max<size_t>(static_cast<size_t>(alignment), 16), size) != 0) return nullptr;
    return pointer;
}

} // namespace

// Compilers assume that a form without nothrow never returns null, and the undefined behaviour sanitizer checks it.
#define VARNEX_MAY_BE_NULL __attribute__((no_sanitize("returns-nonnull-attribute")))

VARNEX_MAY_BE_NULL void* operator new(size_t size) { return Allocate(size); }
VARNEX_MAY_BE_NULL void* operator new[](size_t size) { return Allocate(size); }
VARNEX_MAY_BE_NULL void* operator new(size_t size, std::align_val_t alignment) { return Allocate(size, alignment); }
VARNEX_MAY_BE_NULL void* operator new[](size_t size, std::align_val_t alignment) { return Allocate(size, alignment); }

void* operator new(size_t size, const std::nothrow_t&) noexcept { return Allocate(size); }
void* operator new[](size_t size, const std::nothrow_t&) noexcept { return Allocate(size); }
void* operator new(size_t size, std::align_val_t alignment, const std::nothrow_t&) noexcept {
    return Allocate(size, alignment);
}
void* operator new[](size_t size, std::align_val_t alignment, const std::nothrow_t&) noexcept {
    return Allocate(size, alignment);
}

void operator delete(void* pointer) noexcept { free(pointer); }
void operator delete[](void* pointer) noexcept { free(pointer); }
void operator delete(void* pointer, size_t) noexcept { free(pointer); }
void operator delete[](void* pointer, size_t) noexcept { free(pointer); }
void operator delete(void* pointer, const std::nothrow_t&) noexcept { free(pointer); }
void operator delete[](void* pointer, const std::nothrow_t&) noexcept { free(pointer); }
void operator delete(void* pointer, std::align_val_t) noexcept { free(pointer); }
void operator delete[](void* pointer, std::align_val_t) noexcept { free(pointer); }
void operator delete(void* pointer, size_t, std::align_val_t) noexcept { free(pointer); }
void operator delete[](void* pointer, size_t, std::align_val_t) noexcept { free(pointer); }
void operator delete(void* pointer, std::align_val_t, const std::nothrow_t&) noexcept { free(pointer); }
void operator delete[](void* pointer, std::align_val_t, const std::nothrow_t&) noexcept { free(pointer); }

#endif
