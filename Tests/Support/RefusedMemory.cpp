#include "Tests/Support/RefusedMemory.h"

#include <cerrno>

static thread_local int gRequestsLeft = 0; // until one is refused; 0 grants all
static thread_local bool gIsLasting = false;
static thread_local size_t gMinimumSize = 0;
static thread_local bool gHasStruck = false;

RefusedMemory::RefusedMemory(int n, bool isLasting, size_t minimumSize) {
    gRequestsLeft = n;
    gIsLasting = isLasting;
    gMinimumSize = minimumSize;
    gHasStruck = false;
}

RefusedMemory::~RefusedMemory() { gRequestsLeft = 0; }

bool RefusedMemory::HasStruck() { return gHasStruck; }

// The linker turns every call of posix_memalign into a call of __wrap_posix_memalign; __real_posix_memalign is the
// system's.
extern "C" int __real_posix_memalign(void** pointer, size_t align, size_t size);
extern "C" int __wrap_posix_memalign(void** pointer, size_t align, size_t size) {
    if (size < gMinimumSize) return __real_posix_memalign(pointer, align, size);
    const bool isDue = gRequestsLeft == 1;
    if (gRequestsLeft != 0 && !(isDue && gIsLasting)) --gRequestsLeft;
    if (!isDue) return __real_posix_memalign(pointer, align, size);
    gHasStruck = true;
    return ENOMEM;
}
