#include "Library/Extraction.h"

#include "Library/Resources.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>

Extraction::~Extraction() {
    for (Worker* worker : m_Workers)
        Delete(worker, kMemLabelFileSystem);
}

zarvo_code Extraction::Extract(const char* folder, Failure* failure) {
    UInt64 bytes = 0;
    if (const zarvo_code code = Plan(&m_Plan, &bytes, failure); code != ZARVO_OK) return code;
    zarvo_code code = ZARVO_OK;
    if (m_How.max_bytes != 0 && bytes > m_How.max_bytes)
        code = failure->Set(ZARVO_ERROR_LIMIT, "the files have %llu bytes; the limit (max_bytes) is %llu",
                            static_cast<unsigned long long>(bytes), static_cast<unsigned long long>(m_How.max_bytes));
    if (code == ZARVO_OK) code = OpenFolder(folder, failure);
    if (code == ZARVO_OK) code = AddPlanned(m_Plan, failure);
    m_Looker = {};
    if (code == ZARVO_OK) return Run(failure);
    SetAllFailed();
    return code;
}

// Opens the folder, and prepares the workers.
zarvo_code Extraction::OpenFolder(const char* folder, Failure* failure) {
    const bool makes = m_How.dry_run == 0;
    const zarvo_code code = makes ? m_Output.Open(folder, failure) : m_Output.OpenToLook(folder, failure);
    if (code != ZARVO_OK) return code;
    const size_t maxFolders = ShareDescriptors();
    if (!m_Workers.resize_uninitialized(ThreadCount(), kResizeExact)) return failure->SetMemory();
    for (Worker*& worker : m_Workers)
        worker = New<Worker>(kMemLabelFileSystem, &m_Output, maxFolders, makes);
    for (const Worker* worker : m_Workers)
        if (worker == nullptr) return failure->SetMemory();
    if (m_How.overwrite == ZARVO_OVERWRITE_ALWAYS) return ZARVO_OK;
    m_Looker = {New<Worker>(kMemLabelFileSystem, &m_Output, maxFolders, false), kMemLabelFileSystem};
    return m_Looker ? ZARVO_OK : failure->SetMemory();
}

// Lets as few threads work as the process has descriptors for, and decides how many files may stay open meanwhile. How
// many folders each thread may keep open.
size_t Extraction::ShareDescriptors() {
    constexpr UInt64 kOthers = 8;        // the program's, the archive and the folder to extract to
    constexpr UInt64 kPerThread = 3;     // a file, its folder, and one more on the way to it
    constexpr UInt64 kPerSharedFile = 2; // the file, and the folder of its temporary name
    constexpr UInt64 kMaxFolders = 16;
    const UInt64 free = std::max(FreeDescriptors(kOthers), kPerThread + 1);
    LimitThreads(static_cast<UInt32>(std::min<UInt64>(ThreadCount(), free / (kPerThread + 1))));
    const UInt64 share = free / ThreadCount();
    const UInt64 folders = std::clamp<UInt64>(share / 2 - std::min(share / 2, kPerThread), 1, kMaxFolders);
    m_MaxOpenFiles = static_cast<SInt64>((free - ThreadCount() * (kPerThread + folders)) / kPerSharedFile);
    return static_cast<size_t>(folders);
}

// The open folder of an entry's file, and the file's name in the worker's; -1 after a failure.
int Extraction::FindFolder(Worker* worker, UInt32 entry, Failure* failure) {
    const core::string_ref path = m_Plan.PathOnDisk(entry);
    const core::string_ref name = LastComponent(path);
    if (worker->name.grow(name.size()) == nullptr) {
        (void)failure->SetMemory();
        return -1;
    }
    worker->name = name;
    return worker->folders.Get(WithoutLastComponent(path), failure);
}

// Makes a file without its name: make(folder, failure). Folders that are kept open give way where descriptors run out.
template <typename Make>
zarvo_code Extraction::MakeFile(Worker* worker, UInt32 entry, Failure* failure, Make&& make) {
    for (bool isSecondTry = false;; isSecondTry = true) {
        *failure = {};
        const int folder = FindFolder(worker, entry, failure);
        const zarvo_code code = folder >= 0 ? make(folder, failure) : failure->code;
        if (code == ZARVO_OK || isSecondTry || !IsOutOfDescriptors(*failure) || !worker->folders.Close()) return code;
    }
}

