#include "Runtime/Math/Random/Rand.h"

#include <cstring>
#include <gtest/gtest.h>

TEST(Rand, StateIsTheEntropyOrTheHashOfABlockOfThisProcess) {
    const UInt64 kHash[] = {0xfdd886e7777d3037, 0x9f82f6bf83cd9990};
    Rand random, twin;
    random.RandomizeState([](UInt8* buffer, size_t length) { return memset(buffer, 0xAB, length) == buffer; });
    EXPECT_EQ(memcmp(&random, std::string(16, '\xAB').data(), sizeof(random)), 0);
    random.SetStateFromHash({621'355'968'000'000'000, 1, 0xa26b1cbb46275eee, 2, 1});
    EXPECT_EQ(memcmp(&random, kHash, sizeof(random)), 0);
    for (const SInt64 salt : {2, 3}) { // the first of a process
        RandSeedBlock block = {};
        random.RandomizeState([](UInt8* buffer, size_t) { return (*buffer = 1) == 0; }, &block); // filled in part
        twin.SetStateFromHash(block);
        EXPECT_TRUE(random == twin && block.versionHash == 0xa26b1cbb46275eee && block.salt == salt);
    }
}

TEST(SystemEntropy, OneReadOfTheFirstDeviceThatOpensMustFillTheBuffer) {
    UInt8 bytes[17] = "................";
    // The second holds ten bytes.
    EXPECT_FALSE(ReadEntropyDevice("-", "-", bytes, 16) ||
                 ReadEntropyDevice("/proc/self/comm", "/dev/zero", bytes, 16));
    EXPECT_TRUE(bytes[15] == '.' && ReadEntropyDevice("-", "/dev/zero", bytes, 16) && bytes[15] == 0);
}
