#include "Footing/Semaphore.h"

#include <csignal>
#include <gtest/gtest.h>
#include <sys/time.h>

using namespace ZarvoClassic;

static Footing_Semaphore gSemaphore;
static std::atomic<int> gInterruptions;

// Signals interrupt the wait every millisecond; the third of them releases.
class InterruptedSemaphore : public testing::Test {
protected:
    InterruptedSemaphore() {
        gInterruptions = 0;
        Footing_Semaphore_CreateInplace(&gSemaphore);
        struct sigaction action = {}; // without SA_RESTART, which would hide the interruption
        action.sa_handler = [](int) {
            if (++gInterruptions == 3) Footing_Semaphore_Release(&gSemaphore, 2);
        };
        sigaction(SIGALRM, &action, nullptr);
        const itimerval everyMillisecond = {.it_interval = {0, 1'000}, .it_value = {0, 1'000}};
        setitimer(ITIMER_REAL, &everyMillisecond, nullptr);
    }
    ~InterruptedSemaphore() override {
        const itimerval never = {};
        setitimer(ITIMER_REAL, &never, nullptr);
        Footing_Semaphore_FreeInplace(&gSemaphore);
    }
};

TEST_F(InterruptedSemaphore, WaitsOnUntilTheRelease) {
    Footing_Semaphore_Acquire(&gSemaphore);
    EXPECT_GE(gInterruptions, 3);
}

TEST_F(InterruptedSemaphore, AsksTheSystemForOneWaiterOnly) {
    Footing_Semaphore_Acquire(&gSemaphore); // takes one of the two releases from the system
    EXPECT_EQ(0, gSemaphore.storage.count);
    EXPECT_EQ(1, gSemaphore.count);
    Footing_Semaphore_Acquire(&gSemaphore);
    EXPECT_EQ(0, gSemaphore.count);
}

TEST(SystemSemaphore, ReleasesBeyondTheMostAreDropped) {
    constexpr int32_t kMost = Footing_SystemSemaphore_MaxCount;
    struct Case {
        int32_t before;
        uint32_t released;
        int32_t after;
        int signals;
    };
    constexpr Case kCases[] = {
        {.before = 0, .released = 3, .after = 3, .signals = 3},
        {.before = kMost - 2, .released = 2, .after = kMost, .signals = 2},
        {.before = kMost - 2, .released = 3, .after = kMost, .signals = 2},
        {.before = kMost, .released = 1, .after = kMost, .signals = 0},
        {.before = kMost, .released = 0x80000001, .after = kMost, .signals = 0}, // 2^32 in all
        {.before = kMost, .released = 0xFFFFFFFF, .after = kMost, .signals = 0},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << row.before << " and " << row.released);
        Footing_SystemSemaphore_Storage storage;
        const Footing_SystemSemaphore_Handle handle = Footing_SystemSemaphore_CreateInplace(&storage);
        storage.count = row.before;
        Footing_SystemSemaphore_Release(handle, row.released);
        EXPECT_EQ(row.after, storage.count);

        int signals = 0;
        while (dispatch_semaphore_wait(storage.platformSemaphore, DISPATCH_TIME_NOW) == 0)
            ++signals;
        EXPECT_EQ(row.signals, signals);
        Footing_SystemSemaphore_FreeInplace(handle);
    }
}