// Whether something is there that is to be left; then the result is set.
bool Extraction::IsKept(UInt32 entry, int folder, const char* name) {
    if (m_How.overwrite == ZARVO_OVERWRITE_ALWAYS || !LookAt(folder, name).isThere) return false;
    if (m_How.overwrite == ZARVO_OVERWRITE_NEVER) {
        SetKept(entry);
    } else {
        Failure failure;
        (void)failure.SetSystem(EEXIST);
        SetFailed(entry, failure);
    }
    return true;
}

// The result of an entry that was written, or was not: failure is of the disk, damage (null: none) of the archive.
void Extraction::Settle(UInt32 entry, const Failure& failure, const Failure* damage) {
    if (IsDiskFailure(failure) || failure.code == ZARVO_ERROR_MEMORY)
        Data().StopFor(failure); // and no word of the entry
    else if (failure.code != ZARVO_OK)
        SetFailed(entry, failure);
    else if (damage != nullptr)
        SetBroken(entry, *damage);
    else
        SetDone(entry);
}

// A file that is not there may get the name, and one that is may be replaced.
static zarvo_code CheckStanding(const Standing& standing, const zarvo_archive& archive, Failure* failure) {
    if (standing.isFolder) return failure->SetSystem(EISDIR, "a folder is in the place of a file");
    if (standing.isThere && archive.IsFile(standing.device, standing.inode))
        return failure->SetSystem(EEXIST, "the archive itself is in its place");
    return ZARVO_OK;
}

// Gives a written file its name.
void Extraction::Place(Worker* worker, UInt32 entry, NewFile* file, const Failure* damage) {
    Failure failure;
    const int folder = FindFolder(worker, entry, &failure);
    const char* const name = worker->name.c_str();
    if (folder >= 0 && IsKept(entry, folder, name)) return;
    if (folder >= 0 && file->Place(folder, name, &failure) != ZARVO_OK && failure.systemCode == EEXIST) {
        if (IsKept(entry, folder, name)) return; // it came meanwhile
        failure = {};
        if (CheckStanding(LookAt(folder, name), *Archive(), &failure) == ZARVO_OK)
            (void)file->Replace(folder, name, &failure);
    }
    Settle(entry, failure, damage);
}

// In a dry run: whether a file could be made and get its name, as far as can be seen.
void Extraction::TryPlace(Worker* worker, UInt32 entry, const Failure* damage) {
    Failure failure;
    const int folder = FindFolder(worker, entry, &failure);
    const char* const name = worker->name.c_str();
    if (folder >= 0 && IsKept(entry, folder, name)) return;
    if (folder >= 0 && CheckCanMakeIn(folder, &failure) == ZARVO_OK)
        (void)CheckStanding(LookAt(folder, name), *Archive(), &failure);
    if (failure.code == ZARVO_OK) (void)CheckName(folder >= 0 ? folder : m_Output.Descriptor(), name, &failure);
    Settle(entry, failure, damage);
}

// What is there already and stays there need not be decoded. It is looked for again when the file gets its name.
bool Extraction::IsSettledBefore(UInt32 entry) {
    if (!m_Looker || zarvo_archive::IsFolder(Nodes()[entry])) return false;
    Failure failure; // which the run meets, too
    const int folder = FindFolder(m_Looker.get(), entry, &failure);
    return folder >= 0 && IsKept(entry, folder, m_Looker->name.c_str());
}

void Extraction::TakeFile(UInt32 number, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) {
    Worker* const worker = m_Workers[number];
    if (damage != nullptr && m_How.keep_broken == 0) return SetFailed(entry, *damage);
    if (m_How.dry_run != 0) return TryPlace(worker, entry, damage);
    Failure failure;
    NewFile file;
    const auto make = [&file](int folder, Failure* why) { return file.Create(folder, why); };
    if (MakeFile(worker, entry, &failure, make) != ZARVO_OK || file.Write(0, bytes, readable, &failure) != ZARVO_OK)
        return Settle(entry, failure, damage);
    Place(worker, entry, &file, damage);
}

SharedFile* Extraction::ShareFile(UInt32 entry, UInt64 size) {
    return New<OutputFile>(kMemLabelFileSystem, entry, size);
}

