#include "Runtime/Math/Random/Rand.h"

#include "Runtime/Math/Random/EntropyDevice.h"
#include "Runtime/Math/Random/RandSeedBlock.h"

#include <array>
#include <cstdlib>
#include <cstring>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

namespace {

using State = std::array<UInt32, 4>;

State StateOf(const Rand& random) {
    State state;
    static_assert(sizeof(state) == sizeof(random));
    memcpy(state.data(), &random, sizeof(random));
    return state;
}

// No file can be opened while it lives, the entropy devices among them.
class WithoutNewDescriptors {
public:
    WithoutNewDescriptors() {
        getrlimit(RLIMIT_NOFILE, &m_Previous);
        const rlimit none = {.rlim_cur = 0, .rlim_max = m_Previous.rlim_max};
        EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &none));
    }
    ~WithoutNewDescriptors() { setrlimit(RLIMIT_NOFILE, &m_Previous); }

private:
    rlimit m_Previous;
};

} // namespace

TEST(Rand, EntropyFillsTheWholeState) {
    State anyBits = {};
    const SInt64 saltBefore = MakeRandSeedBlock().salt;
    for (int round = 0; round < 64; ++round) { // a byte that is 0 in all of them has not been filled
        Rand random;
        random.RandomizeState();
        for (size_t i = 0; i < anyBits.size(); ++i)
            anyBits[i] |= StateOf(random)[i];
    }
    EXPECT_EQ((State{0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF}), anyBits);
    EXPECT_EQ(saltBefore + 1, MakeRandSeedBlock().salt); // no block was made in between
}

TEST(Rand, EveryFallbackGivesAnotherState) {
    const WithoutNewDescriptors without;
    const SInt64 saltBefore = MakeRandSeedBlock().salt;
    Rand first, second;
    first.RandomizeState();
    second.RandomizeState();
    EXPECT_NE(StateOf(first), StateOf(second));
    EXPECT_NE(StateOf(Rand()), StateOf(first));
    EXPECT_EQ(saltBefore + 3, MakeRandSeedBlock().salt); // each has taken one
}

TEST(RandSeedBlock, HashIsTheKnownAnswer) {
    const RandSeedBlock block = {
        .time = 621'355'968'000'000'000,
        .timerTicks = 1,
        .versionHash = 0xa26b1cbb46275eee,
        .salt = 2,
        .processId = 1,
    };
    const Hash128 hash = HashOfSeedBlock(block);
    EXPECT_EQ(0xfdd886e7777d3037, hash.halves[0]);
    EXPECT_EQ(0x9f82f6bf83cd9990, hash.halves[1]);
}

TEST(RandSeedBlock, DescribesThisProcess) {
    const RandSeedBlock block = MakeRandSeedBlock();
    EXPECT_EQ(0xa26b1cbb46275eee, block.versionHash);
    EXPECT_EQ(getpid(), block.processId);
    const RandSeedBlock next = MakeRandSeedBlock();
    EXPECT_LE(block.time, next.time);
    EXPECT_LT(block.timerTicks, next.timerTicks);
    EXPECT_EQ(block.salt + 1, next.salt);
}

TEST(RandSeedBlock, FirstSaltOfAProcessIsTwo) {
    GTEST_FLAG_SET(death_test_style, "threadsafe"); // a process that runs nothing else
    EXPECT_EXIT(exit(static_cast<int>(MakeRandSeedBlock().salt)), testing::ExitedWithCode(2), "");
}

TEST(EntropyDevice, FirstThatOpensMustFillTheBuffer) {
    struct Case {
        const char* first;
        const char* second;
        bool isFilled;
    };
    constexpr Case kCases[] = {
        {.first = "-", .second = "-", .isFilled = false},
        {.first = "/dev/zero", .second = "-", .isFilled = true},
        {.first = "-", .second = "/dev/zero", .isFilled = true},
        {.first = "/proc/self/comm", .second = "/dev/zero", .isFilled = false}, // ten bytes
    };
    for (const Case& row : kCases) {
        UInt8 bytes[16] = {};
        EXPECT_EQ(row.isFilled, ReadEntropyDevice(row.first, row.second, bytes, sizeof(bytes)))
            << row.first << ", " << row.second;
    }
}

TEST(EntropyDevice, FillsNoMoreThanTheLength) {
    char bytes[] = "....";
    EXPECT_TRUE(ReadEntropyDevice("/dev/zero", "-", reinterpret_cast<UInt8*>(bytes), 3));
    EXPECT_EQ(std::string("\0\0\0.", 4), std::string(bytes, 4));
}
