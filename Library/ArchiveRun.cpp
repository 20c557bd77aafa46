#include "Library/ArchiveRun.h"

#include "Library/Resources.h"

#include <algorithm>
#include <cstring>

namespace {

// How often results are told. Callers may hold something for each file until then, and small files are many.
constexpr auto kReportInterval = std::chrono::milliseconds(10);

// What is free is another number each time, so it is looked at once.
zarvo_run_options WithMemory(zarvo_run_options options) {
    options.memory = MemoryBudget(options.memory);
    return options;
}

UInt32 CountThreads(zarvo_archive* archive, const zarvo_run_options& options, UInt64 maxBlockBytes) {
    UInt64 largest = 1;
    for (UInt32 index = 0; index < archive->Blocks().BlockCount(); ++index) {
        const BlockDecoder::Block block = archive->Blocks().GetBlock(index);
        const bool isHeldWhole = !BlockDecoder::IsStoredAsIs(block) && block.size <= maxBlockBytes &&
                                 !BlockDecoder::IsReadInPieces(block, maxBlockBytes);
        if (isHeldWhole) largest = std::max(largest, archive->Blocks().BytesToHold(block));
    }
    return ChooseThreadCount(options.threads, options.memory / (2 * largest));
}

} // namespace

ArchiveRun::ArchiveRun(zarvo_archive* archive, const zarvo_run_options& options)
    : WatchedRun(kReportInterval),
      m_Archive(archive),
      m_Options(WithMemory(options)),
      // A block takes its decoded bytes, and its stored ones, which are no more.
      m_MaxBlockBytes(std::min<UInt64>(archive->MaxBlockBytes(), m_Options.memory / 2)),
      m_ThreadCount(CountThreads(archive, m_Options, m_MaxBlockBytes)),
      m_Data(&archive->Blocks(), archive->Nodes(), m_MaxBlockBytes, m_ThreadCount, this) {}

zarvo_code ArchiveRun::Plan(OutputPlan* plan, UInt64* bytes, Failure* failure) {
    if (const zarvo_code code = plan->Build(m_Options.wanted, m_Options.excluded, failure); code != ZARVO_OK)
        return code;
    if (!m_States.resize_uninitialized(Nodes().size(), kResizeExact)) return failure->SetMemory();
    if (!m_States.empty()) memset(m_States.data(), kNoResult, m_States.size());
    *bytes = 0;
    for (UInt32 entry = 0; entry < Nodes().size(); ++entry) {
        const OutputPlan::Verdict verdict = plan->VerdictOf(entry);
        if (verdict == OutputPlan::kUnwanted || verdict == OutputPlan::kReplaced) continue;
        SetState(entry, kPending);
        if (__builtin_add_overflow(*bytes, zarvo_archive::SizeOf(Nodes()[entry]), bytes)) *bytes = ~UInt64{0};
    }
    return ZARVO_OK;
}

zarvo_code ArchiveRun::AddPlanned(const OutputPlan& plan, Failure* failure) {
    if (!m_Data.ReserveFiles(static_cast<size_t>(m_Expected))) return failure->SetMemory();
    for (UInt32 entry = 0; entry < Nodes().size(); ++entry) {
        if (GetState(entry) != kPending) continue;
        const OutputPlan::Verdict verdict = plan.VerdictOf(entry);
        const Node& node = Nodes()[entry];
        if (verdict == OutputPlan::kRefused || verdict == OutputPlan::kClash) {
            Failure refusal;
            plan.SetRefusal(entry, &refusal);
            SetFailed(entry, refusal);
        } else if (IsSettledBefore(entry)) {
            continue;
        } else if (verdict == OutputPlan::kFolder || node.size == 0 || IsOutsideData(node)) {
            if (!m_Data.AddOther(entry)) return failure->SetMemory();
        } else {
            m_Data.AddFile(entry);
        }
    }
    return ZARVO_OK;
}

