// The data of an archive that is being made, as one stream: the legacy directory if there is one, the entries' bytes,
// and the zeros that fill it up. Any thread.
#pragma once

#include "Library/Writer/EntrySource.h"
#include "Library/Writer/WritePlan.h"

class PlannedData : private NonCopyable {
public:
    static constexpr size_t kNoEntry = ~size_t{0};

    // All must outlive the object, which makes the directory.
    PlannedData(const WritePlan& plan, const EntryList& list, EntrySource* source);

    // False when memory was refused.
    [[nodiscard]] bool IsReady() const { return m_Directory.IsWhole(); }

    UInt64 Size() const { return m_Size; }

    // Reads a range of the data. If an entry fails, *failed is its index.
    zarvo_code Read(UInt32 thread, UInt64 position, UInt8* bytes, UInt64 size, size_t* failed, Failure* failure) const;

    // How many entries end before a position.
    size_t CountUpTo(UInt64 position) const;

private:
    const EntryList& m_List;
    EntrySource* m_Source;
    ByteSink m_Directory;
    UInt64 m_Size;
};
