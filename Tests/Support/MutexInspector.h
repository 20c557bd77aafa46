// The counter and the owner of a Mutex, for tests that wait until a number of threads wait for it.
//
//   while (MutexInspector::Counter(mutex) != -3) std::this_thread::yield();   // three threads wait
//
// Any thread. Access rules do not apply to the arguments of an explicit instantiation, so the private members can be
// named there, and the class needs no friend.
#pragma once

#include "Runtime/Threads/Mutex.h"
#include "Runtime/Threads/Thread.h"

namespace {

SInt32 LoadMutexCounter(const Mutex& mutex);
UInt64 LoadMutexOwner(const Mutex& mutex);

template <auto kCounter, auto kOwner>
struct MutexMembers {
    friend SInt32 LoadMutexCounter(const Mutex& mutex) { return (mutex.*kCounter).load(); }
    friend UInt64 LoadMutexOwner(const Mutex& mutex) { return (mutex.*kOwner).load(); }
};
template struct MutexMembers<&Mutex::m_Counter, &Mutex::m_Owner>;

struct MutexInspector {
    // 1 free, 0 held, below 0 held with so many threads waiting.
    static SInt32 Counter(const Mutex& mutex) { return LoadMutexCounter(mutex); }

    static bool IsLockedByCurrentThread(const Mutex& mutex) {
        return LoadMutexOwner(mutex) == PlatformThread::GetCurrentThreadID();
    }
};

} // namespace
