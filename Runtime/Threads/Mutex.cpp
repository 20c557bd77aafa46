#include "Runtime/Threads/Mutex.h"

#include "Runtime/Threads/Thread.h"

using namespace ZarvoClassic;

Mutex::Mutex() : m_Counter(kFree), m_Owner(0), m_Recursion(0) {
    m_Semaphore = Footing_SystemSemaphore_CreateInplace(&m_SemaphoreStorage);
}

Mutex::~Mutex() { Footing_SystemSemaphore_FreeInplace(m_Semaphore); }

// Free to held. *found gets the counter's value when that fails.
bool Mutex::TryTake(SInt32* found) {
    *found = kFree;
    // Acquire: what the last owner did comes before what we do.
    return m_Counter.compare_exchange_strong(*found, kHeld, std::memory_order_acquire, std::memory_order_relaxed);
}

bool Mutex::TakeWithoutWaiting() {
    // Only read while it does not change: writing would take the line from the owner's cache.
    SInt32 seen = m_Counter.load(std::memory_order_relaxed);
    if (seen == kFree && TryTake(&seen)) return true;
    for (int round = 0; round < kSpinRounds; ++round) {
        const SInt32 now = m_Counter.load(std::memory_order_relaxed);
        if (now == seen) continue;
        seen = now;
        if (now == kFree && TryTake(&seen)) return true;
    }
    return false;
}

void Mutex::Lock() {
    const UInt64 self = PlatformThread::GetCurrentThreadID();
    if (m_Owner.load(std::memory_order_relaxed) == self) {
        ++m_Recursion;
        return;
    }
    // Acquire serves the case that it became free just now; a waiter is ordered after the last owner by the semaphore.
    if (!TakeWithoutWaiting() && m_Counter.fetch_sub(1, std::memory_order_acquire) != kFree)
        Footing_SystemSemaphore_Acquire(m_Semaphore);
    m_Owner.store(self, std::memory_order_relaxed);
}

void Mutex::Unlock() {
    if (m_Recursion != 0) {
        --m_Recursion;
        return;
    }
    // Before the counter moves: from then on the field is the next owner's.
    m_Owner.store(0, std::memory_order_relaxed);

    SInt32 before = m_Counter.load(std::memory_order_relaxed);
    do
        if (before == kFree) return;
    // Release: what we did comes before what the next owner does.
    while (!m_Counter.compare_exchange_weak(before, before + 1, std::memory_order_release, std::memory_order_relaxed));

    if (before < kHeld) Footing_SystemSemaphore_Release(m_Semaphore, 1);
}
