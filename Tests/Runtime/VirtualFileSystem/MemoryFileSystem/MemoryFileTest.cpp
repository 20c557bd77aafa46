#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"
#include "Tests/Support/ReportRecorder.h"

#include <algorithm>
#include <atomic>
#include <gtest/gtest.h>
#include <memory>
#include <random>
#include <set>
#include <thread>

namespace {

using Reports = std::vector<std::string>;

const std::string kFolder = "./Runtime/VirtualFileSystem/";
const std::string kDirtyRead = kFolder + "MemoryFileSystem/MultiBlocksMemoryFileData:80: Assertion failed in "
                                         "MultiBlocksMemoryFileData::Read(): Dirty data read \n";
const std::string kNegative = kFolder + "VirtualFileSystemTypes:128: Casting a negative value into an unsigned type.";

// In blocks of that size; 0: in one buffer.
std::shared_ptr<MemoryFileData> MakeData(size_t blockSize) {
    constexpr MemLabelIdentifier kLabel = kMemLabelGeneral;
    MemoryFileData* data = nullptr;
    if (blockSize == 0) data = New<SingleBlockMemoryFileData>(kLabel, kLabel, nullptr, size_t{0}, false);
    if (blockSize != 0) data = New<MultiBlocksMemoryFileData>(kLabel, kLabel, blockSize);
    return {data, [](MemoryFileData* last) { last->Release(); }};
}

std::string Read(const MemoryFileData& data, UInt64 from = 0, UInt64 size = 10000) {
    std::string text(size, '?');
    text.resize(data.Read(from, size, text.data()));
    return text;
}
UInt64 Write(MemoryFileData& data, UInt64 from, const std::string& text) {
    return data.Write(from, text.size(), text.data());
}

} // namespace

TEST(MemoryFileData, HoldsWhatATwinDoesAndReportsReadsOfUnwrittenBlocks) {
    constexpr size_t kMaxLength = 4000;
    for (const size_t blockSize : std::initializer_list<size_t>{0, 1, 7, 16, 1000, 8192}) {
        std::mt19937 random(static_cast<unsigned>(blockSize));
        const auto data = MakeData(blockSize);
        const size_t span = blockSize == 0 ? kMaxLength : blockSize; // of what is written and freed as a whole
        std::string twin(kMaxLength, '\0');                          // all that the blocks hold
        std::set<size_t> written;                                    // indices of blocks
        size_t length = 0;
        ReportRecorder reports;
        for (int step = 0; step < 300; ++step) {
            SCOPED_TRACE(testing::Message() << "block size (and seed) " << blockSize << " step " << step);
            const size_t from = random() % (blockSize == 0 ? std::min(length + 1, kMaxLength) : kMaxLength);
            if (step % 50 == 49) { // cut, or extended: kept blocks keep their bytes
                data->SetLength(length = from);
                written.erase(written.upper_bound(length / span), written.end());
                const size_t kept = std::min((length / span + 1) * span, kMaxLength);
                twin.replace(kept, std::string::npos, kMaxLength - kept, '\0');
            } else if (step % 2 == 0) {
                const std::string piece(random() % std::min<size_t>(kMaxLength - from, 200), static_cast<char>(step));
                ASSERT_EQ(Write(*data, from, piece), piece.size());
                twin.replace(from, piece.size(), piece);
                length = std::max(length, from + piece.size());
                for (size_t byte = from; byte < from + piece.size(); ++byte)
                    written.insert(byte / span);
            }
            const size_t start = random() % (length + 1), count = std::min(length - start, random() % kMaxLength + 1);
            size_t unwritten = 0;
            for (size_t block = start / span; count != 0 && block <= (start + count - 1) / span; ++block)
                unwritten += written.count(block) == 0;
            ASSERT_EQ(Read(*data, start, count), twin.substr(start, count));
            ASSERT_EQ(reports.Take(), Reports(unwritten, kDirtyRead));
            ASSERT_EQ(data->Size(), length);
        }
        MemoryFileData* copy = data->Clone();
        EXPECT_EQ(Read(*copy), twin.substr(0, length));
        EXPECT_EQ(Write(*copy, 0, "changed"), 7u);
        copy->Release();
        EXPECT_EQ(Read(*data), twin.substr(0, length));
    }
}

