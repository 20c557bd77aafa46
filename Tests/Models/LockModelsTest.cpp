// Every interleaving of a few threads in Mutex, and in ReadWriteLock with its counting semaphores.
#include "Runtime/Threads/ReadWriteLock.h"
#include "Tests/Models/Explorer.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

namespace {

enum MutexPc { kNext, kLock, kTry, kSpin, kCountSelf, kWait, kOwn, kUnlock, kClear, kGive, kSignal, kMutexPcs };

struct MutexShared {
    int counter = 1, signals = 0, owner = 0, recursion = 0;
    auto operator<=>(const MutexShared&) const = default;
};
struct MutexThread {
    int pc = kNext, calls = 0; // begun so far
    bool isHolding = false;
    auto operator<=>(const MutexThread&) const = default;
};

struct MutexModel : Explorable<MutexShared, MutexThread, 3> {
    static constexpr char kCalls[] = "LLUULU"; // what each thread calls: Lock and Unlock

    bool Step(size_t self, int choice) {
        MutexThread& me = threads[self];
        const int id = static_cast<int>(self) + 1;
        if (choice != 0 && me.pc != kSpin) return false;
        switch (me.pc) {
        case kNext:
            if (kCalls[me.calls] == '\0') return false;
            me.pc = kCalls[me.calls++] == 'L' ? kLock : kUnlock;
            break;
        case kLock:
            me.pc = shared.owner == id ? kNext : kTry;
            shared.recursion += shared.owner == id;
            break;
        case kTry:
            me.pc = shared.counter == 1 ? kOwn : kSpin;
            if (shared.counter == 1) shared.counter = 0;
            break;
        case kSpin: me.pc = choice == 0 ? kTry : kCountSelf; break;
        case kCountSelf: me.pc = shared.counter-- == 1 ? kOwn : kWait; break;
        case kWait:
            if (shared.signals == 0) return false;
            --shared.signals;
            me.pc = kOwn;
            break;
        case kOwn:
            shared.owner = id;
            me.pc = kNext;
            break;
        case kUnlock:
            me.pc = shared.recursion != 0 ? kNext : kClear;
            shared.recursion -= shared.recursion != 0;
            break;
        case kClear:
            shared.owner = 0;
            me.pc = kGive;
            break;
        case kGive:
            me.pc = shared.counter < 0 ? kSignal : kNext;
            shared.counter += shared.counter != 1;
            break;
        case kSignal:
            ++shared.signals;
            me.pc = kNext;
            break;
        }
        if (me.pc == kOwn) me.isHolding = true;
        if (me.pc == kGive) me.isHolding = false;
        return true;
    }

    const char* Fault() const {
        return std::count_if(threads.begin(), threads.end(), [](auto& me) { return me.isHolding; }) > 1 ? "two owners"
                                                                                                        : nullptr;
    }

    const char* FaultAtEnd() const {
        for (const MutexThread& thread : threads)
            if (thread.pc != kNext || kCalls[thread.calls] != '\0') return "a thread waits for ever";
        return shared == MutexShared{} ? nullptr : "not free";
    }
};

TEST(MutexModel, NoInterleavingGoesWrongUnlessAStepIsBroken) {
    EXPECT_EQ("", Explore(MutexModel{}));
    for (int pc = 0; pc < kMutexPcs; ++pc) {
        const bool hasEffect = pc != kNext && pc != kSpin;
        EXPECT_EQ(hasEffect, Explore(MutexModel{}, pc) != "") << "step " << pc;
    }
}

enum ReadWritePc { kEnter, kAcquire, kSleep, kLeave, kRelease, kWake, kReadWritePcs };

struct ReadWriteShared {
    UInt64 word = 0;
    std::array<int, 2> counts = {};  // of the readers' and the writers' counting semaphore
    std::array<int, 2> signals = {}; // of the system semaphore in each
    auto operator<=>(const ReadWriteShared&) const = default;
};
struct ReadWriteThread {
    int pc = kEnter, rounds = 0, wokenSide = 0, woken = 0;
    auto operator<=>(const ReadWriteThread&) const = default;
};

// The first two threads are readers, the others writers. The word goes through the lock's own transitions.
struct ReadWriteModel : Explorable<ReadWriteShared, ReadWriteThread, 4> {
    static constexpr int kRounds = 2;
    static size_t SideOf(size_t self) { return self < 2 ? 0 : 1; }

    bool Step(size_t self, int choice) {
        ReadWriteThread& me = threads[self];
        const size_t side = SideOf(self), other = static_cast<size_t>(me.wokenSide);
        if (choice != 0 || me.rounds == kRounds) return false;
        switch (me.pc) {
        case kEnter: {
            const auto enter = side == 0 ? ReadWriteLockWord::AcquireShared : ReadWriteLockWord::AcquireExclusive;
            const ReadWriteLockWord::Transition entered = enter(shared.word);
            shared.word = entered.word;
            me.pc = entered.verdict == ReadWriteLockWord::kGo ? kLeave : kAcquire;
            break;
        }
        case kAcquire: me.pc = shared.counts[side]-- < 1 ? kSleep : kLeave; break;
        case kSleep:
            if (shared.signals[side] == 0) return false;
            --shared.signals[side];
            me.pc = kLeave;
            break;
        case kLeave: {
            const auto leave = side == 0 ? ReadWriteLockWord::ReleaseShared : ReadWriteLockWord::ReleaseExclusive;
            const ReadWriteLockWord::Transition left = leave(shared.word);
            shared.word = left.word;
            me.wokenSide = left.wokenReaders != 0 ? 0 : 1;
            me.woken = static_cast<int>(left.wokenReaders + left.wokenWriters);
            me.pc = kRelease;
            break;
        }
        case kRelease: {
            const int sleeping = std::max(-shared.counts[other], 0);
            shared.counts[other] += me.woken;
            me.woken = std::min(me.woken, sleeping);
            me.pc = kWake;
            break;
        }
        case kWake:
            shared.signals[other] += me.woken;
            me = {.rounds = me.rounds + 1};
            break;
        }
        return true;
    }

    const char* Fault() const {
        int inside[2] = {};
        for (size_t self = 0; self < threads.size(); ++self)
            inside[SideOf(self)] += threads[self].pc == kLeave;
        return inside[1] > 1 || (inside[1] == 1 && inside[0] != 0) ? "a writer is not alone" : nullptr;
    }

    const char* FaultAtEnd() const {
        for (const ReadWriteThread& thread : threads)
            if (thread.rounds != kRounds) return "a thread waits for ever";
        return shared == ReadWriteShared{} ? nullptr : "not free";
    }
};

TEST(ReadWriteLockModel, NoInterleavingGoesWrongUnlessAStepIsBroken) {
    EXPECT_EQ("", Explore(ReadWriteModel{}));
    for (int pc = 0; pc < kReadWritePcs; ++pc)
        EXPECT_NE("", Explore(ReadWriteModel{}, pc)) << "step " << pc;
}

} // namespace
