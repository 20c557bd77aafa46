#include "Runtime/Utilities/SpookyHash.h"

#include "Runtime/Utilities/Hash128.h"
#include "Runtime/Utilities/ZarvoConfig.h"

#include <gtest/gtest.h>
#include <numeric>
#include <vector>

static Hash128 HashOf(const void* message, size_t length, Hash128 hash = {}) {
    SpookyHash::Hash128(message, length, &hash.halves[0], &hash.halves[1]);
    return hash;
}

// Byte i of the message is i & 0xFF. The short path ends at 191; within it, 16 and 32 are borders.
TEST(SpookyHash, KnownAnswersHoldAtEveryAlignmentAndChangeWithTheSeeds) {
    using Row = std::pair<size_t, Hash128>;
    for (const auto& [length, known] :
         {Row(0, {{0x232706fc6bf50919, 0x8b72ee65b4e851c7}}), Row(15, {{0xd9aa86de65dc278b, 0xda240564552a4a10}}),
          Row(16, {{0x340225d6331f2651, 0x886e7c23939a583d}}), Row(17, {{0x9eff109b3512e3b9, 0xe52259d521c8dca4}}),
          Row(31, {{0xa3962a6c761ffe09, 0x678fc7da4ac3197a}}), Row(32, {{0x57f50b68e2623fd2, 0x893924eff994198b}}),
          Row(33, {{0x3e958dcbef6dd224, 0x6482a6da6de7dc07}}), Row(191, {{0x71043a03b5bb462f, 0xfe7d0ad0a893b638}}),
          Row(192, {{0x02d13f94b2a31a54, 0x0ea393db758d85d3}}), Row(193, {{0x3000e51613f6e430, 0x226030278b4737a0}}),
          Row(256, {{0x203b9d8b51c50323, 0xc896a0657599ff50}}), Row(1000, {{0xe0fbb54472b2d8be, 0xfc0f2e867e61f867}})})
        for (size_t offset = 0; offset < 8; ++offset) {
            std::vector<UInt8> bytes(offset + length);
            std::iota(bytes.begin() + static_cast<ptrdiff_t>(offset), bytes.end(), UInt8{0});
            EXPECT_EQ(HashOf(bytes.data() + offset, length), known) << length << " bytes at " << offset;
            EXPECT_NE(HashOf(bytes.data() + offset, length, {{1, 0}}), known) << length;
            EXPECT_NE(HashOf(bytes.data() + offset, length, {{0, 1}}), known) << length;
        }
    EXPECT_EQ(HashOf(ZarvoConfig::ZarvoVersionUnderHash, 24), (Hash128{{0x0a40cd522218868a, 0xa82bd1e9643fd864}}));
}
