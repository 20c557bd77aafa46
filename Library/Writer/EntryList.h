// The files and folders that go into an archive, in little more memory than their paths take. One thread; after the
// last change, any thread.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/StringRef.h"
#include "Runtime/Core/Types.h"

class EntryList {
public:
    struct Entry {
        UInt64 pathBegin; // among the paths
        UInt64 offset;    // of the first byte in the data
        UInt64 size;      // of a folder 0
        UInt32 pathSize;
        UInt32 flags;  // as the archive stores them
        UInt32 source; // the number under which whoever added the entry knows it
    };
    static constexpr UInt32 kFolder = 1;

    // False when memory is refused.
    [[nodiscard]] bool Add(core::string_ref path, UInt32 flags, UInt64 size, UInt32 source = 0);

    // Takes the entries of another list in place of these. False when memory is refused.
    [[nodiscard]] bool CopyFrom(const EntryList& other);

    // By the bytes of the paths.
    void Sort();

    size_t size() const { return m_Entries.size(); }
    Entry& operator[](size_t index) { return m_Entries[index]; }
    const Entry& operator[](size_t index) const { return m_Entries[index]; }
    static bool IsFolder(const Entry& entry) { return (entry.flags & kFolder) != 0; }

    // With a NUL after it; valid until the next Add.
    core::string_ref PathOf(const Entry& entry) const { return {m_Paths.data() + entry.pathBegin, entry.pathSize}; }
    core::string_ref PathOf(size_t index) const { return PathOf(m_Entries[index]); }

    // The entry with that path, or size() if there is none. Needs sorted entries.
    size_t Find(core::string_ref path) const;

    // Of several equal paths, and of files that have the path of a folder above another entry, the index of one; size()
    // if there is none. Needs sorted entries.
    size_t FindClash() const;

    // Cuts the list to those entries for which keep(entry) is true. Their order stays.
    template <typename Keep>
    void Filter(Keep&& keep) {
        size_t kept = 0;
        for (const Entry& entry : m_Entries)
            if (keep(entry)) m_Entries[kept++] = entry;
        m_Entries.truncate(kept);
    }

private:
    dynamic_array<Entry> m_Entries{kMemLabelFileSystem};
    dynamic_array<char> m_Paths{kMemLabelFileSystem};
};
