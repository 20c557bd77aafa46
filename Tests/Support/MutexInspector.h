// What a Mutex does not tell: its counter and its owner. Tests wait with it until so many threads wait for a lock.
//
//   while (MutexInspector::Counter(mutex) != -3) std::this_thread::yield();   // three threads wait
//
// Any thread. Private members are reached through the arguments of an explicit instantiation, which access rules leave
// out, so that the class itself knows nothing of its tests.
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