TEST(MemoryFileData, RefusedMemoryAndPositionsPastTheLastStoreNothing) {
    for (const size_t blockSize : std::initializer_list<size_t>{0, 1, 8192}) {
        const auto data = MakeData(blockSize);
        EXPECT_EQ(Write(*data, 0, "kept"), 4u);
        for (const UInt64 from : {1ull << 60, ~0ull - 5, ~0ull}) {
            EXPECT_EQ(Write(*data, from, "x") + data->Write(2, from, "x"), 0u) << from;
            data->SetLength(from);
            EXPECT_EQ(Read(*data, from), "") << from;
        }
        EXPECT_EQ(Read(*data), "kept") << blockSize;
    }
}

TEST(MemoryFileData, LockHandsOutTheBytesOrACopyOfSeveralBlocksAndKeepsOtherThreadsOut) {
    for (const size_t blockSize : std::initializer_list<size_t>{0, 16}) {
        const auto data = MakeData(blockSize);
        const auto overwrite = [&data](const std::string& text) {
            void* contents = data.get();
            EXPECT_TRUE(data->Lock(&contents) && data->Size() < 100); // this thread's own operations go on
            std::atomic<bool> isStored = false;
            std::thread other([&] { isStored = Write(*data, 16, ", longer") == 8; });
            for (int turn = 0; turn < 1000; ++turn)
                std::this_thread::yield();
            EXPECT_FALSE(isStored);
            if (contents != nullptr) text.copy(static_cast<char*>(contents), text.size());
            data->Unlock(contents);
            other.join();
        };
        EXPECT_EQ(Write(*data, 0, "written, 16 long"), 16u);
        overwrite("changed,");
        overwrite(blockSize == 0 ? "changed," : "is lost,");
        EXPECT_EQ(Read(*data), "changed, 16 long, longer");
        data->SetLength(0);
        overwrite("not there");
    }
}

TEST(MemoryFile, ReadsAndSeeksReachOnlyWhatLiesInTheFile) {
    ReportRecorder reports;
    MemoryFile file(kMemLabelGeneral, nullptr, kFilePermissionReadWrite);
    EXPECT_TRUE(file.Write(12, "twelve bytes", nullptr));
    using ReadRow = std::tuple<UInt64, UInt64, bool, std::string>;
    for (const auto& [from, size, answer, text] :
         {ReadRow(0, 6, true, "twelve"), ReadRow(7, 100, true, "bytes"), ReadRow(12, 4, true, ""),
          ReadRow(13, 4, false, ""), ReadRow(13, 0, false, ""), ReadRow(~0ull, 2, false, "")}) {
        UInt64 actual = 1;
        char bytes[101] = {};
        EXPECT_TRUE(file.Seek(5, kFileOriginBegin));
        EXPECT_EQ(file.Read(from, size, bytes, &actual, kFileReadFlagsNone), answer);
        EXPECT_EQ(std::string(bytes, actual), text) << from;
        EXPECT_EQ(file.Position(), actual == 0 ? 5 : from + actual);
    }
    using SeekRow = std::tuple<SInt64, int, int>; // offset, origin and the position afterwards; -1: refused
    for (const auto& [offset, origin, target] :
         {SeekRow(0, 1, 0), SeekRow(12, 1, 12), SeekRow(13, 1, -1), SeekRow(-1, 1, -1), SeekRow(-5, 2, 0),
          SeekRow(-6, 2, -1), SeekRow(7, 2, 12), SeekRow(8, 2, -1), SeekRow(INT64_MAX, 2, -1), SeekRow(0, 3, 12),
          SeekRow(10, 3, 2), SeekRow(13, 3, -1), SeekRow(-1, 3, -1), SeekRow(INT64_MIN, 3, -1), SeekRow(0, 4, -1)}) {
        EXPECT_TRUE(file.Seek(5, kFileOriginBegin));
        EXPECT_EQ(file.Seek(offset, static_cast<FileOrigin>(origin)), target != -1) << offset << " from " << origin;
        EXPECT_EQ(file.Position(), static_cast<UInt64>(target == -1 ? 5 : target)) << offset << " from " << origin;
    }
    EXPECT_EQ(reports.Take(), Reports{kNegative});
    // Stores nothing, and leaves the position there, which must not wrap into the file.
    EXPECT_TRUE(file.Write(~0ull, 1, "x", nullptr) && !file.Seek(5, kFileOriginCurrent));
}

