#include "Runtime/Math/Random/Rand.h"

#include "Footing/Timer.h"
#include "Runtime/Utilities/DateTime.h"
#include "Runtime/Utilities/Hash128.h"
#include "Tests/Support/TemporaryFolder.h"

#include <bit>
#include <cstring>
#include <gtest/gtest.h>
#include <unistd.h>

using ZarvoClassic::Footing_Timer_GetHighPrecisionTimerTicks;

TEST(Rand, StateIsTheEntropyOrTheHashOfABlockOfThisProcess) {
    Rand random, twin;
    random.RandomizeState([](UInt8* buffer, size_t length) { return memset(buffer, 0xAB, length) == buffer; });
    EXPECT_EQ(std::bit_cast<Hash128>(random), (Hash128{{0xABABABABABABABAB, 0xABABABABABABABAB}}));
    random.SetStateFromHash({621'355'968'000'000'000, 1, 0xa26b1cbb46275eee, 2, 1});
    EXPECT_EQ(std::bit_cast<Hash128>(random), (Hash128{{0xfdd886e7777d3037, 0x9f82f6bf83cd9990}}));
    RandSeedBlock block = {};
    for (int i = 0; i < 2; ++i) {
        static SInt64 salt = 2; // the first of a process
        const SInt64 time = GetCurrentTimeAsDateTime().ticks;
        const UInt64 ticks = Footing_Timer_GetHighPrecisionTimerTicks();
        random.RandomizeState([](UInt8* buffer, size_t) { return (*buffer = 1) == 0; }, &block); // filled in part
        EXPECT_TRUE(time <= block.time && block.time <= GetCurrentTimeAsDateTime().ticks);
        EXPECT_TRUE(ticks <= block.timerTicks && block.timerTicks <= Footing_Timer_GetHighPrecisionTimerTicks());
        EXPECT_TRUE(block.versionHash == 0xa26b1cbb46275eee && block.processId == getpid());
        EXPECT_EQ(block.salt, salt++);
        twin.SetStateFromHash(block);
        EXPECT_EQ(random, twin);
    }
}

// The device that opens first is read once; /proc/self opens, but can't be read, and ostype is a short text.
TEST(SystemEntropy, OneReadOfTheFirstDeviceThatOpensMustFillTheBuffer) {
    const size_t descriptors = CountOpenDescriptors();
    using Row = std::tuple<const char*, const char*, bool>;
    for (const auto& [first, second, isFilled] : {Row("/dev/zero", "none", true), Row("none", "/dev/zero", true),
                                                  Row("/proc/sys/kernel/ostype", "/dev/zero", false),
                                                  Row("none", "none", false), Row("/proc/self", "/dev/zero", false)}) {
        UInt8 bytes[17] = "................";
        EXPECT_EQ(ReadEntropyDevice(first, second, bytes, 16), isFilled) << first << ", " << second;
        EXPECT_EQ(bytes[15], isFilled ? 0 : '.') << first << ", " << second;
    }
    EXPECT_EQ(descriptors, CountOpenDescriptors());
}
