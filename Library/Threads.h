// Threads that end before the call that starts them returns. They block all signals, so that the program's signal
// handlers run on its own threads.
#pragma once

#include "Runtime/Core/Types.h"

// How many threads the process may use at once, by the processors that it may run on.
UInt32 ProcessorCount();

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
