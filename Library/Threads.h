// Threads that end before the call that starts them returns. They block all signals, so that the program's signal
// handlers run on its own threads.
#pragma once

#include "Runtime/Core/Types.h"

#include <chrono>
#include <condition_variable>
#include <mutex>

// How many threads the process may use at once, by the processors that it may run on.
UInt32 ProcessorCount();

// How often a run tells its progress.
constexpr auto kProgressInterval = std::chrono::milliseconds(100);

// Work that several threads do while the calling thread watches.
class ThreadedWork {
public:
    virtual ~ThreadedWork() = default;

    // Called in each thread, with its number, from 0 on.
    virtual void Work(UInt32 number) = 0;

    // Called in the calling thread; returns when count threads have ended their Work.
    virtual void Watch(UInt32 count) = 0;

    // Called in the calling thread, instead of both, when the system refuses all threads.
    virtual void WorkAlone() = 0;
};

// Returns when all threads have ended. When the system refuses threads, fewer than count work.
void RunOnThreads(UInt32 count, ThreadedWork* work);

// How the thread that watches learns that the workers have ended.
class WorkerCount {
public:
    // Called by each worker when it ends.
    void AddEnded();

    // Returns when count workers have ended, and calls meanwhile() at each interval until then, with no lock held.
    template <typename Meanwhile>
    void WaitFor(UInt32 count, Meanwhile&& meanwhile, std::chrono::milliseconds interval = kProgressInterval) {
        std::unique_lock lock(m_Lock);
        while (!m_HasEnded.wait_for(lock, interval, [&] { return m_Ended == count; })) {
            lock.unlock();
            meanwhile();
            lock.lock();
        }
    }

private:
    std::mutex m_Lock;
    std::condition_variable m_HasEnded;
    UInt32 m_Ended = 0;
};
