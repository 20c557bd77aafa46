#include "Library/Writer/Creation.h"

#include "Library/Writer/WriteRun.h"

zarvo_code Creation::FindPlace(Failure* failure) {
    const zarvo_code code = m_File.FindPlace(m_Path, failure);
    return code == ZARVO_OK ? m_File.CheckPlace(m_How.force != 0, failure) : code;
}

zarvo_code Creation::AddFolder(FolderEntries* folder, const char* path, Failure* failure) {
    if (folder->Open(path, failure) != ZARVO_OK) {
        TellFailed({"", 0}, true, *failure);
        return failure->code;
    }
    if (const zarvo_code code = FindPlace(failure); code != ZARVO_OK) return code;
    FolderEntries::Findings findings = {.files = &m_Entries, .leftOut = &m_LeftOut};
    const zarvo_code code = folder->List(m_Options, m_File, &findings, failure);
    const bool isOfRun = code == ZARVO_OK || code == ZARVO_ERROR_MEMORY || code == ZARVO_ERROR_STOPPED;
    if (!isOfRun) TellFailed(findings.failed, findings.isFailedFolder, *failure);
    m_Entries.Sort();
    return code;
}

zarvo_code Creation::AddEntries(const EntryList& entries, Failure* failure) {
    if (const zarvo_code code = FindPlace(failure); code != ZARVO_OK) return code;
    if (!m_Entries.CopyFrom(entries)) return failure->SetMemory();
    m_Entries.Sort();
    const size_t clash = m_Entries.FindClash();
    if (clash == m_Entries.size()) return ZARVO_OK;
    (void)failure->Set(ZARVO_ERROR_REFUSED, "another entry has the same path, or needs a folder in its place");
    return FailEntry(clash, *failure);
}

zarvo_code Creation::Write(EntrySource* source, Failure* failure) {
    if (const zarvo_code code = Settle(failure); code != ZARVO_OK) return code;
    const zarvo_code code = m_How.dry_run != 0 ? CheckCanWrite(source, failure) : WriteFile(source, failure);
    if (code != ZARVO_OK) return code;
    TellDone();
    return ZARVO_OK;
}

// Decides what becomes of each entry.
zarvo_code Creation::Settle(Failure* failure) {
    if (!m_Plan.HasFolders() && !LeaveOutFolders()) return failure->SetMemory();
    TellLeftOut();
    size_t failed = 0;
    const zarvo_code code = m_Plan.Place(&m_Entries, &failed, failure);
    return code == ZARVO_OK ? ZARVO_OK : FailEntry(failed, *failure);
}

static core::string_ref FolderAbove(core::string_ref path) {
    const size_t slash = path.rfind('/');
    return path.substr(0, slash == core::string_ref::npos ? 0 : slash);
}

// Lets the source of each folder say whether a file lies below it.
void Creation::MarkFoldersOfFiles() {
    core::string_ref last; // many files in a row are in the same folder
    for (size_t index = 0; index < m_Entries.size(); ++index) {
        core::string_ref folder = FolderAbove(m_Entries.PathOf(index));
        if (EntryList::IsFolder(m_Entries[index]) || folder == last) continue;
        last = folder;
        for (; !folder.empty(); folder = FolderAbove(folder)) {
            const size_t found = m_Entries.Find(folder);
            if (found != m_Entries.size()) m_Entries[found].source = 1;
        }
    }
}

// Folders come back with the files in them when those are extracted; the others are lost. False when memory is refused.
bool Creation::LeaveOutFolders() {
    MarkFoldersOfFiles();
    bool isTold = true;
    m_Entries.Filter([&](const EntryList::Entry& entry) {
        if (!EntryList::IsFolder(entry)) return true;
        const bool isLost = entry.source == 0;
        isTold = isTold && (!isLost || m_LeftOut.Add(m_Entries.PathOf(entry), EntryList::kFolder, 0, kNoFolders));
        return false;
    });
    return isTold;
}

