#include "Runtime/Threads/Mutex.h"
#include "Runtime/Threads/ReadWriteLock.h"
#include "Runtime/Threads/SleepInterval.h"
#include "Runtime/Threads/Thread.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/MutexInspector.h"

#include <gtest/gtest.h>
#include <thread>

// Called by their addresses: locking again what is held is what the lock is for, and what the thread-safety analysis
// takes for a mistake.
static constexpr auto kLock = &Mutex::Lock;
static constexpr auto kUnlock = &Mutex::Unlock;

TEST(Mutex, IsFreeAfterAsManyUnlocksAsLocks) {
    Mutex mutex;
    for (int i = 0; i < 3; ++i)
        (mutex.*kLock)();
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(0, MutexInspector::Counter(mutex));
        EXPECT_TRUE(MutexInspector::IsLockedByCurrentThread(mutex));
        (mutex.*kUnlock)();
    }
    EXPECT_EQ(1, MutexInspector::Counter(mutex));
    EXPECT_FALSE(MutexInspector::IsLockedByCurrentThread(mutex));
}

TEST(Mutex, UnlockOfAFreeOneDoesNothing) {
    Mutex mutex;
    (mutex.*kUnlock)();
    EXPECT_EQ(1, MutexInspector::Counter(mutex));
}

TEST(Mutex, LastUnlockHandsTheLockToAWaiter) {
    Mutex mutex;
    for (int round = 0; round < 100; ++round) {
        SCOPED_TRACE(testing::Message() << "round " << round);
        (mutex.*kLock)();
        (mutex.*kLock)();
        std::atomic<bool> mayLeave = false;
        const auto hold = [&] {
            Mutex::AutoLock held(mutex);
            while (!mayLeave)
                std::this_thread::yield();
        };
        std::jthread first(hold), second(hold), third(hold);
        while (MutexInspector::Counter(mutex) != -3)
            std::this_thread::yield();
        (mutex.*kUnlock)();
        EXPECT_EQ(-3, MutexInspector::Counter(mutex));
        EXPECT_TRUE(MutexInspector::IsLockedByCurrentThread(mutex));
        (mutex.*kUnlock)();
        EXPECT_EQ(-2, MutexInspector::Counter(mutex)); // never free meanwhile
        EXPECT_FALSE(MutexInspector::IsLockedByCurrentThread(mutex));
        mayLeave = true;
    }
}

TEST(Mutex, HoldsOneThreadAtATime) {
    constexpr int kRounds = 20'000;
    Mutex mutex;
    int count = 0; // guarded by mutex
    const auto contend = [&] {
        for (int i = 0; i < kRounds; ++i) {
            Mutex::AutoLock held(mutex);
            ++count;
        }
    };
    { std::jthread first(contend), second(contend), third(contend); }
    EXPECT_EQ(3 * kRounds, count);
    EXPECT_EQ(1, MutexInspector::Counter(mutex));
}

TEST(ReadWriteLock, EachStepGivesTheNextWord) {
    using namespace ReadWriteLockWord;
    constexpr UInt64 kMostReaders = 0x1FFFFF;
    constexpr UInt64 q = UInt64{1} << 21; // one waiting reader
    constexpr UInt64 w = UInt64{1} << 42; // one writer
    constexpr UInt64 kAllWriters = ~(w - 1);
    struct Case {
        Transition (*step)(UInt64);
        UInt64 before;
        Verdict verdict;
        UInt64 after;
        UInt32 wokenReaders = 0;
        UInt32 wokenWriters = 0;
    };
    constexpr Case kCases[] = {
        {.step = AcquireShared, .before = 4, .verdict = kGo, .after = 5},
        {.step = AcquireShared, .before = 1 + w, .verdict = kWait, .after = 1 + q + w},
        {.step = AcquireShared, .before = kMostReaders, .verdict = kFull, .after = kMostReaders},
        {.step = AcquireShared, .before = kMostReaders * q + w, .verdict = kFull, .after = kMostReaders * q + w},
        {.step = ReleaseShared, .before = 2 + q + w, .verdict = kGo, .after = 1 + q + w},
        {.step = ReleaseShared, .before = 1 + 2 * w, .verdict = kGo, .after = 2 * w, .wokenWriters = 1},
        {.step = ReleaseShared, .before = q + w, .verdict = kUnderflow, .after = q + w},
        {.step = AcquireExclusive, .before = 0, .verdict = kGo, .after = w},
        {.step = AcquireExclusive, .before = 1, .verdict = kWait, .after = 1 + w},
        {.step = AcquireExclusive, .before = w, .verdict = kWait, .after = 2 * w},
        {.step = AcquireExclusive, .before = kAllWriters, .verdict = kFull, .after = kAllWriters},
        {.step = ReleaseExclusive, .before = 1 + w, .verdict = kUnderflow, .after = 1 + w},
        {.step = ReleaseExclusive, .before = 3 * w, .verdict = kGo, .after = 2 * w, .wokenWriters = 1},
        {.step = ReleaseExclusive,
         .before = kMostReaders * q + 2 * w,
         .verdict = kGo,
         .after = kMostReaders + w,
         .wokenReaders = kMostReaders},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << "row " << &row - kCases << ", word 0x" << std::hex << row.before);
        const Transition got = row.step(row.before);
        EXPECT_EQ(row.verdict, got.verdict);
        EXPECT_EQ(row.after, got.word);
        EXPECT_EQ(row.wokenReaders, got.wokenReaders);
        EXPECT_EQ(row.wokenWriters, got.wokenWriters);
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
            ++first;
            std::this_thread::yield(); // others come now, and wait
            ++second;
            lock.ReleaseExclusive();
            ReadWriteLock::AutoShared shared(lock);
            EXPECT_EQ(first, second);
            std::this_thread::yield();
        }
    };
    { std::jthread one(use), two(use), three(use), four(use); }
    EXPECT_EQ(8'000, first);
}

TEST(SleepInterval, IsWholeSecondsAndWholeMicroseconds) {
    struct Case {
        double seconds;
        time_t wholeSeconds;
        long nanoseconds;
    };
    constexpr Case kCases[] = {
        {.seconds = 1.5, .wholeSeconds = 1, .nanoseconds = 500'000'000},
        {.seconds = 0.0000004, .wholeSeconds = 0, .nanoseconds = 0},
        {.seconds = -1.2500001, .wholeSeconds = -2, .nanoseconds = 749'999'000},
        {.seconds = -3'600.0, .wholeSeconds = -3'600, .nanoseconds = 0},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(row.seconds);
        const timespec interval = SleepIntervalFromSeconds(row.seconds);
        EXPECT_EQ(row.wholeSeconds, interval.tv_sec);
        EXPECT_EQ(row.nanoseconds, interval.tv_nsec);
    }
}

TEST(CurrentThread, NegativeTimeIsNotSlept) {
    CurrentThread::SleepForSeconds(-3600.0); // an hour, were the sign lost
}
