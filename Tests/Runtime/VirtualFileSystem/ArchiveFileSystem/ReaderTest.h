// Shared by the tests of the archive reader: archives on a disk that a test may disturb, and a look at the cache.
#pragma once

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/CachedBlock.h"
#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/FaultyFileSystem.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>
#include <random>

// Shows what the reader's callers can't see.
struct ArchiveStorageReaderTestAccess {
    struct Cache {
        size_t records;
        unsigned uses = 0;    // by readers
        unsigned claimed = 0; // of the records

        bool operator==(const Cache&) const = default;
        friend void PrintTo(const Cache& cache, std::ostream* out) {
            *out << cache.records << " records, " << cache.uses << " uses, " << cache.claimed << " claimed";
        }
    };
    static Cache Look(ArchiveStorageReader& reader) {
        Mutex::AutoLock lock(reader.m_CacheLock);
        Cache cache{reader.m_CachedBlocks.size()};
        for (const auto* block : reader.m_CachedBlocks) {
            cache.uses += static_cast<unsigned>(block->bufferReaders.load());
            cache.claimed += block->IsClaimed();
        }
        return cache;
    }
    static void EmptyCache(ArchiveStorageReader& reader) { reader.EmptyCache(); }
    static Mutex& CacheLock(ArchiveStorageReader& reader) { return reader.m_CacheLock; }
    // The number of blocks that a read of the whole stream looks at.
    static UInt32 CountBlocksToRead(const ArchiveStorageReader& reader) {
        UInt32 count = 0;
        for (UInt32 index = 0; index < reader.GetBlockCount(); index = reader.NextBlock(index))
            ++count;
        return count;
    }
    static std::string ReadStored(ArchiveStorageReader& reader, UInt64 position, UInt64 size) {
        std::string bytes(size, '\xEE');
        UInt64 count = 0;
        EXPECT_TRUE(reader.m_Storage.ReadFromStorage(position, size, bytes.data(), &count));
        return bytes.substr(0, count);
    }
    static const auto& Blocks(const ArchiveStorageReader& reader) { return reader.m_BlocksInfo.storageBlocks; }
};
using Access = ArchiveStorageReaderTestAccess;

// Stands between the readers and the disk: reads wait while it is shut, are counted, and may fail.
struct DisturbedDisk : FaultyFileSystem {
    using FaultyFileSystem::Read;
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override {
        isShut.wait(true);
        bytes += size;
        if (++reads % failsEvery == 0 || failures-- > 0) return false;
        return FaultyFileSystem::Read(entry, size, buffer, actual, flags);
    }

    std::atomic<bool> isShut = false;
    std::atomic<int> failures = 0; // so many of the next reads fail
    std::atomic<UInt64> reads = 0, bytes = 0, failsEvery = ~UInt64{0};
};

inline const std::string kRefused = "refused";

// An archive on disk, after offset other bytes, and a reader of it.
struct OpenedArchive {
    explicit OpenedArchive(const std::string& bytes, size_t offset = 0) {
        WriteFile(path, std::string(offset, '!') + bytes);
        result = reader.Initialize(core::string(path.c_str()), offset);
    }
    explicit OpenedArchive(const ArchiveDescription& description) : OpenedArchive(BuildArchive(description).bytes) {}

    // The bytes that one call delivers; kRefused when it answers false.
    std::string Read(UInt64 from, UInt64 size, FileReadFlags flags = kFileReadFlagsNone) {
        std::string text(size, '\xEE');
        UInt64 count = 0;
        if (!reader.Read(from, size, text.data(), &count, flags)) return kRefused;
        return text.substr(0, count);
    }

    const TemporaryFolder folder;
    const std::string path = folder / "archive";
    ArchiveStorageReader reader{kMemLabelFileSystem};
    int result;
};

// Text that compresses, and of which no two lines are equal.
inline std::string SampleText(size_t size) {
    std::string text;
    for (int line = 0; text.size() < size; ++line)
        text += "line " + std::to_string(line * 7919) + " of the sample\n";
    return text.substr(0, size);
}
