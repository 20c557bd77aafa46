#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ReadAheadFile.h"

#include <algorithm>
#include <cstring>

ReadAheadFile::ReadAheadFile(FileAccessor* file)
    : m_File(file),
      m_FilePosition(file->Position().Cast<UInt64>()),
      m_Position(m_FilePosition),
      m_BufferStart(m_FilePosition),
      m_BufferEnd(m_FilePosition) {}

bool ReadAheadFile::Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags flags) {
    return Seek(VFS::FileOffset(from), kFileOriginBegin) && Read(size, out, actual, flags);
}

bool ReadAheadFile::Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) {
    UInt8* const to = static_cast<UInt8*>(out);
    UInt64 delivered = 0;
    while (delivered < size) {
        if (m_Position >= m_BufferStart && m_Position < m_BufferEnd) {
            const UInt64 count = std::min(size - delivered, m_BufferEnd - m_Position);
            memcpy(to + delivered, m_Buffer + (m_Position - m_BufferStart), static_cast<size_t>(count));
            delivered += count;
            m_Position += count;
            continue;
        }
        if (m_FilePosition != m_Position && !SeekFile(VFS::FileOffset(VFS::FileSize(m_Position)))) break;
        const bool isLarge = size - delivered >= kBufferSize;
        if (!isLarge) m_BufferEnd = m_BufferStart; // a failed read may still write to the buffer
        UInt64 count = 0;
        if (!m_File->Read(isLarge ? size - delivered : kBufferSize, isLarge ? to + delivered : m_Buffer, &count, flags))
            break;
        if (count == 0) break;
        m_FilePosition += count;
        if (isLarge) {
            delivered += count;
            m_Position += count;
        } else {
            m_BufferStart = m_Position;
            m_BufferEnd = m_FilePosition;
        }
    }
    if (actual != nullptr) *actual = delivered;
    return delivered != 0;
}

bool ReadAheadFile::Seek(VFS::FileOffset offset, FileOrigin origin) {
    if (origin == kFileOriginEnd) {
        if (!m_File->Seek(offset, origin)) return false;
        m_FilePosition = m_Position = m_File->Position().Cast<UInt64>();
        return true;
    }
    SInt64 target = offset.Cast<SInt64>();
    if (origin == kFileOriginCurrent && __builtin_add_overflow(target, static_cast<SInt64>(m_Position), &target))
        return false;
    const bool isBuffered =
        target >= 0 && static_cast<UInt64>(target) >= m_BufferStart && static_cast<UInt64>(target) <= m_BufferEnd;
    if (!isBuffered && !SeekFile(target)) return false;
    m_Position = static_cast<UInt64>(target);
    return true;
}

VFS::FileSize ReadAheadFile::Size() const {
    (void)m_File->Seek(0, kFileOriginEnd);
    const VFS::FileSize size = m_File->Position();
    (void)m_File->Seek(VFS::FileOffset(VFS::FileSize(m_FilePosition)), kFileOriginBegin);
    return size;
}

bool ReadAheadFile::SeekFile(VFS::FileOffset position) {
    if (!m_File->Seek(position, kFileOriginBegin)) return false;
    m_FilePosition = position.Cast<UInt64>();
    return true;
}
