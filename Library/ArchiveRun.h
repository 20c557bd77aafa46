// What extraction, tests and visits have in common: the number of threads, the limit of memory, progress, and reports
// in the archive's order, whatever order the threads work in. Each operation is a subclass, which decides what becomes
// of the bytes.
//
// One thread makes and runs it. The subclass's Sink functions are called by all workers at once.
#pragma once

#include "Library/Archive.h"
#include "Library/DataRun.h"
#include "Library/FailureList.h"
#include "Library/OutputPlan.h"
#include "Library/Threads.h"

class ArchiveRun : protected DataRun::Sink, private WatchedRun {
public:
    // options: as the caller gave them; zeros stand for defaults.
    ArchiveRun(zarvo_archive* archive, const zarvo_run_options& options);
    ~ArchiveRun() override = default;

    // Runs what has been added. Returns the failure that ended the run, or ZARVO_OK.
    zarvo_code Run(Failure* failure);

    const zarvo_summary& Summary() const { return m_Summary; }

protected:
    using Node = ArchiveStorageHeader::Node;

    DataRun& Data() { return m_Data; }
    const EntryIndex::Nodes& Nodes() const { return m_Archive->Nodes(); }
    zarvo_archive* Archive() const { return m_Archive; }
    const zarvo_run_options& Options() const { return m_Options; }
    UInt32 ThreadCount() const { return m_ThreadCount; }
    void LimitThreads(UInt32 count) { m_ThreadCount = std::min(m_ThreadCount, count); } // before Run

    // Builds the plan. Every wanted entry that no later one replaces will have a result. *bytes is the sum of the sizes
    // of these entries.
    [[nodiscard]] zarvo_code Plan(OutputPlan* plan, UInt64* bytes, Failure* failure);

    // Adds to the run what the plan says is to be written; entries that it refuses get their results at once. Call it
    // after Plan and before Run.
    [[nodiscard]] zarvo_code AddPlanned(const OutputPlan& plan, Failure* failure);

    // Whether the result of an entry is known, and set, before the run begins. Called by AddPlanned.
    virtual bool IsSettledBefore(UInt32) { return false; }

    // The run will not begin: none of the entries is done.
    void SetAllFailed() { m_Summary.failures = m_Expected; }

    // How many entries will have a result, and have one, for progress alone.
    void Expect(UInt64 count) { m_Expected += count; }
    void Count(UInt64 count) { m_Results.fetch_add(count, std::memory_order_relaxed); }

    // Set the result of an entry, once. Any thread.
    void SetDone(size_t entry);
    void SetKept(size_t entry);
    void SetFailed(size_t entry, const Failure& failure) { SetFailed(entry, failure, kFailed); }
    void SetBroken(size_t entry, const Failure& damage) { SetFailed(entry, damage, kBroken); }

    // Called for each result in the archive's order, on the calling thread.
    virtual void Report(const zarvo_report& report) = 0;

    // Whether an entry starts at or past the end of the archive's data, so that none of its bytes can be read.
    bool IsOutsideData(const Node& node) const { return node.offset >= m_Archive->Info().data_size; }

private:
    enum State : UInt8 { kNoResult, kPending, kDone, kKept, kFailed, kBroken };

    void BetweenFiles() final { LookIfAlone(); }
    void Look() override;
    void TellReports(bool areAllWorkersDone);
    [[nodiscard]] bool TellProgress(); // false: to be stopped
    void SetState(size_t entry, State state);
    void SetFailed(size_t entry, const Failure& failure, State state);
    State GetState(size_t entry);

    zarvo_archive* m_Archive;
    const zarvo_run_options m_Options; // memory is never 0
    UInt64 m_MaxBlockBytes;
    UInt32 m_ThreadCount;
    DataRun m_Data;
    MessageQueue m_Messages;
    zarvo_summary m_Summary = ZARVO_SUMMARY_INIT;
    ProgressClock m_ProgressClock{ProgressClock::Clock::now()};

    dynamic_array<UInt8> m_States{kMemLabelFileSystem}; // State; written and read by atomic references
    size_t m_Reported = 0;                              // entries whose results have been told
    UInt64 m_Expected = 0;
    std::atomic<UInt64> m_Results{0};

    std::mutex m_Lock;
    FailureList m_Failures;
    dynamic_array<UInt32> m_FailureOf{kMemLabelFileSystem}; // by entry; empty until there is one
};
