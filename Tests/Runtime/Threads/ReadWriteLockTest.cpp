#include "Runtime/Threads/ReadWriteLock.h"

#include "Tests/Support/ConsoleCapture.h"

#include <array>
#include <gtest/gtest.h>
#include <thread>

struct ReadWriteLockInspector {
    static std::atomic<UInt64>& Word(ReadWriteLock& lock) { return lock.m_Word; }
};

using namespace ReadWriteLockWord;
constexpr UInt64 kMost = 0x1FFFFF; // readers; writers have one bit more

// A word before and after is given as active readers, waiting readers, writers.
TEST(ReadWriteLock, EveryStateAndOperationGivesTheNextWordAndWakesWhomItMust) {
    constexpr auto readerIn = AcquireShared, readerOut = ReleaseShared;
    constexpr auto writerIn = AcquireExclusive, writerOut = ReleaseExclusive;
    using Row = std::tuple<Transition (*)(UInt64), std::array<UInt64, 6>, Verdict, UInt32, UInt32>;
    for (const auto& [step, w, verdict, readers, writers] :
         {Row(readerIn, {4, 0, 0, 5, 0, 0}, kGo, 0, 0), Row(readerIn, {0, 0, 1, 0, 1, 1}, kWait, 0, 0),
          Row(readerIn, {kMost, 0, 0, kMost, 0, 0}, kFull, 0, 0),
          Row(readerIn, {0, kMost, 1, 0, kMost, 1}, kFull, 0, 0), Row(readerOut, {2, 1, 1, 1, 1, 1}, kGo, 0, 0),
          Row(readerOut, {1, 0, 2, 0, 0, 2}, kGo, 0, 1), Row(readerOut, {0, 5, 1, 0, 5, 1}, kUnderflow, 0, 0),
          Row(writerIn, {0, 0, 0, 0, 0, 1}, kGo, 0, 0), Row(writerIn, {1, 0, 0, 1, 0, 1}, kWait, 0, 0),
          Row(writerIn, {0, 0, 2 * kMost + 1, 0, 0, 2 * kMost + 1}, kFull, 0, 0),
          Row(writerOut, {0, 0, 3, 0, 0, 2}, kGo, 0, 1), Row(writerOut, {0, kMost, 2, kMost, 0, 1}, kGo, kMost, 0),
          Row(writerOut, {1, 0, 1, 1, 0, 1}, kUnderflow, 0, 0)}) {
        const Transition got = step(w[0] | w[1] << 21 | w[2] << 42);
        EXPECT_EQ(got.word, w[3] | w[4] << 21 | w[5] << 42) << w[0] << w[1] << w[2];
        const bool isRight = got.verdict == verdict && got.wokenReaders == readers && got.wokenWriters == writers;
        EXPECT_TRUE(isRight) << w[0] << w[1] << w[2];
    }
}

TEST(ReadWriteLock, ReleaseOfWhatIsNotHeldIsReportedAndLeavesTheWordAlone) {
    ConsoleCapture console;
    ReadWriteLock lock;
    for (const auto release : {&ReadWriteLock::ReleaseShared, &ReadWriteLock::ReleaseExclusive})
        (lock.*release)(); // past the thread-safety analysis
    EXPECT_EQ(ReadWriteLockInspector::Word(lock), 0u);
    EXPECT_EQ(console.Text(), "ReadWriteLock::readers underflow!\nReadWriteLock::writers underflow!\n");
}

TEST(ReadWriteLock, ReadersNeverSeeAWriterHalfWay) {
    ReadWriteLock lock;
    int first = 0, second = 0; // guarded by lock
    {
        const auto write = [&] {
            for (int round = 0; round < 5'000; ++round) {
                ReadWriteLock::AutoExclusive exclusive(lock);
                ++first, ++second;
            }
        };
        const auto read = [&] {
            for (int round = 0; round < 5'000; ++round) {
                ReadWriteLock::AutoShared shared(lock);
                EXPECT_EQ(first, second);
            }
        };
        std::jthread writer1(write), writer2(write), reader1(read), reader2(read), reader3(read);
    }
    EXPECT_EQ(ReadWriteLockInspector::Word(lock), 0u);
    EXPECT_EQ(first, 10'000);
}
