#include "Runtime/Allocator/Allocator.h"

#include <array>
#include <cstring>
#include <gtest/gtest.h>

// The sanitizers' allocators end the program on an impossible request unless they are told to answer null, as the
// system's does.
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

using Huge = std::array<char, size_t{1} << 60>; // which New clears, wherever it is

TEST(Allocator, ReallocationMovesAlignsAndKeepsWhatFitsAndARefusedOneTheOldBlock) {
    for (const size_t align : {1u, 64u, 4096u}) {
        const auto reallocate = [&](void* pointer, size_t size) {
            return realloc_internal(pointer, size, align, kMemLabelGeneral, kAllocateOptionNone, "", 0);
        };
        void* block = memcpy(reallocate(nullptr, 5), "text", 5);
        EXPECT_EQ(nullptr, reallocate(block, sizeof(Huge)));
        for (const size_t size : {5000u, 3u}) {
            const size_t old = reinterpret_cast<size_t>(block);
            block = reallocate(block, size);
            const size_t now = reinterpret_cast<size_t>(block);
            EXPECT_TRUE(now != old && now % (align < 16 ? 16 : align) == 0 && memcmp(block, "tex", 3) == 0) << align;
        }
        EXPECT_EQ(nullptr, reallocate(block, 0)); // the platform's answer, which frees
    }
    EXPECT_EQ(nullptr, New<Huge>(kMemLabelGeneral));
}
