#include "Library/Threads.h"

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Containers/DynamicArray.h"

#include <csignal>
#include <pthread.h>
#include <sched.h>
#include <unistd.h>

namespace {

struct Job {
    ThreadedWork* work;
    UInt32 number;
    pthread_t thread;
};

void* RunJob(void* given) {
    const Job& job = *static_cast<Job*>(given);
    job.work->Work(job.number);
    return nullptr;
}

} // namespace

UInt32 ProcessorCount() {
    cpu_set_t processors;
    if (sched_getaffinity(0, sizeof(processors), &processors) == 0) return static_cast<UInt32>(CPU_COUNT(&processors));
    const long online = sysconf(_SC_NPROCESSORS_ONLN); // more processors than the set can name
    return online > 0 ? static_cast<UInt32>(online) : 1;
}

void RunOnThreads(UInt32 count, ThreadedWork* work) {
    dynamic_array<Job> jobs(kMemLabelGeneral);
    if (!jobs.resize_uninitialized(count, kResizeExact)) count = 0;
    sigset_t all;
    sigset_t before;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &before); // threads begin with the mask of their maker
    UInt32 started = 0;
    for (; started < count; ++started) {
        jobs[started] = {work, started, {}};
        if (pthread_create(&jobs[started].thread, nullptr, RunJob, &jobs[started]) != 0) break;
    }
    pthread_sigmask(SIG_SETMASK, &before, nullptr);
    if (started == 0) return work->WorkAlone();
    work->Watch(started);
    for (UInt32 number = 0; number < started; ++number)
        pthread_join(jobs[number].thread, nullptr);
}

void WorkerCount::AddEnded() {
    std::lock_guard lock(m_Lock);
    ++m_Ended;
    m_HasEnded.notify_one();
}
