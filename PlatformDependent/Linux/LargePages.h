// Large pages, which make it cheap to jump about in a block of memory. Any thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <sys/mman.h>
#include <unistd.h>

// Asks the system for large pages under a block that is not used yet; null is allowed. Blocks smaller than a large page
// stay as they are, and so does any block where the system has none to give. The heap keeps the advice for its pages:
// what it puts there later may take more memory, but no more than a large page per block.
inline void PreferLargePages(void* block, size_t size) {
    constexpr size_t kLargePage = 2'097'152;
    if (block == nullptr || size < kLargePage) return;
    const auto page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    const size_t before = reinterpret_cast<uintptr_t>(block) % page;
    (void)madvise(static_cast<char*>(block) - before, before + size, MADV_HUGEPAGE);
}
