// Files and folders on disk as the entries of an archive: finds them, and reads them. No link is followed below the
// folder that they are in.
//
//   FolderEntries found;
//   found.Open("game", failure), found.List(options, place, &findings, failure);
//   found.PrepareToRead(threads), found.Read(thread, list, list[3], 0, bytes, size, failure);
#pragma once

#include "Library/OutputFolder.h"
#include "Library/Writer/EntryList.h"
#include "Library/Writer/EntrySource.h"
#include "Library/Writer/NewArchive.h"

class FolderEntries final : public EntrySource {
public:
    ~FolderEntries() override;

    zarvo_code Open(const char* folder, Failure* failure) { return m_Root.OpenToRead(folder, failure); }

    // Why something is left out: it is neither a file nor a folder.
    enum Reason : UInt32 { kLink, kPipe, kSocket, kDevice, kReasonCount };

    struct Findings {
        EntryList* files;   // and folders
        EntryList* leftOut; // with the reason as their source
        // After a failure: what it is about.
        core::string failed = core::string(kMemLabelGeneral);
        bool isFailedFolder = false;
    };

    // Finds everything below the folder but what the options exclude, and place, which is the archive's own. Tells
    // progress meanwhile, and is stopped by it.
    zarvo_code List(const zarvo_run_options& options, const NewArchive& place, Findings* findings, Failure* failure);

    [[nodiscard]] bool PrepareToRead(UInt32 threads) override;
    zarvo_code Read(UInt32 thread, const EntryList& list, const EntryList::Entry& entry, UInt64 offset, UInt8* bytes,
                    size_t size, Failure* failure) override;
    zarvo_code CheckCanRead(const EntryList& list, const EntryList::Entry& entry, Failure* failure) override;

private:
    class Search;
    struct Reader {
        explicit Reader(const OutputFolder* root) : folders(root, kFoldersOfReader, FolderCache::kRefuse) {}

        FolderCache folders;
    };
    static constexpr size_t kFoldersOfReader = 4;

    static int FindFolder(Reader* reader, core::string_ref path, const char** name, Failure* failure);
    int OpenFile(Reader* reader, core::string_ref path, Failure* failure);

    OutputFolder m_Root;
    dynamic_array<Reader*> m_Readers{kMemLabelFileSystem};
};
