#include "Runtime/VirtualFileSystem/ArchiveFileSystem/BrokenBlocks.h"

#include <algorithm>
#include <utility>

constexpr size_t kFirstTableSize = 16;

BrokenBlocks::Record BrokenBlocks::Find(UInt32 blockIndex) const {
    return m_Table.empty() ? Record() : m_Table[SlotOf(m_Table, blockIndex)];
}

void BrokenBlocks::Note(const Record& record) {
    if (2 * (m_Count + 1) > m_Table.size() && !Grow()) return;
    Record& known = m_Table[SlotOf(m_Table, record.blockIndex)];
    if (known.blockIndex == kNoBlock) ++m_Count;
    if (record.from < known.from) known = record;
}

void BrokenBlocks::Clear() {
    m_Table.clear();
    m_Count = 0;
}

// The slot of a block's record, or the free slot where it belongs.
size_t BrokenBlocks::SlotOf(const dynamic_array<Record>& table, UInt32 blockIndex) {
    constexpr UInt64 kGoldenRatio = 0x9E3779B97F4A7C15; // spreads indexes that share a factor
    const size_t mask = table.size() - 1;
    size_t slot = static_cast<size_t>(blockIndex * kGoldenRatio >> 32) & mask;
    while (table[slot].blockIndex != kNoBlock && table[slot].blockIndex != blockIndex)
        slot = (slot + 1) & mask;
    return slot;
}

bool BrokenBlocks::Grow() {
    dynamic_array<Record> larger(m_Table.get_memory_label());
    if (!larger.resize_initialized(std::max(kFirstTableSize, 2 * m_Table.size()), kResizeExact)) return false;
    for (const Record& record : m_Table)
        if (record.blockIndex != kNoBlock) larger[SlotOf(larger, record.blockIndex)] = record;
    m_Table = std::move(larger);
    return true;
}
