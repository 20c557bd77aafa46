#include "Library/Writer/PlannedData.h"

#include <algorithm>
#include <cstring>

PlannedData::PlannedData(const WritePlan& plan, const EntryList& list, EntrySource* source)
    : m_List(list), m_Source(source), m_Size(plan.DataSize()) {
    if (plan.HasLegacyDirectory()) PutLegacyDirectory(m_Directory, list);
}

size_t PlannedData::CountUpTo(UInt64 position) const {
    size_t begin = 0;
    size_t end = m_List.size();
    while (begin < end) {
        const size_t middle = begin + (end - begin) / 2;
        const EntryList::Entry& entry = m_List[middle];
        if (entry.offset + entry.size <= position)
            begin = middle + 1;
        else
            end = middle;
    }
    return begin;
}

zarvo_code PlannedData::Read(UInt32 thread, UInt64 position, UInt8* bytes, UInt64 size, size_t* failed,
                             Failure* failure) const {
    const auto advance = [&](UInt64 count) {
        position += count;
        bytes += count;
        size -= count;
    };
    if (position < m_Directory.Size()) {
        const UInt64 count = std::min(size, m_Directory.Size() - position);
        memcpy(bytes, m_Directory.Bytes() + position, count);
        advance(count);
    }
    for (size_t index = CountUpTo(position); index < m_List.size() && size != 0; ++index) {
        const EntryList::Entry& entry = m_List[index];
        if (entry.size == 0) continue;
        const UInt64 offset = position - entry.offset;
        const UInt64 count = std::min(size, entry.size - offset);
        *failed = index;
        const zarvo_code code =
            m_Source->Read(thread, m_List, entry, offset, bytes, static_cast<size_t>(count), failure);
        if (code != ZARVO_OK) return code;
        advance(count);
    }
    if (size != 0) memset(bytes, 0, size);
    return ZARVO_OK;
}
