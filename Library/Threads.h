// Threads that work while the calling thread watches. They end before the call that starts them returns. They block all
// signals but those of faults, so that the program's signal handlers run on its own threads.
#pragma once

#include "Library/Progress.h"

#include <condition_variable>
#include <mutex>
#include <type_traits>

// How many threads a run uses: as many as its caller wants (0: one per processor that the process may use), but no more
// than there is memory, or work, for. At least 1.
UInt32 ChooseThreadCount(UInt32 wanted, UInt64 atMost);

// A run that the calling thread watches. One thread makes and runs it.
class WatchedRun {
public:
    // interval: how often it is looked at.
    explicit WatchedRun(std::chrono::milliseconds interval = kProgressInterval)
        : m_Interval(interval), m_Clock(ProgressClock::Clock::now(), interval) {}
    virtual ~WatchedRun() = default;

protected:
    // Calls work in count threads, with numbers from 0 on, and returns when all have ended. When the system refuses
    // threads, fewer work; when it refuses all, the calling thread does.
    template <typename Work>
    void RunOnThreads(UInt32 count, Work&& work) {
        using Called = std::remove_reference_t<Work>;
        RunCalls(count, {[](void* called, UInt32 number) { (*static_cast<Called*>(called))(number); }, &work});
    }

    // Called in the calling thread at each interval while threads work, with no lock held.
    virtual void Look() = 0;

    // The work calls this between its pieces. Looks if the calling thread works itself, and the interval is over.
    void LookIfAlone() {
        if (m_IsAlone && m_Clock.IsDue()) Look();
    }

private:
    struct Job;

    // The work, without its type: std::function would copy it, and may need the program's operator new for that.
    struct Call {
        void (*make)(void* called, UInt32 number);
        void* called;
    };

    void RunCalls(UInt32 count, Call call);
    static void* RunJob(void* given);
    void WaitFor(UInt32 count);

    const std::chrono::milliseconds m_Interval;
    bool m_IsAlone = false; // not written while there are threads
    ProgressClock m_Clock;

    std::mutex m_EndLock;
    std::condition_variable m_HasEnded;
    UInt32 m_Ended = 0; // threads
};
