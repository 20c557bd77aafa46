#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <gtest/gtest.h>
#include <numeric>
#include <vector>

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

// The address sanitizer ends the program when a block is freed by a form that is not of the set that allocated it.
TEST(GlobalNew, ServesStableSort) {
    std::vector<int> numbers(1'000);
    std::iota(numbers.rbegin(), numbers.rend(), 0);
    std::stable_sort(numbers.begin(), numbers.end()); // allocates with nothrow, and frees without
    EXPECT_TRUE(std::is_sorted(numbers.begin(), numbers.end()));
}

template <typename... Form>
static void ExpectServed(size_t alignment, Form... form) {
    void* const object = ::operator new(100, form...);
    EXPECT_EQ(0, reinterpret_cast<size_t>(object) % alignment);
    ::operator delete(object, form...);

    void* const array = ::operator new[](100, form...);
    EXPECT_EQ(0, reinterpret_cast<size_t>(array) % alignment);
    ::operator delete[](array, form...);
}

// Compilers call these in delete expressions; clang 14 declares them only when it is told to.
void operator delete(void* pointer, size_t size) noexcept;
void operator delete[](void* pointer, size_t size) noexcept;
void operator delete(void* pointer, size_t size, std::align_val_t alignment) noexcept;
void operator delete[](void* pointer, size_t size, std::align_val_t alignment) noexcept;

TEST(GlobalNew, AlignsAndFreesInEveryForm) {
    constexpr std::align_val_t kAlignment{4'096};
    ExpectServed(16);
    ExpectServed(16, std::nothrow);
    ExpectServed(4'096, kAlignment);
    ExpectServed(4'096, kAlignment, std::nothrow);
    ::operator delete (::operator new(100), size_t{100});
    ::operator delete[](::operator new[](100), size_t{100});
    ::operator delete (::operator new(100, kAlignment), size_t{100}, kAlignment);
    ::operator delete[](::operator new[](100, kAlignment), size_t{100}, kAlignment);
}

// The thread sanitizer has a set of its own, which ends the program.
#if !VARNEX_SANITIZED
template <typename... Form>
static void ExpectNullWhenRefused(Form... form) {
    // Volatile, as the compiler takes some of the forms for never null.
    void* volatile object = ::operator new(sizeof(Huge), form...);
    EXPECT_EQ(nullptr, object);
    void* volatile array = ::operator new[](sizeof(Huge), form...);
    EXPECT_EQ(nullptr, array);
}

TEST(GlobalNew, AnswersNullInEveryFormWhenRefused) {
    constexpr std::align_val_t kAlignment{4'096};
    ExpectNullWhenRefused();
    ExpectNullWhenRefused(std::nothrow);
    ExpectNullWhenRefused(kAlignment);
    ExpectNullWhenRefused(kAlignment, std::nothrow);
}
#endif
