// Follows a ZarvoWeb directory through the data stream piece by piece and tells when its last entry has passed, so that
// it is parsed once, not after every piece. Keeps no bytes. One thread at a time.
#pragma once

#include "Runtime/Core/Types.h"

class LegacyDirectoryScanner {
public:
    // Scans the size bytes that follow those scanned before. The answer is IsComplete().
    bool Scan(const UInt8* data, size_t size);

    // The whole directory has been seen.
    bool IsComplete() const { return m_CountBytesSeen == sizeof(UInt32) && m_EntriesLeft == 0; }

    // Whether a stream of that many bytes can hold what is still to come. A count of entries that it can't hold means
    // that there is no directory.
    bool CanCompleteWithin(UInt64 streamSize) const;

    // How many bytes of the stream have been scanned.
    UInt64 Position() const { return m_Position; }

private:
    UInt64 m_Position = 0;
    UInt32 m_CountBytesSeen = 0;     // of the entry count, big-endian
    UInt32 m_EntriesLeft = 0;        // the count, once all its bytes have been seen
    UInt32 m_EntryTailBytesLeft = 0; // of the offset and size behind an entry's path; 0: in a path
};
