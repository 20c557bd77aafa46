#include "Library/Threads.h"

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Containers/DynamicArray.h"

#include <algorithm>
#include <csignal>
#include <pthread.h>
#include <sched.h>
#include <unistd.h>

static UInt32 ProcessorCount() {
    cpu_set_t processors;
    if (sched_getaffinity(0, sizeof(processors), &processors) == 0) return static_cast<UInt32>(CPU_COUNT(&processors));
    const long online = sysconf(_SC_NPROCESSORS_ONLN); // more processors than the set can name
    return online > 0 ? static_cast<UInt32>(online) : 1;
}

UInt32 ChooseThreadCount(UInt32 wanted, UInt64 atMost) {
    constexpr UInt64 kMaxThreads = 1'024;
    const UInt32 count = wanted != 0 ? wanted : ProcessorCount();
    return static_cast<UInt32>(std::clamp<UInt64>(std::min<UInt64>(count, atMost), 1, kMaxThreads));
}

// What threads block. The signal of a fault goes to the thread that caused it: if that blocks it, the system ends the
// process, whatever handler it has.
static sigset_t AllButFaults() {
    sigset_t signals;
    sigfillset(&signals);
    for (const int fault : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS})
        sigdelset(&signals, fault);
    return signals;
}

struct WatchedRun::Job {
    WatchedRun* run;
    Call call;
    UInt32 number;
    pthread_t thread;
};

void* WatchedRun::RunJob(void* given) {
    const Job& job = *static_cast<Job*>(given);
    job.call.make(job.call.called, job.number);
    std::lock_guard lock(job.run->m_EndLock);
    ++job.run->m_Ended;
    job.run->m_HasEnded.notify_one();
    return nullptr;
}

void WatchedRun::RunCalls(UInt32 count, Call call) {
    dynamic_array<Job> jobs(kMemLabelGeneral);
    if (!jobs.resize_uninitialized(count, kResizeExact)) count = 0;
    m_IsAlone = false;
    m_Ended = 0;
    const sigset_t blocked = AllButFaults();
    sigset_t before;
    pthread_sigmask(SIG_SETMASK, &blocked, &before); // threads begin with the mask of their maker
    UInt32 started = 0;
    for (; started < count; ++started) {
        jobs[started] = {this, call, started, {}};
        if (pthread_create(&jobs[started].thread, nullptr, RunJob, &jobs[started]) != 0) break;
    }
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
    if (started == 0) {
        m_IsAlone = true;
        return call.make(call.called, 0);
    }
    WaitFor(started);
    for (UInt32 number = 0; number < started; ++number)
        pthread_join(jobs[number].thread, nullptr);
}

void WatchedRun::WaitFor(UInt32 count) {
    std::unique_lock lock(m_EndLock);
    while (!m_HasEnded.wait_for(lock, m_Interval, [&] { return m_Ended == count; })) {
        lock.unlock();
        Look();
        lock.lock();
    }
}
