// What the fuzz targets share. A target states a property and checks it with FuzzCheck, which is never compiled out.
// Parameters are taken from the end of the input, so that its start remains a valid sample.
#pragma once

#include "Runtime/Core/SourceLocation.h"
#include "Runtime/Core/Types.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include <vector>

inline void FuzzCheck(bool condition, SourceLocation where = SourceLocation::current()) {
    if (condition) return;
    fprintf(stderr, "property broken at %s:%u\n", where.file, static_cast<unsigned>(where.line));
    abort();
}

// The input without the parameters that have been taken from its end.
class FuzzInput {
public:
    FuzzInput(const std::uint8_t* data, size_t size) : m_Data(data), m_Size(size) {}

    // A number below bound, from up to four bytes at the end. bound must not be 0.
    UInt64 TakeBelow(UInt64 bound) {
        UInt64 value = 0;
        for (int count = 0; count < 4 && m_Size != 0; ++count)
            value = value << 8 | m_Data[--m_Size];
        return value % bound;
    }

    // A number below bound, which is at most 256, drawn from one byte.
    UInt64 TakeByteBelow(UInt64 bound) { return m_Size != 0 ? m_Data[--m_Size] % bound : 0; }

    const std::uint8_t* data() const { return m_Data; }
    size_t size() const { return m_Size; }

private:
    const std::uint8_t* m_Data;
    size_t m_Size;
};

// An open file whose contents are the bytes, which must outlive it.
class FuzzFile {
public:
    FuzzFile(const std::uint8_t* data, size_t size)
        : m_Entry(MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionRead,
                                                    const_cast<std::uint8_t*>(data), size, false)) {
        FuzzCheck(file.Open(m_Entry, kFilePermissionRead));
    }

private:
    FileSystemEntry m_Entry;

public:
    FileAccessor file;
};

// Discards what the log sink prints.
void SilenceConsole();
