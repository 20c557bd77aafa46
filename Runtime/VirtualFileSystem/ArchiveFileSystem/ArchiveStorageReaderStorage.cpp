// Stored bytes: the archive's file, who uses it, and how its bytes reach one call of Read.
#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/BatchingFileReader.h"

#include <algorithm>
#include <cstring>

void ArchiveStorageReader::Storage::SetEntry(FileSystemEntry& entry, bool canRelease) {
    m_Entry = entry;
    m_LastModified = entry.LastModified();
    if (entry.lastError == kFileSystemErrorNotSupported) m_CheckModificationTime = false;
    m_CanRelease = canRelease;
}

bool ArchiveStorageReader::Storage::MakeUsed(bool reportErrors) {
    Mutex::AutoLock lock(m_Lock);
    if (m_UseCount++ == 0 && !m_File.Open(m_Entry, kFilePermissionRead)) {
        if (reportErrors) ReportError(Format("Unable to open archive file: %s", m_Entry.Path()).c_str());
        return false;
    }
    if (!m_CheckModificationTime) return true;
    const DateTime lastModified = m_Entry.LastModified();
    if (m_Entry.lastError != kFileSystemErrorNone)
        ReportFailedCheck(Format("Unexpected FileSystemError code %i after call to FileSystemEntry::LastModified() \n",
                                 static_cast<int>(m_Entry.lastError))
                              .c_str());
    if (lastModified == m_LastModified) return true;
    if (reportErrors)
        ReportError(
            Format("Archive file was modified while it was opened, and can no longer be accessed: %s", m_Entry.Path())
                .c_str());
    return false;
}

bool ArchiveStorageReader::Storage::MakeUnused() {
    if (!m_CanRelease) return false;
    Mutex::AutoLock lock(m_Lock);
    Check(m_UseCount >= 1, "ArchiveStorageReader has mismatched MakeStorageUsed/MakeStorageUnused calls");
    if (m_UseCount-- != 1) return false;
    (void)m_File.Close(); // opened for reading: nothing is lost
    return true;
}

// With a hidden LZMA size field, positions 0 to 4 are the properties, and position 5 is the first byte after the field.
void ArchiveStorageReader::Storage::Locate(UInt64 position, UInt64 size, Block::Piece (&pieces)[2]) const {
    const UInt64 filePosition = m_DataOffset + position;
    pieces[0] = {filePosition, size};
    pieces[1] = {0, 0};
    if (!m_HideLzmaSizeField) return;
    if (position >= kLzmaPropertiesSize) {
        pieces[0].offset += kLzmaSizeFieldSize;
    } else if (size > kLzmaPropertiesSize - position) {
        pieces[0].size = kLzmaPropertiesSize - position;
        pieces[1] = {m_DataOffset + kLzmaPropertiesSize + kLzmaSizeFieldSize, size - pieces[0].size};
    }
}

bool ArchiveStorageReader::Storage::ReadFromStorage(UInt64 position, UInt64 size, void* destination,
                                                    UInt64* delivered) {
    Block::Piece pieces[2];
    Locate(position, size, pieces);
    UInt8* const to = static_cast<UInt8*>(destination);
    UInt64 first = 0;
    UInt64 second = 0;
    Mutex::AutoLock lock(m_Lock);
    if (!m_File.Read(VFS::FileSize(pieces[0].offset), pieces[0].size, to, &first)) return false;
    // A first piece that is cut short ends the file: the bytes of the second must not take the place of what is
    // missing.
    if (pieces[1].size != 0 && first == pieces[0].size &&
        !m_File.Read(VFS::FileSize(pieces[1].offset), pieces[1].size, to + first, &second))
        return false;
    *delivered = first + second;
    return true;
}

bool ArchiveStorageReader::Storage::EndsBy(UInt64 position) {
    Block::Piece pieces[2];
    Locate(position, 1, pieces);
    Mutex::AutoLock lock(m_Lock);
    return m_File.Seek(0, kFileOriginEnd) && m_File.Position() <= VFS::FileSize(pieces[0].offset);
}

ArchiveStorageReader::BatchingFileReader::BatchingFileReader(Storage* storage, UInt64 batchSize, UInt64 startPos,
                                                             UInt64 endPos, UInt64 wantedEnd)
    : m_Storage(storage),
      m_BatchSize(batchSize),
      m_StartPos(startPos),
      m_EndPos(endPos),
      m_WantedEnd(wantedEnd),
      m_Buffer(kMemLabelReadBatch) {}

bool ArchiveStorageReader::BatchingFileReader::Read(void* destination, UInt64 position, UInt64 size,
                                                    UInt64* delivered) {
    Check(position >= m_StartPos, FixedReports::kBatchReadTooEarly);
    Check(position <= m_EndPos && size <= m_EndPos - position, FixedReports::kBatchReadTooFar);
    // A window would hold nothing beyond the rest of the wanted bytes.
    const bool isAllThatIsLeft = size != 0 && position >= m_LoadedWindowEnd && size == m_WantedEnd - position;
    if (m_BatchSize <= size || m_LoadedWindowStart > position || isAllThatIsLeft)
        return m_Storage->ReadFromStorage(position, size, destination, delivered);

    UInt64 current = position;
    UInt64 remaining = size;
    while (remaining != 0) {
        if (current >= m_LoadedWindowEnd) {
            const UInt64 end = current < m_WantedEnd ? m_WantedEnd : m_EndPos;
            const UInt64 length = std::min(m_BatchSize, end - current);
            if (!m_Buffer.resize_uninitialized(static_cast<size_t>(length), kResizeExact)) return false;
            UInt64 got = 0;
            if (!m_Storage->ReadFromStorage(current, length, m_Buffer.data(), &got)) return false;
            m_LoadedWindowStart = current;
            m_LoadedWindowEnd = current + got;
            if (got < remaining && got < length) remaining = got; // the file has ended
            if (got == 0) break;
        }
        const UInt64 count = std::min(remaining, m_LoadedWindowEnd - current);
        Check(current >= m_LoadedWindowStart && current + count <= m_LoadedWindowEnd,
              FixedReports::kBatchCopyOutsideWindow);
        memcpy(static_cast<UInt8*>(destination) + (current - position),
               m_Buffer.data() + (current - m_LoadedWindowStart), static_cast<size_t>(count));
        current += count;
        remaining -= count;
    }
    *delivered = current - position;
    return true;
}
