// Every interleaving of a few threads in the archive reader's block cache: claim, share, fail, re-target, free. A step
// is one atomic operation on a record, or what the cache lock makes one. Which of the records that would do is taken is
// left open, so every order of stamps and windows is covered.
#include "Tests/Models/Explorer.h"

#include <gtest/gtest.h>
#include <vector>

namespace {

// Where a thread stands: in AcquireCachedBlock, in AcquireAndPrefillUnusedBlock, in the use and its end, in EmptyCache.
enum AcquirePc { kStart, kScan, kCheckWindow, kRegister, kPoll, kLook };
enum PrefillPc { kStartVictims = kLook + 1, kScanVictims, kJudge, kTake, kFill, kShare };
enum UsePc { kCopy = kShare + 1, kInvalidate, kLeave, kUnclaim };
enum EmptyPc { kScanAll = kUnclaim + 1, kFree, kCachePcs };

constexpr int kNone = -1, kEverything = -2; // instead of a block: none; the request to empty the cache

struct Request {
    int block;
    bool isStream = false;
    int window = 0;       // of a stream: the one that holds what is asked for
    bool canFail = false; // any fill may
};

struct CacheRecord {
    int block = kNone, readers = 0, written = 1, window = 0;
    int holds = kNone; // whose data the buffer has in truth
    bool isFreed = false;
    auto operator<=>(const CacheRecord&) const = default;
};
struct CacheShared {
    int lockedBy = kNone;
    size_t count = 0; // freed records keep their place
    std::array<CacheRecord, 6> records;
    auto operator<=>(const CacheShared&) const = default;
};
struct CacheThread {
    int pc = kStart;
    size_t request = 0, scan = 0, record = 0;
    int candidate = kNone;
    bool hasFailed = false;
    auto operator<=>(const CacheThread&) const = default;
};

constexpr size_t kThreads = 3;
using Program = std::array<std::vector<Request>, kThreads>;

struct CacheModel : Explorable<CacheShared, CacheThread, kThreads> {
    const Program* program = nullptr;
    const char* fault = nullptr;

    bool Step(size_t self, int choice) {
        CacheThread& me = threads[self];
        if (me.request == (*program)[self].size()) return false;
        const Request& request = (*program)[self][me.request];
        const bool holdsRecord = (me.pc >= kPoll && me.pc <= kLook) || (me.pc >= kFill && me.pc <= kUnclaim);
        CacheRecord& record = shared.records[holdsRecord ? me.record : std::min(me.scan, shared.count)];
        const bool movesOn = me.pc == kCopy && record.window != request.window;
        const bool mayFail = request.canFail && (me.pc == kFill || movesOn);
        if (choice != 0 && me.pc != kJudge && me.pc != kCheckWindow && !mayFail) return false;
        const bool needsLock = me.pc == kStart || me.pc == kLook || me.pc == kStartVictims || me.pc == kInvalidate;
        if (needsLock && shared.lockedBy != kNone) return false;
        Require(!holdsRecord || !record.isFreed, "a freed record is used");
        const bool isAtEnd = me.scan == shared.count;
        const bool isListed = !isAtEnd && !record.isFreed;

        switch (me.pc) {
        case kStart: return Lock(me, self, request.block == kEverything ? int{kScanAll} : int{kScan});
        case kScan:
            if (isAtEnd) return Unlock(me, kStartVictims);
            if (!isListed || record.block != request.block) return ScanOn(me, kScan);
            if (!request.isStream) return Go(me, kRegister);
            return Claim(record) ? Go(me, kCheckWindow) : ScanOn(me, kScan);
        case kCheckWindow: // choice 1: another one's window is nearer
            if (request.window < record.window || choice == 1) {
                record.written = 0;
                return ScanOn(me, kScan);
            }
            Require(record.readers++ == 0, "a claimed stream has a reader");
            me.record = me.scan;
            return Unlock(me, kCopy);
        case kRegister:
            ++record.readers;
            me.record = me.scan;
            return Unlock(me, kPoll);
        case kPoll: return record.written == 0 && Go(me, kLook);
        case kLook:
            if (record.block != kNone) return Go(me, kCopy);
            --record.readers;
            return Go(me, kStartVictims);

        case kStartVictims: return Lock(me, self, kScanVictims);
        case kScanVictims:
            if (isAtEnd) return Go(me, kTake);
            return isListed && Claim(record) ? Go(me, kJudge) : ScanOn(me, kScanVictims);
        case kJudge: // choice 1: it is older than the candidate
            if (record.readers != 0 || (me.candidate != kNone && choice == 0)) {
                record.written = 0;
            } else {
                if (me.candidate != kNone) shared.records[static_cast<size_t>(me.candidate)].written = 0;
                me.candidate = static_cast<int>(me.scan);
            }
            return ScanOn(me, kScanVictims);
        case kTake: {
            me.record = me.candidate != kNone ? static_cast<size_t>(me.candidate) : shared.count++;
            CacheRecord& taken = shared.records[me.record];
            Require(taken.written == 1 && taken.readers == 0, "a record in use is taken");
            taken = {.block = request.block, .readers = 1};
            return Unlock(me, kFill);
        }
        case kFill:
            if (choice == 1) return Fail(me);
            record.holds = request.block;
            return Go(me, request.isStream ? int{kCopy} : int{kShare});
        case kShare: record.written = 0; return Go(me, kCopy);

        case kCopy:
            Require(record.holds == request.block, "data of another block is copied");
            if (choice == 1) {
                record.holds = kNone; // what the decoder makes from now on is not the block's
                return Fail(me);
            }
            if (!movesOn) return Go(me, kLeave);
            Require(record.written == 1 && ++record.window <= request.window, "a stream has two owners");
            return true;
        case kInvalidate: record.block = record.holds = kNone; return Go(me, kLeave);
        case kLeave: --record.readers; return request.isStream || me.hasFailed ? Go(me, kUnclaim) : Finish(me);
        case kUnclaim: record.written = 0; return Finish(me);

        case kScanAll:
            if (isAtEnd) return Unlock(me, kStart) && Finish(me);
            return isListed && Claim(record) ? Go(me, kFree) : ScanOn(me, kScanAll);
        case kFree:
            if (record.readers == 0) record.isFreed = true;
            record.written = 0;
            return ScanOn(me, kScanAll);
        }
        return false;
    }

