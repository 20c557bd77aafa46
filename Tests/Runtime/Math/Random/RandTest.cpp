#include "Runtime/Math/Random/Rand.h"

#include "Runtime/Utilities/DateTime.h"
#include "Runtime/Utilities/Hash128.h"

#include <bit>
#include <cstring>
#include <gtest/gtest.h>
#include <unistd.h>

TEST(Rand, StateIsTheEntropyOrTheHashOfABlockOfThisProcess) {
    Rand random, twin;
    random.RandomizeState([](UInt8* buffer, size_t length) { return memset(buffer, 0xAB, length) == buffer; });
    EXPECT_EQ(std::bit_cast<Hash128>(random), (Hash128{{0xABABABABABABABAB, 0xABABABABABABABAB}}));
    random.SetStateFromHash({621'355'968'000'000'000, 1, 0xa26b1cbb46275eee, 2, 1});
    EXPECT_EQ(std::bit_cast<Hash128>(random), (Hash128{{0xfdd886e7777d3037, 0x9f82f6bf83cd9990}}));
    RandSeedBlock last = {GetCurrentTimeAsDateTime().ticks, 1, 0, 1, 0}, block = {};
    for (int i = 0; i < 2; ++i, last = block) { // the first block of a process has the salt 2
        random.RandomizeState([](UInt8* buffer, size_t) { return (*buffer = 1) == 0; }, &block); // filled in part
        EXPECT_TRUE(last.time <= block.time && last.timerTicks <= block.timerTicks && last.salt + 1 == block.salt);
        EXPECT_TRUE(block.versionHash == 0xa26b1cbb46275eee && block.processId == getpid());
        twin.SetStateFromHash(block);
        EXPECT_EQ(random, twin);
    }
}

TEST(SystemEntropy, OneReadOfTheFirstDeviceThatOpensMustFillTheBuffer) {
    UInt8 bytes[17] = "................";
    EXPECT_FALSE(ReadEntropyDevice("none", "none", bytes, 16));
    EXPECT_FALSE(ReadEntropyDevice("/proc/sys/kernel/ostype", "/dev/zero", bytes, 16)); // a short text
    EXPECT_TRUE(bytes[15] == '.' && ReadEntropyDevice("none", "/dev/zero", bytes, 16) && bytes[15] == 0);
}
