// Finds entries by path, and links entries and implied folders into a tree. Built in one go, then only read: any
// thread.
//
// An item is an entry (its number in the directory), or a folder that only paths imply (a number after the entries').
// Of several entries with the same normal form, the last is found, or the last file if there are files and folders; the
// others, and entries with a problem, are in no folder.
//
// Takes 18 bytes per entry: a slot of 8 bytes in a hash table that is at most six sevenths full, and two links of 4.
#pragma once

#include "Library/Failure.h"
#include "Library/PathTable.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

class EntryIndex {
public:
    using Nodes = dynamic_array<ArchiveStorageHeader::Node>;

    static constexpr UInt32 kNoItem = PathTable::kNoItem;
    static constexpr UInt32 kRoot = kNoItem - 1;

    // nodes outlives the index.
    explicit EntryIndex(const Nodes& nodes);

    // Call this first. When it fails, because memory was refused, it may be called again.
    [[nodiscard]] zarvo_code Build(Failure* failure);

    UInt32 ItemCount() const { return static_cast<UInt32>(m_NextSibling.size()); }

    // kNoItem when nothing has that path; kRoot when its normal form is empty.
    UInt32 Find(core::string_ref path) const;

    // In the archive's order; an implied folder stands where the last item in it does. kNoItem at the end.
    UInt32 FirstChild(UInt32 item) const { return item == kRoot ? m_FirstInRoot : m_FirstChild[item]; }
    UInt32 NextSibling(UInt32 item) const { return m_NextSibling[item]; }

    bool IsImplied(UInt32 item) const { return item >= m_Nodes.size(); }

    // A path that has the item's normal form: part of the directory's texts.
    core::string_ref Path(UInt32 item) const;

    // The length of the item's normal form. That of an implied folder is known: one path may imply very many.
    size_t NormalLength(UInt32 item) const;

private:
    // A folder without an entry, whose path is the start of an entry's path.
    struct ImpliedFolder {
        UInt32 entry;
        UInt32 length; // of its path, as it is stored; longer paths make no implied folders
        UInt32 normalLength;
    };

    class PathHasher;

    UInt32* FindSlot(UInt64 hash, core::string_ref path);
    [[nodiscard]] bool LinkIntoFolders(UInt32 entry, PathHasher* hasher, dynamic_array<UInt64>* hashes);
    [[nodiscard]] bool AddImpliedFolder(UInt32 entry, size_t length, size_t normalLength, UInt32* slot);
    void PutInFront(UInt32 item, UInt32* first);

    const Nodes& m_Nodes;
    dynamic_array<ImpliedFolder> m_Implied;
    PathTable m_Table;
    dynamic_array<UInt32> m_FirstChild;
    dynamic_array<UInt32> m_NextSibling;
    UInt32 m_FirstInRoot = kNoItem;
    UInt64 m_Seed = 0;
};
