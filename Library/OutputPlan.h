// Decides what extraction does with each entry: which are wanted, which are refused, and which give way to others. This
// is settled before anything is written, so it depends on the archive and the options alone. One thread builds the
// plan; then any thread may use it.
//
// Takes a byte per entry, and 10 more while it is built.
//
// Of several files with the same path on disk, the last is written, and of several folders the last. When a file is
// where a folder has to be, the path belongs to the entry that comes first in the archive.
#pragma once

#include "Library/Failure.h"
#include "Library/PathTable.h"
#include "Library/Patterns.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

class OutputPlan {
public:
    using Nodes = dynamic_array<ArchiveStorageHeader::Node>;

    enum Verdict : UInt8 {
        kUnwanted, // patterns leave it out, or strip leaves no component of its path
        kReplaced, // by a later entry of the same path
        kRefused,  // its path has a problem: see GetPathProblem
        kClash,    // its path belongs to an earlier entry of the other kind
        kFolder,
        kFile,
    };

    // nodes outlives the plan. strip: how many components each path loses at its front.
    OutputPlan(const Nodes& nodes, UInt64 strip) : m_Nodes(nodes), m_Strip(strip) {}

    // wanted may be null (everything is), and so may excluded (nothing is).
    [[nodiscard]] zarvo_code Build(zarvo_patterns* wanted, zarvo_patterns* excluded, Failure* failure);

    Verdict VerdictOf(size_t entry) const { return m_Verdicts[entry]; }

    // Why an entry has the verdict kRefused or kClash.
    void SetRefusal(size_t entry, Failure* failure) const;

    // The entry's path on disk, not yet in normal form.
    core::string_ref PathOnDisk(size_t entry) const { return Strip(m_Nodes[entry].path); }

private:
    // A folder without an entry, whose path is the start of an entry's path.
    struct ImpliedFolder {
        UInt32 entry;
        UInt32 length;
    };

    core::string_ref Strip(core::string_ref path) const;
    core::string_ref PathOfItem(UInt32 item) const;
    bool IsFolderItem(UInt32 item) const;
    [[nodiscard]] bool Settle(UInt32 entry, dynamic_array<UInt64>* hashes);
    UInt32* Find(UInt64 hash, core::string_ref path);

    const Nodes& m_Nodes;
    const UInt64 m_Strip;
    dynamic_array<Verdict> m_Verdicts{kMemLabelFileSystem};

    // Only while the plan is built.
    dynamic_array<ImpliedFolder> m_Implied{kMemLabelFileSystem};
    PathTable m_Table;    // items: entries, and after them implied folders
    size_t m_Settled = 0; // entries in the table
    UInt64 m_Seed = 0;
};
