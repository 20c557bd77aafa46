// Runs that write nothing: zarvo_test and zarvo_visit.
#pragma once

#include "Library/ArchiveRun.h"

// Decodes every block, and tells what can't be read.
class TestRun final : public ArchiveRun {
public:
    using ArchiveRun::ArchiveRun;

    zarvo_code Test(const zarvo_test_options& what, zarvo_summary* summary, Failure* failure);

private:
    struct Damage {
        UInt32 blockIndex;
        UInt32 failure; // in m_Failures
        UInt64 begin;   // in the data: [begin, end) can't be read
        UInt64 end;
    };

    UInt64 ReadableBytes(const Node& node) const;

    void TakeFile(UInt32, UInt32, const UInt8*, UInt64, const Failure*) override {}
    SharedFile* ShareFile(UInt32, UInt64) override { return nullptr; }
    void TakePart(UInt32, SharedFile*, UInt64, const UInt8*, UInt64) override {}
    void EndFile(UInt32, SharedFile*) override {}
    void DropFile(SharedFile*) override {}
    void TakeOther(UInt32, UInt32) override {}
    void TakeDamage(UInt32 blockIndex, UInt64 begin, UInt64 end, const Failure& damage) override;
    void TakeData(UInt64 begin, UInt64 end) override;
    void Report(const zarvo_report&) override {}

    bool ListEnds();

    dynamic_array<UInt64> m_Ends{kMemLabelFileSystem}; // where entries end in the data, sorted

    // Under the lock until the run has ended.
    Mutex m_DamageLock;
    dynamic_array<Damage> m_Damages{kMemLabelFileSystem}; // after the run, sorted by begin
    FailureList m_Failures;
};

// Hands the bytes of files to the caller, in order.
class VisitRun final : public ArchiveRun {
public:
    VisitRun(zarvo_archive* archive, const zarvo_run_options& options, const zarvo_visit_options& what)
        : ArchiveRun(archive, options), m_What(what), m_Plan(archive->Nodes(), what.strip) {}

    zarvo_code Visit(Failure* failure);

private:
    bool IsSettledBefore(UInt32 entry) override;
    bool HasNameForDisk(UInt32 entry) const;
    void HandOver(UInt32 entry, UInt64 offset, const UInt8* bytes, UInt64 size);

    void TakeFile(UInt32 worker, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) override;
    SharedFile* ShareFile(UInt32 entry, UInt64 size) override;
    void TakePart(UInt32 worker, SharedFile* file, UInt64 offset, const UInt8* bytes, UInt64 size) override;
    void EndFile(UInt32 worker, SharedFile* file) override;
    void DropFile(SharedFile* file) override;
    void TakeOther(UInt32, UInt32) override {} // there is none
    void TakeDamage(UInt32, UInt64, UInt64, const Failure&) override {}
    void Report(const zarvo_report& report) override;

    const zarvo_visit_options m_What;
    OutputPlan m_Plan;
};
