#include "Footing/Semaphore.h"

#include <csignal>
#include <gtest/gtest.h>
#include <thread>

using namespace ZarvoClassic;

// How many more waits would return at once; takes them.
static int TakeSignals(dispatch_semaphore_t semaphore) {
    int taken = 0;
    while (dispatch_semaphore_wait(semaphore, DISPATCH_TIME_NOW) == 0)
        ++taken;
    return taken;
}

// In the last row the sum does not fit in 32 bits.
TEST(SystemSemaphore, ReleaseSignalsOncePerUnitAndDropsWhatGoesBeyondTheMaximum) {
    using Row = std::tuple<int32_t, uint32_t, int32_t, int>;
    for (const auto& [before, released, after, signals] :
         {Row(5, 2, 7, 2), Row(0x7FFFFFFE, 3, 0x7FFFFFFF, 1), Row(0x7FFFFFFD, 0xFFFFFFFF, 0x7FFFFFFF, 2)}) {
        Footing_SystemSemaphore_Storage storage;
        const auto handle = Footing_SystemSemaphore_CreateInplace(&storage);
        storage.count = before;
        Footing_SystemSemaphore_Release(handle, released);
        EXPECT_EQ(storage.count, after) << before << " + " << released;
        EXPECT_EQ(TakeSignals(storage.platformSemaphore), signals) << before << " + " << released;
        Footing_SystemSemaphore_FreeInplace(handle);
    }
}

static std::atomic<int> gInterruptions;

TEST(CountingSemaphore, AsksTheSystemOnlyForThreadsThatWaitAndKeepsThemWaitingWhenInterrupted) {
    struct sigaction action = {}; // without SA_RESTART: a signal interrupts the wait
    action.sa_handler = [](int) { ++gInterruptions; };
    sigaction(SIGUSR1, &action, nullptr);
    Footing_Semaphore semaphore;
    Footing_Semaphore_CreateInplace(&semaphore);
    Footing_Semaphore_Release(&semaphore, 1);
    Footing_Semaphore_Acquire(&semaphore);
    int handedOver = 0; // plain: the semaphore alone must order the threads
    std::atomic<int> gone = 0;
    {
        const auto wait = [&] {
            Footing_Semaphore_Acquire(&semaphore);
            ++gone;
            EXPECT_EQ(handedOver, 42);
        };
        std::jthread first(wait), second(wait), third(wait);
        while (semaphore.count != -3)
            std::this_thread::yield();
        for (int sent = 1; sent <= 50; ++sent) {
            pthread_kill(first.native_handle(), SIGUSR1);
            while (gInterruptions < sent && gone == 0)
                std::this_thread::yield();
        }
        handedOver = 42;
        Footing_Semaphore_Release(&semaphore, 1);
        Footing_Semaphore_Release(&semaphore, 6);
    }
    EXPECT_TRUE(semaphore.count == 4 && semaphore.storage.count == 0);
    EXPECT_EQ(TakeSignals(semaphore.storage.platformSemaphore), 0);
    Footing_Semaphore_FreeInplace(&semaphore);
    signal(SIGUSR1, SIG_DFL);
}
