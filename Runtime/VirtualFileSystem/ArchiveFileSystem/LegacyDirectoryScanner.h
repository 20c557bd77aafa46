// Follows a ZarvoWeb directory through the data stream, piece by piece, and tells when it has seen the last entry: so
// the directory is parsed once, not after each piece. Keeps no bytes. One thread at a time.
#pragma once

#include "Runtime/Core/Types.h"

class LegacyDirectoryScanner {
public:
    // Scans the next size bytes of the stream. Answers IsComplete().
    bool Scan(const UInt8* data, size_t size);

    // The whole directory has been seen.
    bool IsComplete() const { return m_CountBytesSeen == sizeof(UInt32) && m_EntriesLeft == 0; }

    // Whether a stream of streamSize bytes can hold the entries still to come. If it can't, it holds no directory.
    bool CanCompleteWithin(UInt64 streamSize) const;

    // How many bytes of the stream have been scanned.
    UInt64 Position() const { return m_Position; }

private:
    UInt64 m_Position = 0;
    UInt32 m_CountBytesSeen = 0;     // of the entry count, big-endian
    UInt32 m_EntriesLeft = 0;        // the count, once all its bytes have been seen
    UInt32 m_EntryTailBytesLeft = 0; // of the offset and size after an entry's path; 0: in a path
};
