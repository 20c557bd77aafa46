// Writes entries to disk: zarvo_extract.
#pragma once

#include "Library/ArchiveRun.h"
#include "Library/NewFile.h"
#include "Library/OutputFolder.h"
#include "Runtime/Allocator/Owned.h"

class Extraction final : public ArchiveRun {
public:
    Extraction(zarvo_archive* archive, const zarvo_run_options& options, const zarvo_extract_options& how)
        : ArchiveRun(archive, options), m_How(how), m_Plan(archive->Nodes(), how.strip) {}
    ~Extraction() override;

    zarvo_code Extract(const char* folder, Failure* failure);

private:
    // A file that several pieces share.
    struct OutputFile : SharedFile {
        using SharedFile::SharedFile;

        NewFile file; // made by whoever has the first part
        bool isMade VARNEX_GUARDED_BY(lock) = false;
        bool isOpen = false;                         // or, once it is made, does not stay open
        RareFailure failure VARNEX_GUARDED_BY(lock); // of making or writing it
    };
    struct Worker {
        Worker(const OutputFolder* output, size_t maxFolders, bool makes)
            : folders(output, maxFolders, makes ? FolderCache::kMake : FolderCache::kLook) {}

        FolderCache folders;
        core::string name{kMemLabelGeneral}; // of the entry at hand
    };

    zarvo_code OpenFolder(const char* folder, Failure* failure);
    size_t ShareDescriptors();

    void TakeFile(UInt32 worker, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) override;
    SharedFile* ShareFile(UInt32 entry, UInt64 size) override;
    void TakePart(UInt32 worker, SharedFile* file, UInt64 offset, const UInt8* bytes, UInt64 size) override;
    void EndFile(UInt32 worker, SharedFile* file) override;
    void DropFile(SharedFile* file) override;
    void TakeOther(UInt32 worker, UInt32 entry) override;
    void TakeDamage(UInt32, UInt64, UInt64, const Failure&) override {}
    void Report(const zarvo_report& report) override;
    bool IsSettledBefore(UInt32 entry) override;

    int FindFolder(Worker* worker, UInt32 entry, Failure* failure);
    template <typename Make>
    zarvo_code MakeFile(Worker* worker, UInt32 entry, Failure* failure, Make&& make);
    bool MakeShared(Worker* worker, OutputFile* file) VARNEX_REQUIRES(file->lock);
    zarvo_code CutShared(Worker* worker, OutputFile* file, Failure* failure) VARNEX_REQUIRES(file->lock);
    void FreeShared(Worker* worker, OutputFile* file);
    void Place(Worker* worker, UInt32 entry, NewFile* file, const Failure* damage);
    void TryPlace(Worker* worker, UInt32 entry, const Failure* damage);
    bool IsKept(UInt32 entry, int folder, const char* name);
    void Settle(UInt32 entry, const Failure& failure, const Failure* damage);

    const zarvo_extract_options m_How;
    OutputPlan m_Plan;
    OutputFolder m_Output;
    dynamic_array<Worker*> m_Workers{kMemLabelFileSystem};
    Owned<Worker> m_Looker; // that makes nothing, for IsSettledBefore; null where nothing is looked for
    SInt64 m_MaxOpenFiles = 0;
    std::atomic<SInt64> m_OpenFiles{0}; // shared ones
};
