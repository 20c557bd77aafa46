// Reads an open file through a buffer: a parser that reads a few bytes at a time, and steps back and forth, then calls
// the file once for many fields. Answers as a file on disk would.
//
//   ReadAheadFile ahead(&file);   // nobody else may use the file meanwhile
//   file.Seek(...);               // afterwards: its position may be anywhere
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

    // False when nothing is left, as that of a file on disk.
    bool Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override;

    bool Write(VFS::FileSize, UInt64, const void*, UInt64*) override { return false; }
    bool Write(UInt64, const void*, UInt64*) override { return false; }

    // kFileOriginEnd is passed on to the file.
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
