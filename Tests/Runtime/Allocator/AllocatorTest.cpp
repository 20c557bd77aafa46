#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <cstring>
#include <gtest/gtest.h>
#include <numeric>
#include <string>
#include <vector>

// The sanitizers' allocators end the program on an impossible request unless they are told to answer null, as the
// system's does.
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

using Huge = std::array<char, size_t{1} << 60>; // refused; New would clear it

static void* Reallocate(void* pointer, size_t size, size_t align = 1) {
    return realloc_internal(pointer, size, align, kMemLabelGeneral, kAllocateOptionNone, "", 0);
}

static void Free(void* pointer) { free_alloc_internal(pointer, kMemLabelGeneral, "", 0); }

TEST(Allocator, BlocksAreAlignedToSixteenAtLeast) {
    struct Case {
        size_t asked, given;
    };
    constexpr Case kCases[] = {{.asked = 1, .given = 16}, {.asked = 64, .given = 64}, {.asked = 4'096, .given = 4'096}};
    for (const Case& row : kCases) {
        void* block = nullptr;
        for (const size_t size : {5u, 5'000u, 3u}) {
            block = Reallocate(block, size, row.asked);
            EXPECT_EQ(0, reinterpret_cast<size_t>(block) % row.given) << row.asked;
        }
        Free(block);
    }
}

TEST(Allocator, ReallocationMovesWhatFits) {
    void* block = memcpy(Reallocate(nullptr, 5), "text", 5);
    for (const size_t size : {5'000u, 3u}) {
        const size_t old = reinterpret_cast<size_t>(block);
        block = Reallocate(block, size);
        EXPECT_NE(old, reinterpret_cast<size_t>(block)) << size;
        EXPECT_EQ("tex", std::string(static_cast<const char*>(block), 3)) << size;
    }
    EXPECT_EQ(nullptr, Reallocate(block, 0)); // the platform's answer, which frees
}

TEST(Allocator, RefusedReallocationKeepsTheOldBlock) {
    void* const block = memcpy(Reallocate(nullptr, 5), "text", 5);
    EXPECT_EQ(nullptr, Reallocate(block, sizeof(Huge)));
    EXPECT_STREQ("text", static_cast<const char*>(block));
    Free(block);
}

TEST(Allocator, RefusedNewConstructsNothing) { EXPECT_EQ(nullptr, New<Huge>(kMemLabelGeneral)); }

TEST(Allocator, RequiredMemoryThatIsRefusedEndsTheProcess) {
    int number = 0;
    EXPECT_EQ(&number, RequireMemory(&number));
    EXPECT_EXIT(RequireMemory(New<Huge>(kMemLabelGeneral)), testing::KilledBySignal(SIGABRT), "");
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
