#include "Runtime/VirtualFileSystem/ArchiveFileSystem/LegacyDirectoryScanner.h"

#include <algorithm>
#include <cstring>

constexpr UInt32 kEntryTailSize = 8;
constexpr UInt32 kMinEntrySize = 1 + kEntryTailSize;

bool LegacyDirectoryScanner::Scan(const UInt8* data, size_t size) {
    m_Position += size;
    const UInt8* const end = data + size;
    while (data != end && m_CountBytesSeen < sizeof(UInt32)) {
        m_EntriesLeft = m_EntriesLeft << 8 | *data++;
        ++m_CountBytesSeen;
    }
    while (data != end && m_EntriesLeft != 0) {
        if (m_EntryTailBytesLeft == 0) {
            const void* terminator = memchr(data, '\0', static_cast<size_t>(end - data));
            if (terminator == nullptr) break;
            data = static_cast<const UInt8*>(terminator) + 1;
            m_EntryTailBytesLeft = kEntryTailSize;
        }
        const UInt32 step = static_cast<UInt32>(std::min<ptrdiff_t>(m_EntryTailBytesLeft, end - data));
        data += step;
        m_EntryTailBytesLeft -= step;
        if (m_EntryTailBytesLeft == 0) --m_EntriesLeft;
    }
    return IsComplete();
}

bool LegacyDirectoryScanner::CanCompleteWithin(UInt64 streamSize) const {
    if (m_CountBytesSeen < sizeof(UInt32) || m_EntriesLeft == 0) return true;
    const UInt64 leftOfThisEntry = m_EntryTailBytesLeft != 0 ? m_EntryTailBytesLeft : kMinEntrySize;
    const UInt64 needed = (UInt64{m_EntriesLeft} - 1) * kMinEntrySize + leftOfThisEntry;
    return m_Position <= streamSize && needed <= streamSize - m_Position;
}