    const char* Fault() const {
        size_t inUse = 0;
        for (size_t index = 0; index < shared.count; ++index)
            inUse += !shared.records[index].isFreed;
        return inUse > kThreads ? "more records than users" : fault;
    }

    const char* FaultAtEnd() const {
        for (size_t self = 0; self < kThreads; ++self)
            if (threads[self].request != (*program)[self].size()) return "a thread waits for ever";
        for (size_t index = 0; index < shared.count; ++index)
            if (shared.records[index].readers != 0 || shared.records[index].written != 0) return "not idle";
        return nullptr;
    }

private:
    void Require(bool isTrue, const char* otherwise) { fault = isTrue ? fault : otherwise; }
    static bool Claim(CacheRecord& record) { return std::exchange(record.written, 1) == 0; }
    static bool Go(CacheThread& me, int pc) {
        me.pc = pc;
        return true;
    }
    static bool ScanOn(CacheThread& me, int pc) {
        ++me.scan;
        return Go(me, pc);
    }
    static bool Fail(CacheThread& me) {
        me.hasFailed = true;
        return Go(me, kInvalidate);
    }
    bool Lock(CacheThread& me, size_t self, int pc) {
        shared.lockedBy = static_cast<int>(self);
        me.scan = 0;
        return Go(me, pc);
    }
    bool Unlock(CacheThread& me, int pc) {
        shared.lockedBy = kNone;
        return Go(me, pc);
    }
    static bool Finish(CacheThread& me) {
        me = {.request = me.request + 1};
        return true;
    }
};

const Request kA{0}, kB{1}, kFailing{0, false, 0, true}, kEmpty{kEverything};
const Request kStart3{3, true}, kLater3{3, true, 2}, kFailing3{3, true, 1, true};
const Program kPrograms[] = {
    {{{kA, kStart3}, {kFailing, kA}, {kEmpty, kEmpty}}},
    {{{kFailing3}, {kFailing3, kA}, {kStart3}}},
    {{{kA, kB}, {kB}, {kA, {2}}}},
    {{{kFailing}, {kFailing, kB}, {kFailing}}},
    {{{kStart3, kLater3}, {kStart3}, {kLater3, kA}}},
};

std::string ExploreCache(const Program& program, int brokenPc = -1) {
    CacheModel model;
    model.program = &program;
    return Explore(model, brokenPc);
}

TEST(CacheRecordModel, NoInterleavingGoesWrong) {
    for (const Program& program : kPrograms)
        EXPECT_EQ("", ExploreCache(program));
}

TEST(CacheRecordModel, EveryBrokenStepIsFound) {
    for (int pc = 0; pc < kCachePcs; ++pc) {
        if (pc == kPoll) continue; // it changes nothing
        std::string found;
        for (const Program& program : kPrograms)
            if (found.empty()) found = ExploreCache(program, pc);
        EXPECT_NE("", found) << "step " << pc;
    }
}

} // namespace
