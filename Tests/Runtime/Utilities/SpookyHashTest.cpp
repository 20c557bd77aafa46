#include "Runtime/Utilities/SpookyHash.h"

#include <gtest/gtest.h>
#include <numeric>

// Byte i of the message, which is not aligned, is i & 0xFF. Messages from 192 on take the long path.
TEST(SpookyHash, KnownAnswersHold) {
    alignas(8) UInt8 bytes[1'001];
    std::iota(bytes + 1, bytes + 1'001, UInt8{0});
    using Row = std::tuple<size_t, UInt64, UInt64>;
    for (const auto& [length, first, second] :
         {Row(0, 0x232706fc6bf50919, 0x8b72ee65b4e851c7), Row(15, 0xd9aa86de65dc278b, 0xda240564552a4a10),
          Row(16, 0x340225d6331f2651, 0x886e7c23939a583d), Row(191, 0x71043a03b5bb462f, 0xfe7d0ad0a893b638),
          Row(192, 0x02d13f94b2a31a54, 0x0ea393db758d85d3), Row(1000, 0xe0fbb54472b2d8be, 0xfc0f2e867e61f867)}) {
        UInt64 hash[2] = {};
        SpookyHash::Hash128(bytes + 1, length, &hash[0], &hash[1]);
        EXPECT_TRUE(hash[0] == first && hash[1] == second) << length;
    }
}

TEST(SpookyHash, EachHalfStartsWithItsOwnSeed) {
    struct Case {
        size_t length;
        UInt64 first, second;
    };
    constexpr Case kCases[] = {
        {.length = 0, .first = 0xeec07ed910bce07a, .second = 0xfce8383cffab081d},
        {.length = 191, .first = 0x98ce42bc92692a5e, .second = 0x712f7e174cfef5c9},
        {.length = 192, .first = 0x7d454f3fdd6b7b22, .second = 0x99a8552cc6795fed},
    };
    UInt8 bytes[192];
    std::iota(bytes, bytes + 192, UInt8{0});
    for (const Case& row : kCases) {
        UInt64 first = 1, second = 2;
        SpookyHash::Hash128(bytes, row.length, &first, &second);
        EXPECT_EQ(row.first, first) << row.length;
        EXPECT_EQ(row.second, second) << row.length;
    }
}
