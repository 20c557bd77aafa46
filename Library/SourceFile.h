// Presents a source as an open file, read only, for the runtime's reader. One thread at a time.
#pragma once

#include "Library/Source.h"
#include "Runtime/VirtualFileSystem/IFile.h"

class SourceFile final : public IFile {
public:
    // source outlives the file.
    explicit SourceFile(const Source* source) : m_Source(source) {}

    // Why the first read that failed did so; the reader only tells that one did. ZARVO_OK if none failed.
    const Failure& FirstFailure() const { return m_Failure; }

    bool IsOpen() const override { return true; }
    bool Close() override { return true; }

    // As with a file on disk: false when nothing could be read.
    bool Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override;
    bool Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override;

    bool Write(VFS::FileSize, UInt64, const void*, UInt64*) override { return false; }
    bool Write(UInt64, const void*, UInt64*) override { return false; }

    // A target before the start is refused, one past the end is not.
    bool Seek(VFS::FileOffset offset, FileOrigin origin) override;
    VFS::FileSize Position() const override { return m_Position; }
    bool SetLength(VFS::FileSize) override { return false; }
    VFS::FileSize Size() const override { return m_Source->Size(); }

private:
    const Source* m_Source;
    UInt64 m_Position = 0;
    Failure m_Failure;
};
