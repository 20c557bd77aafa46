#include "Library/Extraction.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <sys/resource.h>

Extraction::~Extraction() {
    for (Worker* worker : m_Workers)
        Delete(worker, kMemLabelFileSystem);
}

zarvo_code Extraction::Extract(const char* folder, Failure* failure) {
    UInt64 bytes = 0;
    if (const zarvo_code code = AddPlanned(&m_Plan, m_How.dry_run != 0, &bytes, failure); code != ZARVO_OK) return code;
    if (m_How.max_bytes != 0 && bytes > m_How.max_bytes)
        return failure->Set(ZARVO_ERROR_LIMIT, "the files have %llu bytes; the limit (max_bytes) is %llu",
                            static_cast<unsigned long long>(bytes), static_cast<unsigned long long>(m_How.max_bytes));
    if (m_How.dry_run == 0) {
        if (const zarvo_code code = m_Output.Open(folder, failure); code != ZARVO_OK) return code;
    }
    const size_t maxFolders = ShareDescriptors();
    if (!m_Workers.resize_uninitialized(ThreadCount(), kResizeExact)) return failure->SetMemory();
    for (Worker*& worker : m_Workers)
        worker = New<Worker>(kMemLabelFileSystem, &m_Output, maxFolders);
    for (const Worker* worker : m_Workers)
        if (worker == nullptr) return failure->SetMemory();
    return Run(failure);
}

// Lets as few threads work as the process has descriptors for. How many folders each may keep open.
size_t Extraction::ShareDescriptors() {
    constexpr UInt64 kOthers = 8;    // the program's, the archive and the folder to extract to
    constexpr UInt64 kPerThread = 3; // a file, its folder, and one more on the way to it
    constexpr UInt64 kMaxFolders = 16;
    rlimit limit = {};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return kMaxFolders;
    const UInt64 free = std::max<UInt64>(limit.rlim_cur, kOthers + kPerThread + 1) - kOthers;
    LimitThreads(static_cast<UInt32>(std::min<UInt64>(ThreadCount(), free / (kPerThread + 1))));
    return static_cast<size_t>(std::clamp<UInt64>(free / ThreadCount() - kPerThread, 1, kMaxFolders));
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

// Makes the file without its name. Folders that are kept open give way where descriptors run out.
zarvo_code Extraction::MakeFile(Worker* worker, UInt32 entry, NewFile* file, Failure* failure) {
    for (bool isSecondTry = false;; isSecondTry = true) {
        *failure = {};
        const int folder = FindFolder(worker, entry, failure);
        const zarvo_code code = folder >= 0 ? file->Create(folder, failure) : failure->code;
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

// Gives a written file its name.
void Extraction::Place(Worker* worker, UInt32 entry, NewFile* file, const Failure* damage) {
    Failure failure;
    const int folder = FindFolder(worker, entry, &failure);
    const char* const name = worker->name.c_str();
    if (folder >= 0 && IsKept(entry, folder, name)) return;
    if (folder >= 0 && file->Place(folder, name, false, &failure) != ZARVO_OK && failure.systemCode == EEXIST) {
        if (IsKept(entry, folder, name)) return; // it came meanwhile
        const Standing standing = LookAt(folder, name);
        failure = {};
        if (standing.isFolder)
            (void)failure.SetSystem(EISDIR, "a folder is in the place of a file");
        else if (standing.isThere && Archive()->IsFile(standing.device, standing.inode))
            (void)failure.SetSystem(EEXIST, "the archive itself is in its place");
        else
            (void)file->Place(folder, name, true, &failure);
    }
    Settle(entry, failure, damage);
}

void Extraction::TakeFile(UInt32 number, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) {
    Worker* const worker = m_Workers[number];
    if (damage != nullptr && m_How.keep_broken == 0) return SetFailed(entry, *damage);
    Failure failure;
    if (m_How.overwrite != ZARVO_OVERWRITE_ALWAYS) {
        const int folder = FindFolder(worker, entry, &failure);
        if (folder >= 0 && IsKept(entry, folder, worker->name.c_str())) return;
    }
    NewFile file;
    if (MakeFile(worker, entry, &file, &failure) != ZARVO_OK || file.Write(0, bytes, readable, &failure) != ZARVO_OK)
        return Settle(entry, failure, damage);
    Place(worker, entry, &file, damage);
}

SharedFile* Extraction::ShareFile(UInt32 entry, UInt64 size) {
    return New<OutputFile>(kMemLabelFileSystem, entry, size);
}

void Extraction::TakePart(UInt32 number, SharedFile* shared, UInt64 offset, const UInt8* bytes, UInt64 size) {
    auto* const file = static_cast<OutputFile*>(shared);
    Failure failure;
    {
        Mutex::AutoLock lock(file->lock);
        if (file->failure.code != ZARVO_OK) return;
        if (!file->isMade) (void)MakeFile(m_Workers[number], file->entry, &file->file, &file->failure);
        file->isMade = file->failure.code == ZARVO_OK;
        if (!file->isMade) return;
    }
    if (file->file.Write(offset, bytes, size, &failure) == ZARVO_OK) return;
    Mutex::AutoLock lock(file->lock);
    file->failure = failure;
}

void Extraction::EndFile(UInt32 number, SharedFile* shared) {
    auto* const file = static_cast<OutputFile*>(shared);
    {
        Mutex::AutoLock lock(file->lock);
        const Failure* const damage = file->damage.code != ZARVO_OK ? &file->damage : nullptr;
        if (damage != nullptr && m_How.keep_broken == 0) {
            SetFailed(file->entry, *damage);
        } else {
            if (!file->isMade && file->failure.code == ZARVO_OK)
                (void)MakeFile(m_Workers[number], file->entry, &file->file, &file->failure);
            // Parts after the damage may have been written before it was met.
            if (damage != nullptr && file->failure.code == ZARVO_OK)
                (void)file->file.Cut(file->readable, &file->failure);
            if (file->failure.code != ZARVO_OK)
                Settle(file->entry, file->failure, damage);
            else
                Place(m_Workers[number], file->entry, &file->file, damage);
        }
    }
    Delete(file, kMemLabelFileSystem);
}

void Extraction::DropFile(SharedFile* shared) { Delete(static_cast<OutputFile*>(shared), kMemLabelFileSystem); }

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