void Creation::TellLeftOut() {
    m_LeftOut.Sort();
    for (size_t index = 0; index < m_LeftOut.size(); ++index) {
        Failure why;
        switch (m_LeftOut[index].source) {
        case FolderEntries::kLink: (void)why.Set(ZARVO_ERROR_REFUSED, "left out: a link"); break;
        case FolderEntries::kPipe: (void)why.Set(ZARVO_ERROR_REFUSED, "left out: a pipe"); break;
        case FolderEntries::kSocket: (void)why.Set(ZARVO_ERROR_REFUSED, "left out: a socket"); break;
        case FolderEntries::kDevice: (void)why.Set(ZARVO_ERROR_REFUSED, "left out: a device"); break;
        default: (void)why.Set(ZARVO_ERROR_REFUSED, "left out: the layout has no folders"); break;
        }
        ++m_Summary.failures;
        Tell(m_LeftOut.PathOf(index), EntryList::IsFolder(m_LeftOut[index]), ZARVO_OUTCOME_LEFT_OUT, why);
    }
}

// Finds the failures that WriteFile would meet in the order in which it would meet them.
zarvo_code Creation::CheckCanWrite(EntrySource* source, Failure* failure) {
    if (const zarvo_code code = m_File.CheckCanOpen(failure); code != ZARVO_OK) return code;
    UInt64 threads = 0;
    if (const zarvo_code code = WriteRun::CheckMemory(m_Plan, m_Options, &threads, failure); code != ZARVO_OK)
        return code;
    ProgressClock clock(ProgressClock::Clock::now());
    UInt64 looked = 0;
    const auto tell = [&] { return TellProgress(m_Options, {.files = looked, .filesTotal = m_Entries.size()}); };
    for (const bool areEmpty : {true, false}) // folders count as empty
        for (size_t index = 0; index < m_Entries.size(); ++index) {
            if (clock.IsDue() && !tell()) return failure->SetStopped();
            const EntryList::Entry& entry = m_Entries[index];
            if ((entry.size == 0) != areEmpty) continue;
            if (!EntryList::IsFolder(entry) && source->CheckCanRead(m_Entries, entry, failure) != ZARVO_OK)
                return FailEntry(index, *failure);
            ++looked;
        }
    return tell() ? ZARVO_OK : failure->SetStopped();
}

zarvo_code Creation::WriteFile(EntrySource* source, Failure* failure) {
    bool hasLeftover = false;
    if (const zarvo_code code = m_File.Open(m_How.force != 0, &hasLeftover, failure); code != ZARVO_OK) return code;
    if (hasLeftover && m_How.log != nullptr) {
        Failure remark;
        (void)remark.Set(ZARVO_OK, "a part that an earlier run has left is replaced");
        m_How.log(m_Options.context, remark.text);
    }
    WriteRun run(m_Plan, m_Entries, source, m_Options);
    if (run.Write(&m_File, failure) != ZARVO_OK) {
        if (run.FailedEntry() != PlannedData::kNoEntry) (void)FailEntry(run.FailedEntry(), *failure);
        return failure->code;
    }
    m_Summary.archive_bytes = run.ArchiveSize();
    return m_File.Finish(failure);
}

void Creation::TellDone() {
    for (size_t index = 0; index < m_Entries.size(); ++index) {
        const EntryList::Entry& entry = m_Entries[index];
        ++(EntryList::IsFolder(entry) ? m_Summary.folders : m_Summary.files);
        m_Summary.bytes += entry.size;
        Tell(m_Entries.PathOf(entry), EntryList::IsFolder(entry), ZARVO_OUTCOME_DONE, {});
    }
}

void Creation::TellFailed(core::string_ref path, bool isFolder, const Failure& failure) {
    Tell(path, isFolder, ZARVO_OUTCOME_FAILED, failure);
}

zarvo_code Creation::FailEntry(size_t index, const Failure& failure) {
    TellFailed(m_Entries.PathOf(index), EntryList::IsFolder(m_Entries[index]), failure);
    return failure.code;
}

void Creation::Tell(core::string_ref path, bool isFolder, SInt32 outcome, const Failure& failure) {
    if (m_How.report == nullptr) return;
    zarvo_create_report report = {};
    report.struct_size = sizeof(report);
    report.path = path.data();
    report.path_length = path.size();
    report.kind = isFolder ? ZARVO_FOLDER : ZARVO_FILE;
    report.outcome = outcome;
    report.code = failure.code;
    report.system_code = failure.systemCode;
    report.text = failure.text;
    m_How.report(m_Options.context, &report);
}
