// Threads that live inside one call, with all signals blocked, so that the program's handlers run on its own threads.
#pragma once

#include "Runtime/Core/Types.h"

// How many threads the process may use at once, by the processors that it may run on.
UInt32 ProcessorCount();

// Work that is done by several threads while the calling one looks on.
class ThreadedWork {
public:
    virtual ~ThreadedWork() = default;

    // In each thread, which have the numbers from 0 on.
    virtual void Work(UInt32 number) = 0;

    // In the calling thread, until count threads have worked.
    virtual void Watch(UInt32 count) = 0;
};

// Returns when all has ended. Fewer threads than count work where the system refuses more; where it refuses all, the
// calling one works, and watches then.
void RunOnThreads(UInt32 count, ThreadedWork* work);
