#include "Runtime/Allocator/Allocator.h"

#include <cstring>
#include <gtest/gtest.h>

// The sanitizers' allocators end the program on an impossible request unless they are told to answer null, as the
// system's does.
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

struct Huge {
    Huge() { ADD_FAILURE() << "constructed on null"; }
    char bytes[size_t{1} << 60];
};

TEST(Allocator, ReallocationMovesAlignsAndKeepsWhatFitsAndARefusedOneTheOldBlock) {
    for (const size_t align : {1, 64, 4096}) {
        const auto reallocate = [&](void* pointer, size_t size) {
            return realloc_internal(pointer, size, align, kMemLabelGeneral, kAllocateOptionNone, "", 0);
        };
        void* block = memcpy(reallocate(nullptr, 5), "text", 5);
        EXPECT_EQ(nullptr, reallocate(block, sizeof(Huge)));
        for (const size_t size : {5000, 3}) {
            const size_t old = reinterpret_cast<size_t>(block),
                         moved = reinterpret_cast<size_t>(block = reallocate(block, size));
            EXPECT_TRUE(old != moved && moved % (align < 16 ? 16 : align) == 0) << align;
            EXPECT_EQ(0, memcmp(block, "text", size < 5 ? size : 5));
        }
        EXPECT_EQ(nullptr, reallocate(block, 0)); // the platform's answer, which frees
    }
    EXPECT_EQ(nullptr, New<Huge>(kMemLabelGeneral));
}