TEST(MemoryFile, PermissionAndCloseDecideWhatIsRefusedAndReported) {
    using Row = std::tuple<FilePermission, bool, bool>;
    const std::string text = "Assertion failed on expression: '", start = kFolder + "MemoryFileSystem/MemoryFile:";
    for (const auto& [permission, reads, writes] :
         {Row(kFilePermissionRead, true, false), Row(kFilePermissionWrite, false, true),
          Row(kFilePermissionReadWrite, true, true), Row(kFilePermissionAppend, false, true)}) {
        Reports expected;
        if (!writes) expected = {start + "64: " + text + "IsWritable()'", start + "109: " + text + "IsWritable()'"};
        if (!reads) expected.push_back(start + "37: " + text + "IsReadable()'");
        MemoryFile file(kMemLabelGeneral, nullptr, permission);
        for (const bool isOpen : {true, false}) {
            SCOPED_TRACE(testing::Message() << "permission " << permission << " open " << isOpen);
            ReportRecorder reports;
            char bytes[4];
            EXPECT_EQ(file.Write(3, "abc", nullptr) + file.SetLength(2), writes && isOpen ? 2 : 0);
            EXPECT_EQ(file.Read(0, 4, bytes, nullptr, kFileReadFlagsNone), reads && isOpen);
            EXPECT_EQ(reports.Take(), expected);
            EXPECT_EQ(file.Size(), writes && isOpen ? 2u : 0u);
            EXPECT_TRUE(file.Seek(0, kFileOriginBegin) == isOpen && file.IsOpen() == isOpen && file.Close());
        }
    }
}

// What is leaked, or freed twice, the address sanitizer reports.
TEST(MemoryFile, EntryWrapsMemoryThatGrowsOnlyWhenTakenOver) {
    for (const bool isOwned : {false, true}) {
        char callers[] = "................", text[32] = {};
        void* memory = callers;
        if (isOwned) memory = malloc_internal(16, 16, kMemLabelGeneral, kAllocateOptionNone, __FILE__, __LINE__);
        memset(memory, '.', 16);
        FileSystemEntry entry =
            MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionReadWrite, memory, 16, isOwned);
        FileAccessor accessor;
        UInt64 written = 0, count = 0;
        EXPECT_TRUE(accessor.Open(entry, kFilePermissionRead) && accessor.Seek(6, kFileOriginEnd));
        EXPECT_TRUE(accessor.Write(10, "0123456789", &written) && accessor.Read(8, 32, text, &count));
        EXPECT_STREQ(text, isOwned ? "..0123456789" : "..012345");
        EXPECT_TRUE(accessor.Write(1, "x", &count) && accessor.Position() == (isOwned ? 21u : 16u));
        EXPECT_EQ(written + count, isOwned ? 11u : 6u);
        EXPECT_TRUE(accessor.Close() && !accessor.Close()); // the adapter is gone
        EXPECT_STREQ(callers, isOwned ? "................" : "..........012345");
    }
}
