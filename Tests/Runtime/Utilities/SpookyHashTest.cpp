#include "Runtime/Utilities/SpookyHash.h"

#include <gtest/gtest.h>
#include <numeric>

// The hash of a message whose byte i is i & 0xFF. Messages of 192 bytes and more take the long path.
struct Answer {
    size_t length;
    UInt64 first, second;
};

TEST(SpookyHash, KnownAnswersHoldOnUnalignedMessages) {
    constexpr Answer kCases[] = {
        {.length = 0, .first = 0x232706fc6bf50919, .second = 0x8b72ee65b4e851c7},
        {.length = 15, .first = 0xd9aa86de65dc278b, .second = 0xda240564552a4a10},
        {.length = 16, .first = 0x340225d6331f2651, .second = 0x886e7c23939a583d},
        {.length = 191, .first = 0x71043a03b5bb462f, .second = 0xfe7d0ad0a893b638},
        {.length = 192, .first = 0x02d13f94b2a31a54, .second = 0x0ea393db758d85d3},
        {.length = 1'000, .first = 0xe0fbb54472b2d8be, .second = 0xfc0f2e867e61f867},
    };
    alignas(8) UInt8 bytes[1'001];
    std::iota(bytes + 1, bytes + 1'001, UInt8{0});
    for (const Answer& row : kCases) {
        UInt64 first = 0, second = 0;
        SpookyHash::Hash128(bytes + 1, row.length, &first, &second);
        EXPECT_EQ(row.first, first) << row.length;
        EXPECT_EQ(row.second, second) << row.length;
    }
}

TEST(SpookyHash, EachHalfStartsWithItsOwnSeed) {
    constexpr Answer kCases[] = {
        {.length = 0, .first = 0xeec07ed910bce07a, .second = 0xfce8383cffab081d},
        {.length = 191, .first = 0x98ce42bc92692a5e, .second = 0x712f7e174cfef5c9},
        {.length = 192, .first = 0x7d454f3fdd6b7b22, .second = 0x99a8552cc6795fed},
    };
    UInt8 bytes[192];
    std::iota(bytes, bytes + 192, UInt8{0});
    for (const Answer& row : kCases) {
        UInt64 first = 1, second = 2;
        SpookyHash::Hash128(bytes, row.length, &first, &second);
        EXPECT_EQ(row.first, first) << row.length;
        EXPECT_EQ(row.second, second) << row.length;
    }
}
