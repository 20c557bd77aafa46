// What the tests of the archive reader share: archives opened without a disk, random ranges, a look at the cache.
#pragma once

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <string>

// A view into the reader, for what its callers can't see.
struct ArchiveStorageReaderTestAccess {
    using Reader = ArchiveStorageReader;

    static size_t CachedBlockCount(Reader& reader) {
        Mutex::AutoLock lock(reader.m_CacheLock);
        return reader.m_CachedBlocks.size();
    }
    // Whether no record is claimed or read, as it must be between calls.
    static bool IsCacheIdle(Reader& reader) {
        Mutex::AutoLock lock(reader.m_CacheLock);
        for (Reader::CachedBlock* block : reader.m_CachedBlocks)
            if (block->beingWritten.load() != 0 || block->bufferReaders.load() != 0) return false;
        return true;
    }
    // How many uses of records there are now, and how many of them the record with the most has.
    struct Uses {
        SInt32 total = 0, most = 0;
    };
    static Uses CountUses(Reader& reader) {
        Mutex::AutoLock lock(reader.m_CacheLock);
        Uses uses;
        for (Reader::CachedBlock* block : reader.m_CachedBlocks) {
            const SInt32 readers = block->bufferReaders.load();
            uses.total += readers;
            uses.most = std::max(uses.most, readers);
        }
        return uses;
    }
    static void EmptyCache(Reader& reader) { reader.EmptyCache(); }
    static const IDecompressor* GetDecompressor(Reader& reader, CompressionType type) {
        return reader.GetDecompressor(type);
    }
    // The CacheResult of filling a record with a block, which is released again.
    static int Fill(Reader& reader, UInt32 blockIndex) {
        const UInt64 end = reader.m_CompressedBlocksOffsets.back();
        Reader::BatchingFileReader batch(&reader, 0, 0, end);
        Reader::CacheResult result = Reader::kCacheResultOk;
        Reader::CachedBlock* record = reader.AcquireAndPrefillUnusedBlock(blockIndex, &result, &batch);
        EXPECT_EQ(record == nullptr, reader.IsBlockStreamed(blockIndex) ? result < 0 : result != 0);
        if (record == nullptr) return result;
        reader.EmptyCache(); // frees what is not in use
        EXPECT_EQ(1u, CachedBlockCount(reader));
        reader.ReleaseCachedBlock(record, reader.IsBlockStreamed(blockIndex));
        return result;
    }
    static bool ReadStored(Reader& reader, UInt64 position, UInt64 size, void* destination, UInt64* delivered) {
        return reader.ReadFromStorage(position, size, destination, delivered);
    }
};

// An archive in memory and a reader over it. The description is built, and then cut or changed by the caller.
class OpenedArchive {
public:
    explicit OpenedArchive(const ArchiveDescription& description) : OpenedArchive(BuildArchive(description)) {}
    explicit OpenedArchive(BuiltArchive archive)
        : OpenedArchive(std::move(archive), [](std::string& bytes) {
              return MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionRead, bytes.data(),
                                                       bytes.size(), false);
          }) {}
    // Through an entry that a function makes of the archive's bytes.
    template <typename MakeEntry>
    OpenedArchive(BuiltArchive archive, MakeEntry makeEntry)
        : built(std::move(archive)),
          m_Entry(makeEntry(built.bytes)),
          reader(kMemLabelFileSystem),
          result(reader.Initialize(m_Entry, 0, true, true)) {}

    // The bytes that one call delivers; "refused" when it answers false.
    std::string Read(UInt64 from, UInt64 size, FileReadFlags flags = kFileReadFlagsNone) {
        std::string bytes(static_cast<size_t>(size), '\xEE');
        UInt64 count = 0;
        if (!reader.Read(from, size, bytes.data(), &count, flags)) return "refused";
        bytes.resize(static_cast<size_t>(count));
        return bytes;
    }

    BuiltArchive built;

private:
    FileSystemEntry m_Entry;

public:
    ArchiveStorageReader reader;
    int result;
};

// Text that compresses, and in which every place looks different.
inline std::string SampleText(size_t size) {
    std::string text;
    for (int line = 0; text.size() < size; ++line)
        text += "line " + std::to_string(line * 7919) + " of the sample\n";
    text.resize(size);
    return text;
}
