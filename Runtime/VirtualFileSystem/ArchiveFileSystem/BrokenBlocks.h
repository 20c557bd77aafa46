// Which blocks of an archive are known to be damaged, so that the next file in such a block doesn't decode it again.
// Takes memory only for damaged blocks. One thread at a time.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Types.h"

class BrokenBlocks {
public:
    struct Record {
        UInt64 from = ~UInt64{0}; // in the block's data: the start of the first window that can't be decoded
        UInt32 blockIndex = kNoBlock;
        bool isCut = false; // the stored bytes end early: reads deliver nothing, but succeed

        bool IsKnown() const { return blockIndex != kNoBlock; }
    };

    explicit BrokenBlocks(MemLabelId label) : m_Table(label) {}

    // The note of a block, or a default record when there is none.
    Record Find(UInt32 blockIndex) const;

    // Keeps the note with the smaller from when a block has two. Notes nothing when memory is refused.
    void Note(const Record& record);

    void Clear();

private:
    static constexpr UInt32 kNoBlock = ~UInt32{0};

    static size_t SlotOf(const dynamic_array<Record>& table, UInt32 blockIndex);
    bool Grow();

    dynamic_array<Record> m_Table; // open addressing, at most half full; size 0 or a power of 2
    size_t m_Count = 0;
};
