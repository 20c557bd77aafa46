#include "Runtime/Threads/ThreadHelper.h"

#include "Runtime/Threads/SleepInterval.h"

void ThreadHelper::SleepInSeconds(double seconds) {
    const timespec interval = SleepIntervalFromSeconds(seconds);
    // An interrupted sleep is not resumed: callers that wait for something look again and sleep again.
    (void)nanosleep(&interval, nullptr);
}
