#include "Runtime/Threads/Mutex.h"
#include "Runtime/Threads/ReadWriteLock.h"
#include "Runtime/Threads/Thread.h"
#include "Runtime/Threads/ThreadHelper.h"
#include "Tests/Support/ConsoleCapture.h"

#include <gtest/gtest.h>
#include <thread>

struct MutexInspector {
    static SInt32 Counter(const Mutex& mutex) { return mutex.m_Counter; }
};

TEST(Mutex, LastUnlockHandsTheLockToAWaiterWithoutFreeingIt) {
    // Locking again what is held is what the lock is for, and what the thread-safety analysis takes for a mistake.
    const auto lock = &Mutex::Lock, unlock = &Mutex::Unlock;
    Mutex mutex;
    int count = 0; // guarded by mutex
    for (int round = 0; round < 100; ++round) {
        ASSERT_TRUE(MutexInspector::Counter(mutex) == 1 && count == 600 * round) << "round " << round;
        (mutex.*unlock)(), (mutex.*lock)(), (mutex.*lock)(), (mutex.*lock)(); // the first, of a free one, does nothing
        std::atomic<bool> mayLeave = false;
        const auto contend = [&] {
            for (int i = 0; i < 200; ++i) {
                Mutex::AutoLock held(mutex);
                while (!mayLeave)
                    std::this_thread::yield();
                ++count;
            }
        };
        std::jthread first(contend), second(contend), third(contend);
        while (MutexInspector::Counter(mutex) != -3)
            std::this_thread::yield();
        (mutex.*unlock)(), (mutex.*unlock)();
        EXPECT_TRUE(MutexInspector::Counter(mutex) == -3 && mutex.IsLockedByCurrentThread());
        (mutex.*unlock)();
        EXPECT_TRUE(MutexInspector::Counter(mutex) == -2 && !mutex.IsLockedByCurrentThread());
        mayLeave = true;
    }
}

// Bits 0-20 count active readers, 21-41 waiting ones, 42-63 writers. Woken: a number of readers, or -1 for a writer.
TEST(ReadWriteLock, EveryStateAndOperationGivesTheNextWordAndWakesWhomItMust) {
    using namespace ReadWriteLockWord;
    constexpr UInt64 most = 0x1FFFFF, q = UInt64{1} << 21, w = q << 21;
    using Row = std::tuple<Transition (*)(UInt64), UInt64, Verdict, UInt64, SInt64>;
    for (const auto& [step, before, verdict, after, woken] :
         {Row(AcquireShared, 4, kGo, 5, 0), Row(AcquireShared, 1 + w, kWait, 1 + q + w, 0),
          Row(AcquireShared, most, kFull, most, 0), Row(AcquireShared, most * q + w, kFull, most * q + w, 0),
          Row(ReleaseShared, 2 + q + w, kGo, 1 + q + w, 0), Row(ReleaseShared, 1 + 2 * w, kGo, 2 * w, -1),
          Row(ReleaseShared, q + w, kUnderflow, q + w, 0), Row(ReleaseExclusive, 1 + w, kUnderflow, 1 + w, 0),
          Row(ReleaseExclusive, most * q + 2 * w, kGo, most + w, most), Row(ReleaseExclusive, 3 * w, kGo, 2 * w, -1),
          Row(AcquireExclusive, 0, kGo, w, 0), Row(AcquireExclusive, ~(w - 1), kFull, ~(w - 1), 0),
          Row(AcquireExclusive, 1, kWait, 1 + w, 0), Row(AcquireExclusive, w, kWait, 2 * w, 0)}) {
        const Transition got = step(before);
        EXPECT_TRUE(got.word == after && got.verdict == verdict) << std::hex << before;
        EXPECT_EQ(SInt64{got.wokenReaders} - got.wokenWriters, woken) << std::hex << before;
    }
}

TEST(ReadWriteLock, ReleaseOfWhatIsNotHeldIsReported) {
    struct Case {
        void (ReadWriteLock::*release)(); // called by its address, as the thread-safety analysis refuses it by name
        const char* report;
    };
    constexpr Case kCases[] = {
        {.release = &ReadWriteLock::ReleaseShared, .report = "ReadWriteLock::readers underflow!\n"},
        {.release = &ReadWriteLock::ReleaseExclusive, .report = "ReadWriteLock::writers underflow!\n"},
    };
    for (const Case& row : kCases) {
        const ConsoleCapture console;
        ReadWriteLock lock;
        (lock.*row.release)();
        EXPECT_EQ(row.report, console.Text());
    }
}

TEST(ReadWriteLock, ReadersNeverSeeAWriterHalfWay) {
    ReadWriteLock lock;
    int first = 0, second = 0; // guarded by lock
    const auto use = [&] {
        for (int round = 0; round < 2'000; ++round) {
            lock.AcquireExclusive();
            ++first, std::this_thread::yield(), ++second; // others come meanwhile, and wait
            lock.ReleaseExclusive();
            ReadWriteLock::AutoShared shared(lock);
            EXPECT_EQ(first, second);
            std::this_thread::yield();
        }
    };
    { std::jthread one(use), two(use), three(use), four(use); }
    EXPECT_EQ(first, 8'000);
}

TEST(ThreadHelper, SleepIsWholeSecondsAndWholeMicroseconds) {
    EXPECT_EQ(ThreadHelper::IntervalFromSeconds(-1.2500001).tv_nsec, 749'999'000);
    CurrentThread::SleepForSeconds(-3600.0); // an hour, were the sign lost
}
