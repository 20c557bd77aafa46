// A global operator new and delete: blocks aligned to 16 bytes, null when memory is refused.
// Linked into the command, the tests and what makes archives for them, and not into the library, so that a program that
// embeds it keeps its own. Standard containers can't go on from null; the runtime itself uses the labelled form alone.
#include <cstdlib>
#include <new>

// clang's thread sanitizer links a pair of its own and refuses a second.
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define VARNEX_KEEP_SANITIZER_NEW
#endif
#endif

#ifndef VARNEX_KEEP_SANITIZER_NEW

// Compilers take plain new for never null, and the undefined behaviour sanitizer holds us to that.
__attribute__((no_sanitize("returns-nonnull-attribute"))) void* operator new(size_t size) {
    void* pointer = nullptr;
    if (posix_memalign(&pointer, 16, size) != 0) pointer = nullptr;
    return pointer;
}

void operator delete(void* pointer) noexcept { free(pointer); }
void operator delete(void* pointer, size_t) noexcept { free(pointer); }

#endif
