// Many readers or one writer. Not recursive on either side: a writer that comes between two shared locks of one thread
// would wait for the first while the second waits for the writer. Writers that are counted go before readers that come
// later; when a writer leaves, all readers that wait go before the next writer; so neither side starves.
//
//   ReadWriteLock* handlersLock;
//   ReadWriteLock::AutoShared lock(*handlersLock);
//
// Any thread. States by operations (a readers active, q readers waiting, w writers counted, of which one holds the lock
// when a is 0 and w is not):
//
//                      AcquireShared     ReleaseShared           AcquireExclusive   ReleaseExclusive
//   w 0, a 0           a + 1             reports underflow       w + 1              reports underflow
//   w 0, a > 0         a + 1             a - 1                   w + 1, waits       reports underflow
//   w > 0, a > 0       q + 1, waits      a - 1; the last wakes   w + 1, waits       reports underflow
//                                        one writer
//   w > 0, a 0         q + 1, waits      reports underflow       w + 1, waits       w - 1; if q > 0: a = q, q = 0 and
//                                                                                   these are woken; else a writer is
//
// A misuse that is reported leaves the word as it is. A field that is full makes its acquirer try again until there is
// room.
#pragma once

#include "Footing/Semaphore.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"
#include "Runtime/Threads/ThreadAnnotations.h"

#include <atomic>

// The lock's word and its transitions, apart from the threads that make them:
//   bits 0-20 active readers | 21-41 waiting readers | 42-63 writers
namespace ReadWriteLockWord {

constexpr int kActiveBits = 21, kWaitingBits = 21, kWriterBits = 22;
static_assert(kActiveBits + kWaitingBits + kWriterBits == 64);

constexpr UInt64 kOneActive = 1;
constexpr UInt64 kOneWaiting = kOneActive << kActiveBits;
constexpr UInt64 kOneWriter = kOneWaiting << kWaitingBits;
constexpr UInt64 kActiveMask = kOneWaiting - 1;
constexpr UInt64 kWaitingMask = kOneWriter - kOneWaiting;
constexpr UInt64 kWriterMask = ~(kActiveMask | kWaitingMask);

constexpr UInt32 Active(UInt64 word) { return static_cast<UInt32>(word & kActiveMask); }
constexpr UInt32 Waiting(UInt64 word) { return static_cast<UInt32>((word & kWaitingMask) / kOneWaiting); }
constexpr UInt32 Writers(UInt64 word) { return static_cast<UInt32>(word / kOneWriter); }

enum Verdict : UInt8 {
    kGo,        // done: the lock is held, or given back
    kWait,      // counted: wait on this side's semaphore, whose signal hands the lock over
    kFull,      // no room in the field: nothing changed, try again
    kUnderflow, // not held: nothing changed
};

struct Transition {
    Verdict verdict;
    UInt64 word;             // after
    UInt32 wokenReaders = 0; // signals to the readers' semaphore
    UInt32 wokenWriters = 0; // signals to the writers' semaphore
};

constexpr Transition AcquireShared(UInt64 word) {
    if (Writers(word) != 0) {
        if ((word & kWaitingMask) == kWaitingMask) return {kFull, word};
        return {kWait, word + kOneWaiting};
    }
    if ((word & kActiveMask) == kActiveMask) return {kFull, word};
    return {kGo, word + kOneActive};
}

constexpr Transition ReleaseShared(UInt64 word) {
    if (Active(word) < 1) return {kUnderflow, word};
    const bool isLastBeforeWriter = Active(word) == 1 && Writers(word) != 0;
    return {kGo, word - kOneActive, 0, isLastBeforeWriter ? 1u : 0u};
}

constexpr Transition AcquireExclusive(UInt64 word) {
    if ((word & kWriterMask) == kWriterMask) return {kFull, word};
    const bool isFree = Active(word) == 0 && Writers(word) == 0;
    return {isFree ? kGo : kWait, word + kOneWriter};
}

constexpr Transition ReleaseExclusive(UInt64 word) {
    if (Writers(word) < 1 || Active(word) != 0) return {kUnderflow, word};
    const UInt64 left = word - kOneWriter;
    const UInt32 waiting = Waiting(word);
    // The readers enter by our hand, before they wake: whoever comes next finds them active.
    if (waiting != 0) return {kGo, (left & kWriterMask) + waiting * kOneActive, waiting, 0};
    return {kGo, left, 0, Writers(left) != 0 ? 1u : 0u};
}

} // namespace ReadWriteLockWord

class VARNEX_CAPABILITY("read-write lock") ReadWriteLock : private NonCopyable {
public:
    class AutoShared;
    class AutoExclusive;

    ReadWriteLock();
    ~ReadWriteLock(); // nobody holds it or waits for it

    void AcquireShared() VARNEX_ACQUIRE_SHARED();
    void ReleaseShared() VARNEX_RELEASE_SHARED();
    void AcquireExclusive() VARNEX_ACQUIRE();
    void ReleaseExclusive() VARNEX_RELEASE();

private:
    std::atomic<UInt64> m_Word;
    ZarvoClassic::Footing_Semaphore m_ReadersSemaphore;
    ZarvoClassic::Footing_Semaphore m_WritersSemaphore;
};

class VARNEX_SCOPED_CAPABILITY ReadWriteLock::AutoShared : private NonCopyable {
public:
    explicit AutoShared(ReadWriteLock& lock) VARNEX_ACQUIRE_SHARED(lock) : m_Lock(lock) { m_Lock.AcquireShared(); }
    ~AutoShared() VARNEX_RELEASE() { m_Lock.ReleaseShared(); }

private:
    ReadWriteLock& m_Lock;
};

class VARNEX_SCOPED_CAPABILITY ReadWriteLock::AutoExclusive : private NonCopyable {
public:
    explicit AutoExclusive(ReadWriteLock& lock) VARNEX_ACQUIRE(lock) : m_Lock(lock) { m_Lock.AcquireExclusive(); }
    ~AutoExclusive() VARNEX_RELEASE() { m_Lock.ReleaseExclusive(); }

private:
    ReadWriteLock& m_Lock;
};
