#include "Runtime/Threads/ReadWriteLock.h"

#include "Runtime/Utilities/LogAssert.h"

#include <sched.h>

using namespace ZarvoClassic;
using ReadWriteLockWord::Transition;

namespace {

constexpr const char* kSourceFile = "Runtime/Threads/ReadWriteLock";

// Makes the transition that step gives from the word's current value. order is that of the exchange.
Transition Make(std::atomic<UInt64>& word, Transition (*step)(UInt64), std::memory_order order) {
    UInt64 before = word.load(std::memory_order_relaxed);
    for (;;) {
        const Transition transition = step(before);
        if (transition.verdict == ReadWriteLockWord::kFull) {
            sched_yield();
            before = word.load(std::memory_order_relaxed);
            continue;
        }
        if (transition.verdict == ReadWriteLockWord::kUnderflow) return transition;
        if (word.compare_exchange_weak(before, transition.word, order, std::memory_order_relaxed)) return transition;
    }
}

} // namespace

ReadWriteLock::ReadWriteLock() : m_Word(0) {
    Footing_Semaphore_CreateInplace(&m_ReadersSemaphore);
    Footing_Semaphore_CreateInplace(&m_WritersSemaphore);
}

ReadWriteLock::~ReadWriteLock() {
    Footing_Semaphore_FreeInplace(&m_WritersSemaphore);
    Footing_Semaphore_FreeInplace(&m_ReadersSemaphore);
}

// Acquire in the two that enter: those who left come before us. One that waits is ordered by its semaphore.

void ReadWriteLock::AcquireShared() {
    if (Make(m_Word, ReadWriteLockWord::AcquireShared, std::memory_order_acquire).verdict == ReadWriteLockWord::kWait)
        Footing_Semaphore_Acquire(&m_ReadersSemaphore);
}

void ReadWriteLock::AcquireExclusive() {
    if (Make(m_Word, ReadWriteLockWord::AcquireExclusive, std::memory_order_acquire).verdict ==
        ReadWriteLockWord::kWait)
        Footing_Semaphore_Acquire(&m_WritersSemaphore);
}

// Release in the two that leave: we come before those who enter. A reader's is acquire as well: the last one wakes a
// writer, which is ordered after the other readers by nothing but that signal. A writer came after all of them itself.

void ReadWriteLock::ReleaseShared() {
    const Transition left = Make(m_Word, ReadWriteLockWord::ReleaseShared, std::memory_order_acq_rel);
    if (left.verdict == ReadWriteLockWord::kUnderflow)
        AssertImplementation(0, kSourceFile, __LINE__, -1, "ReadWriteLock::readers underflow!");
    else if (left.wokenWriters != 0)
        Footing_Semaphore_Release(&m_WritersSemaphore, left.wokenWriters);
}

void ReadWriteLock::ReleaseExclusive() {
    const Transition left = Make(m_Word, ReadWriteLockWord::ReleaseExclusive, std::memory_order_release);
    if (left.verdict == ReadWriteLockWord::kUnderflow)
        AssertImplementation(0, kSourceFile, __LINE__, -1, "ReadWriteLock::writers underflow!");
    else if (left.wokenReaders != 0)
        Footing_Semaphore_Release(&m_ReadersSemaphore, left.wokenReaders);
    else if (left.wokenWriters != 0)
        Footing_Semaphore_Release(&m_WritersSemaphore, left.wokenWriters);
}
