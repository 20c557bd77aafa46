// How one call of the reader's Read gets stored bytes. Private to the reader.
#pragma once

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

// Reads straight from the file, or, when the call spans blocks, out of a window that is read ahead. Positions are those
// of stored bytes.
class ArchiveStorageReader::BatchingFileReader {
public:
    static constexpr UInt64 kBatchSize = 4'194'304;

    // The call may read [startPos, endPos). Without batchSize there is no window; with it, the window holds nothing
    // from wantedEnd on, unless a read asks for that.
    BatchingFileReader(Storage* storage, UInt64 batchSize, UInt64 startPos, UInt64 endPos, UInt64 wantedEnd);

    // False when the file can't be read or memory is refused. *delivered is less than size where the file ends.
    [[nodiscard]] bool Read(void* destination, UInt64 position, UInt64 size, UInt64* delivered);

private:
    Storage* m_Storage;
    UInt64 m_BatchSize;
    UInt64 m_StartPos;
    UInt64 m_EndPos;
    UInt64 m_WantedEnd;
    UInt64 m_LoadedWindowStart = 0;
    UInt64 m_LoadedWindowEnd = 0;
    dynamic_array<UInt8> m_Buffer;
};
