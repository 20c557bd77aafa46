// The system's recursive lock: an atomic counter where nobody waits, a system semaphore where somebody does. While
// threads are counted as waiting, unlocking never frees the lock but hands it to one of them: to the first that takes
// the semaphore's signal, which need not be the one that has waited longest.
//
//   Mutex m_CacheLock;
//   dynamic_array<CachedBlock*> m_CachedBlocks VARNEX_GUARDED_BY(m_CacheLock);
//   ...
//   Mutex::AutoLock lock(m_CacheLock);
//
// A thread unlocks as often as it has locked. Only the owner may unlock; what another thread's Unlock does is not
// defined. States by operations (n > 0 threads wait; spinning threads are not counted):
//
//                        Lock by owner   Lock by another thread             last Unlock
//   counter 1, free      (no owner)      counter 0, owns it                 no effect on the counter
//   counter 0, held      recursion + 1   spins, then counter -1 and waits   counter 1, free
//   counter -n, held     recursion + 1   spins, then one less and waits     one more, one of them owns it
//
// While recursion is not 0, Unlock only takes 1 from it.
#pragma once

#include "Footing/Semaphore.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"
#include "Runtime/Threads/ThreadAnnotations.h"

#include <atomic>

class VARNEX_CAPABILITY("mutex") Mutex : private NonCopyable {
public:
    class AutoLock;

    Mutex();
    ~Mutex(); // nobody holds it or waits for it

    void Lock() VARNEX_ACQUIRE();
    void Unlock() VARNEX_RELEASE();

private:
    static constexpr SInt32 kFree = 1;
    static constexpr SInt32 kHeld = 0;
    static constexpr int kSpinRounds = 200;

    bool TryTake(SInt32* found);
    bool TakeWithoutWaiting();

    ZarvoClassic::Footing_SystemSemaphore_Handle m_Semaphore;
    ZarvoClassic::Footing_SystemSemaphore_Storage m_SemaphoreStorage;
    std::atomic<SInt32> m_Counter;
    // Relaxed throughout: only the thread itself ever stores its own id, so it reads its id exactly when it is the
    // owner; any other value, however old, means "not me".
    std::atomic<UInt64> m_Owner;
    UInt32 m_Recursion; // the owner's; how often it has locked beyond the first time
};

class VARNEX_SCOPED_CAPABILITY Mutex::AutoLock : private NonCopyable {
public:
    explicit AutoLock(Mutex& mutex) VARNEX_ACQUIRE(mutex) : m_Mutex(mutex) { m_Mutex.Lock(); }
    ~AutoLock() VARNEX_RELEASE() { m_Mutex.Unlock(); }

private:
    Mutex& m_Mutex;
};
