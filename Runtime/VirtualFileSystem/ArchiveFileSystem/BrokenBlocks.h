// Which blocks of an archive are known to be damaged, so that not every file in them pays for finding out. Takes memory
// only for those. A thread must have the object to itself.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Types.h"

class BrokenBlocks {
public:
    struct Record {
        UInt64 from = ~UInt64{0}; // where in the block's data the first window starts that can't be had
        UInt32 blockIndex = kNoBlock;
        bool isCut = false; // the stored bytes end early: nothing is delivered, but that is no failure

        bool IsKnown() const { return blockIndex != kNoBlock; }
    };

    explicit BrokenBlocks(MemLabelId label) : m_Table(label) {}

    // What is known of a block; a default record when that is nothing.
    Record Find(UInt32 blockIndex) const;

    // Of two notes of one block, the smaller from holds. When memory is refused nothing is noted.
    void Note(const Record& record);

    void Clear();

private:
    static constexpr UInt32 kNoBlock = ~UInt32{0};

    static size_t SlotOf(const dynamic_array<Record>& table, UInt32 blockIndex);
    bool Grow();

    dynamic_array<Record> m_Table; // open addressing, at most half full; its size is 0 or a power of 2
    size_t m_Count = 0;
};
