#include "Footing/Semaphore.h"

#include <csignal>
#include <gtest/gtest.h>
#include <sys/time.h>

using namespace ZarvoClassic;

static Footing_Semaphore gSemaphore;
static std::atomic<int> gInterruptions;

TEST(Semaphore, WakesNobodyForAnInterruptionAndAsksTheSystemOnlyForThreadsThatWait) {
    Footing_Semaphore_CreateInplace(&gSemaphore);
    struct sigaction action = {}; // without SA_RESTART: a signal interrupts the wait
    action.sa_handler = [](int) {
        if (++gInterruptions == 3) Footing_Semaphore_Release(&gSemaphore, 2);
    };
    sigaction(SIGALRM, &action, nullptr);
    const itimerval everyMillisecond = {{0, 1'000}, {0, 1'000}}, never = {};
    setitimer(ITIMER_REAL, &everyMillisecond, nullptr);
    Footing_Semaphore_Acquire(&gSemaphore);
    setitimer(ITIMER_REAL, &never, nullptr);
    ASSERT_GE(gInterruptions, 3);
    Footing_Semaphore_Acquire(&gSemaphore); // asks the system for nothing
    EXPECT_TRUE(gSemaphore.count == 0 && gSemaphore.storage.count == 0);
    Footing_Semaphore_FreeInplace(&gSemaphore);
}
