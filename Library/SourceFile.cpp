#include "Library/SourceFile.h"

bool SourceFile::Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) {
    m_Position = position.Cast<UInt64>();
    return Read(size, buffer, actual, flags);
}

bool SourceFile::Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags) {
    size_t count = 0;
    Failure failure;
    const bool isOk = m_Source->ReadAt(m_Position, buffer, static_cast<size_t>(size), &count, &failure) == ZARVO_OK;
    if (!isOk) {
        if (m_Failure.code == ZARVO_OK) m_Failure = failure;
        count = 0;
    }
    m_Position += count;
    if (actual != nullptr) *actual = count;
    return count != 0;
}

bool SourceFile::Seek(VFS::FileOffset offset, FileOrigin origin) {
    SInt64 target = offset.Cast<SInt64>();
    UInt64 base = 0;
    if (origin == kFileOriginCurrent) base = m_Position;
    if (origin == kFileOriginEnd) base = m_Source->Size();
    if (__builtin_add_overflow(target, base, &target) || target < 0) return false;
    m_Position = static_cast<UInt64>(target);
    return true;
}
