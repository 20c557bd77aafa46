#include "Runtime/Threads/Mutex.h"

#include <gtest/gtest.h>
#include <thread>

struct MutexInspector {
    static SInt32 Counter(const Mutex& mutex) { return mutex.m_Counter; }
};

// Locking again what is held is what the lock is for, and what the thread-safety analysis takes for a mistake.
static void Repeat(Mutex& mutex, void (Mutex::*operation)(), int times) {
    for (int i = 0; i < times; ++i)
        (mutex.*operation)();
}

TEST(Mutex, UnlockOfTheLastTimeHandsTheLockToAWaiterWithoutFreeingIt) {
    for (int round = 0; round < 100; ++round) {
        Mutex mutex;
        Repeat(mutex, &Mutex::Unlock, 2); // of a free one
        EXPECT_EQ(MutexInspector::Counter(mutex), 1);
        Repeat(mutex, &Mutex::Lock, 3);
        std::atomic<bool> mayLeave = false;
        {
            const auto wait = [&] {
                Mutex::AutoLock lock(mutex);
                while (!mayLeave)
                    std::this_thread::yield();
            };
            std::jthread first(wait), second(wait), third(wait);
            while (MutexInspector::Counter(mutex) != -3)
                std::this_thread::yield();
            Repeat(mutex, &Mutex::Unlock, 2);
            EXPECT_TRUE(MutexInspector::Counter(mutex) == -3 && mutex.IsLockedByCurrentThread());
            Repeat(mutex, &Mutex::Unlock, 1);
            EXPECT_TRUE(MutexInspector::Counter(mutex) == -2 && !mutex.IsLockedByCurrentThread());
            mayLeave = true;
        }
        ASSERT_TRUE(MutexInspector::Counter(mutex) == 1 && !mutex.IsLockedByCurrentThread()) << "round " << round;
    }
}

TEST(Mutex, ExcludesThreadsThatContendForIt) {
    Mutex mutex;
    int count = 0; // guarded by mutex
    {
        const auto countUp = [&] {
            for (int round = 0; round < 20'000; ++round) {
                Mutex::AutoLock lock(mutex);
                ++count;
            }
        };
        std::jthread first(countUp), second(countUp), third(countUp), fourth(countUp);
    }
    EXPECT_EQ(count, 80'000);
}
