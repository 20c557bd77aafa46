// Writes entries to disk: zarvo_extract.
#pragma once

#include "Library/ArchiveRun.h"
#include "Library/OutputFolder.h"

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
        Failure failure VARNEX_GUARDED_BY(lock); // of making or writing it
    };
    struct Worker {
        Worker(const OutputFolder* output, size_t maxFolders) : folders(output, maxFolders) {}

        FolderCache folders;
        core::string name{kMemLabelGeneral}; // of the entry at hand
    };

    size_t ShareDescriptors();

    void TakeFile(UInt32 worker, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) override;
    SharedFile* ShareFile(UInt32 entry, UInt64 size) override;
    void TakePart(UInt32 worker, SharedFile* file, UInt64 offset, const UInt8* bytes, UInt64 size) override;
    void EndFile(UInt32 worker, SharedFile* file) override;
    void DropFile(SharedFile* file) override;
    void TakeOther(UInt32 worker, UInt32 entry) override;
    void TakeDamage(UInt32, UInt64, UInt64, const Failure&) override {}
    void Report(const zarvo_report& report) override;

    int FindFolder(Worker* worker, UInt32 entry, Failure* failure);
    zarvo_code MakeFile(Worker* worker, UInt32 entry, NewFile* file, Failure* failure);
    void Place(Worker* worker, UInt32 entry, NewFile* file, const Failure* damage);
    bool IsKept(UInt32 entry, int folder, const char* name);
    void Settle(UInt32 entry, const Failure& failure, const Failure* damage);

    const zarvo_extract_options m_How;
    OutputPlan m_Plan;
    OutputFolder m_Output;
    dynamic_array<Worker*> m_Workers{kMemLabelFileSystem};
};