// Makes the file unless it is made already; false when it can't be. Any number of files may be shared at a time: those
// that there are no descriptors for don't stay open.
bool Extraction::MakeShared(Worker* worker, OutputFile* file) {
    if (file->isMade || file->failure.Get() != nullptr) return file->isMade;
    Failure failure;
    file->isOpen = m_OpenFiles.fetch_add(1, std::memory_order_relaxed) < m_MaxOpenFiles; // orders nothing else
    if (!file->isOpen) m_OpenFiles.fetch_sub(1, std::memory_order_relaxed);
    (void)MakeFile(worker, file->entry, &failure, [file](int folder, Failure* why) {
        return file->isOpen ? file->file.Create(folder, why) : file->file.CreateClosed(folder, why);
    });
    file->isMade = failure.code == ZARVO_OK;
    if (!file->isMade) file->failure.Set(failure);
    return file->isMade;
}

zarvo_code Extraction::CutShared(Worker* worker, OutputFile* file, Failure* failure) {
    if (file->isOpen) return file->file.Cut(file->readable, failure);
    const int folder = FindFolder(worker, file->entry, failure);
    return folder >= 0 ? file->file.CutClosed(folder, file->readable, failure) : failure->code;
}

// Removes the file unless it has its name.
void Extraction::FreeShared(Worker* worker, OutputFile* file) {
    const bool wasOpen = file->isOpen;
    if (!wasOpen && file->file.IsNamed()) {
        Failure failure;
        const int folder = FindFolder(worker, file->entry, &failure);
        if (folder >= 0) file->file.Remove(folder);
    }
    Delete(file, kMemLabelFileSystem);
    if (wasOpen) m_OpenFiles.fetch_sub(1, std::memory_order_relaxed);
}

void Extraction::TakePart(UInt32 number, SharedFile* shared, UInt64 offset, const UInt8* bytes, UInt64 size) {
    if (m_How.dry_run != 0) return;
    Worker* const worker = m_Workers[number];
    auto* const file = static_cast<OutputFile*>(shared);
    Failure failure;
    {
        Mutex::AutoLock lock(file->lock);
        if (!MakeShared(worker, file)) return;
    }
    zarvo_code code;
    if (file->isOpen) {
        code = file->file.Write(offset, bytes, size, &failure);
    } else {
        const int folder = FindFolder(worker, file->entry, &failure);
        code = folder >= 0 ? file->file.WriteClosed(folder, offset, bytes, size, &failure) : failure.code;
    }
    if (code == ZARVO_OK) return;
    Mutex::AutoLock lock(file->lock);
    file->failure.Set(failure);
}

void Extraction::EndFile(UInt32 number, SharedFile* shared) {
    Worker* const worker = m_Workers[number];
    auto* const file = static_cast<OutputFile*>(shared);
    {
        Mutex::AutoLock lock(file->lock);
        const Failure* const damage = file->damage.Get();
        Failure failure;
        if (damage != nullptr && m_How.keep_broken == 0)
            SetFailed(file->entry, *damage);
        else if (m_How.dry_run != 0)
            TryPlace(worker, file->entry, damage);
        else if (!MakeShared(worker, file) || file->failure.Get() != nullptr)
            Settle(file->entry, *file->failure.Get(), damage);
        // Parts after the damage may have been written before it was met.
        else if (damage != nullptr && CutShared(worker, file, &failure) != ZARVO_OK)
            Settle(file->entry, failure, damage);
        else
            Place(worker, file->entry, &file->file, damage);
    }
    FreeShared(worker, file);
}

void Extraction::DropFile(SharedFile* shared) { FreeShared(m_Workers[0], static_cast<OutputFile*>(shared)); }

// A folder, a file of no bytes, or one that lies outside the data.
void Extraction::TakeOther(UInt32 number, UInt32 entry) {
    Worker* const worker = m_Workers[number];
    Failure failure;
    if (m_Plan.VerdictOf(entry) == OutputPlan::kFolder) {
        (void)worker->folders.Get(m_Plan.PathOnDisk(entry), &failure);
        return Settle(entry, failure, nullptr);
    }
    if (Nodes()[entry].size != 0) {
        Failure damage;
        (void)SetOutsideData(&damage);
        return TakeFile(number, entry, nullptr, 0, &damage);
    }
    if (m_How.dry_run != 0) return TryPlace(worker, entry, nullptr);
    const int folder = FindFolder(worker, entry, &failure);
    const char* const name = worker->name.c_str();
    if (folder >= 0 && IsKept(entry, folder, name)) return;
    if (folder >= 0 && PlaceEmptyFile(folder, name, &failure) == ZARVO_ERROR_SYSTEM && failure.systemCode == EEXIST)
        return TakeFile(number, entry, nullptr, 0, nullptr);
    Settle(entry, failure, nullptr);
}

void Extraction::Report(const zarvo_report& report) {
    if (m_How.report != nullptr) m_How.report(Options().context, &report);
}