void ArchiveRun::SetState(size_t entry, State state) {
    if (state == kPending) ++m_Expected;
    // What belongs to a result comes before it.
    std::atomic_ref<UInt8>(m_States[entry]).store(state, std::memory_order_release);
}

ArchiveRun::State ArchiveRun::GetState(size_t entry) {
    return static_cast<State>(std::atomic_ref<UInt8>(m_States[entry]).load(std::memory_order_acquire));
}

void ArchiveRun::SetDone(size_t entry) {
    SetState(entry, kDone);
    Count(1);
}

void ArchiveRun::SetKept(size_t entry) {
    SetState(entry, kKept);
    Count(1);
}

void ArchiveRun::SetFailed(size_t entry, const Failure& failure, State state) {
    bool isKept = false;
    {
        std::lock_guard lock(m_Lock);
        isKept = (!m_FailureOf.empty() || m_FailureOf.resize_uninitialized(m_States.size(), kResizeExact)) &&
                 m_Failures.Add(failure, &m_FailureOf[entry]);
    }
    if (!isKept) return m_Data.StopWithoutMemory();
    SetState(entry, state);
    Count(1);
}

zarvo_code ArchiveRun::Run(Failure* failure) {
    m_Data.Prepare();
    RunOnThreads(m_ThreadCount, [this](UInt32 number) {
        MessageScope scope(&m_Messages);
        m_Data.Work(number);
    });
    m_Data.DropUnended();
    TellReports(true);
    (void)TellProgress(); // too late to stop anything
    m_Messages.TellAll(m_Archive->Messages());
    if (m_Data.FatalFailure().code == ZARVO_OK) return ZARVO_OK;
    *failure = m_Data.FatalFailure();
    if (failure->code != ZARVO_ERROR_STOPPED)
        m_Summary.failures = m_Expected - m_Summary.files - m_Summary.folders - m_Summary.kept;
    return failure->code;
}

// Tells what there is to tell meanwhile.
void ArchiveRun::Look() {
    TellReports(false);
    if (!m_ProgressClock.IsDue() || TellProgress()) return;
    Failure stopped;
    (void)stopped.SetStopped();
    m_Data.StopFor(stopped);
}

// Tells the results that have no missing one before them.
void ArchiveRun::TellReports(bool areAllWorkersDone) {
    for (; m_Reported < m_States.size(); ++m_Reported) {
        const State state = GetState(m_Reported);
        if (state == kNoResult) continue;
        if (state == kPending) {
            if (!areAllWorkersDone) return;
            continue; // a run that was stopped leaves gaps
        }
        zarvo_report report = {};
        report.struct_size = sizeof(report);
        report.index = m_Reported;
        report.text = "";
        const Node& node = Nodes()[m_Reported];
        Failure failure;
        if (state == kFailed || state == kBroken) {
            std::lock_guard lock(m_Lock);
            failure = m_Failures.Get(m_FailureOf[m_Reported]);
            report.outcome = state == kBroken ? ZARVO_OUTCOME_BROKEN : ZARVO_OUTCOME_FAILED;
            report.code = failure.code;
            report.system_code = failure.systemCode;
            report.text = failure.text;
            ++m_Summary.failures;
        } else if (state == kKept) {
            report.outcome = ZARVO_OUTCOME_KEPT;
            ++m_Summary.kept;
        } else {
            report.outcome = ZARVO_OUTCOME_DONE;
            ++(zarvo_archive::IsFolder(node) ? m_Summary.folders : m_Summary.files);
            m_Summary.bytes += zarvo_archive::SizeOf(node);
        }
        Report(report);
    }
}

bool ArchiveRun::TellProgress() {
    return ::TellProgress(m_Options, {.bytes = m_Data.BytesTaken(),
                                      .bytesTotal = m_Data.BytesTotal(),
                                      .files = m_Results.load(std::memory_order_relaxed), // nothing else goes by it
                                      .filesTotal = m_Expected});
}
