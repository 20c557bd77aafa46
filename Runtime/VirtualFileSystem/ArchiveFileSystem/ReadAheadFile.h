// Reads an open file through a buffer, so that a parser that asks for a few bytes at a time and steps back and forth
// costs one call of the file for many fields. It answers what a file on disk would.
//
//   ReadAheadFile ahead(&file);   // file stays open, and untouched by others, for as long as this is used
//   file.Seek(...);               // afterwards, since its position is anywhere then
//
// For reading only. One thread at a time.
#pragma once

#include "Runtime/VirtualFileSystem/IFile.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

class ReadAheadFile final : public IFile {
public:
    // Begins at the file's position.
    explicit ReadAheadFile(FileAccessor* file);

    bool IsOpen() const override { return true; }
    bool Close() override { return true; }

    bool Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;

    // False, as the file's own, when nothing is left.
    bool Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;

    bool Write(VFS::FileSize, UInt64, const void*, UInt64*) override { return false; }
    bool Write(UInt64, const void*, UInt64*) override { return false; }

    // kFileOriginEnd counts as the file counts it.
    bool Seek(VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position() const override { return m_Position; }
    bool SetLength(VFS::FileSize) override { return false; }
    VFS::FileSize Size() const override;

private:
    static constexpr UInt64 kBufferSize = 16'384;

    bool SeekFile(VFS::FileOffset position);

    FileAccessor* m_File;
    UInt64 m_FilePosition; // of m_File
    UInt64 m_Position;     // of the next byte that is read
    UInt64 m_BufferStart;  // the buffer holds the file's bytes [m_BufferStart, m_BufferEnd)
    UInt64 m_BufferEnd;
    UInt8 m_Buffer[kBufferSize];
};
