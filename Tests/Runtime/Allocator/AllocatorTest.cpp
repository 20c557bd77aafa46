#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cstring>
#include <gtest/gtest.h>

// The sanitizers' allocators end the program on an impossible request unless they are told to answer null, as the
// system's does.
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

static void* Reallocate(void* pointer, size_t size, size_t align = 1) {
    return realloc_internal(pointer, size, align, kMemLabelGeneral, kAllocateOptionNone, __FILE__, __LINE__);
}

TEST(Allocator, ReallocationAlwaysMovesAlignsAndKeepsWhatFits) {
    for (const size_t align : {1u, 8u, 64u, 4096u})
        for (const size_t newSize : {1u, 99u, 100u, 5000u}) {
            char* const old = static_cast<char*>(Reallocate(nullptr, 100, align));
            memset(old, '#', 100);
            const size_t oldAddress = reinterpret_cast<size_t>(old);
            char* const moved = static_cast<char*>(Reallocate(old, newSize, align));
            EXPECT_NE(oldAddress, reinterpret_cast<size_t>(moved)) << newSize;
            EXPECT_EQ(0u, (oldAddress | reinterpret_cast<size_t>(moved)) % std::max<size_t>(align, 16)) << align;
            EXPECT_EQ(std::string(std::min<size_t>(newSize, 100), '#'),
                      std::string(moved, std::min<size_t>(newSize, 100)));
            EXPECT_EQ(nullptr, Reallocate(moved, 0)); // the platform's answer, which frees
        }
}

TEST(Allocator, RefusedRequestsGiveNullAndLeaveTheOldBlock) {
    struct Huge {
        Huge() { ADD_FAILURE() << "constructed on null"; }
        char bytes[size_t{1} << 60];
    };
    EXPECT_EQ(nullptr, New<Huge>(kMemLabelGeneral));
    void* const block = Reallocate(nullptr, 4);
    memcpy(block, "abc", 4);
    EXPECT_EQ(nullptr, Reallocate(block, sizeof(Huge)));
    EXPECT_STREQ("abc", static_cast<char*>(block));
    Reallocate(block, 0);
}
