#include "Tests/Support/RefusedMemory.h"

#include <cerrno>
#include <cstddef>

static thread_local int gRequestsLeft = 0; // 0: all are granted
static thread_local bool gIsLasting = false;
static thread_local bool gHasStruck = false;

RefusedMemory::RefusedMemory(int n, bool isLasting) {
    gRequestsLeft = n;
    gIsLasting = isLasting;
    gHasStruck = false;
}

RefusedMemory::~RefusedMemory() { gRequestsLeft = 0; }

bool RefusedMemory::HasStruck() { return gHasStruck; }

// The linker sends every call of posix_memalign here, and calls of the second name to the system.
extern "C" int __real_posix_memalign(void** pointer, size_t align, size_t size);
extern "C" int __wrap_posix_memalign(void** pointer, size_t align, size_t size) {
    const bool isDue = gRequestsLeft == 1;
    if (gRequestsLeft != 0 && !(isDue && gIsLasting)) --gRequestsLeft;
    if (!isDue) return __real_posix_memalign(pointer, align, size);
    gHasStruck = true;
    return ENOMEM;
}
