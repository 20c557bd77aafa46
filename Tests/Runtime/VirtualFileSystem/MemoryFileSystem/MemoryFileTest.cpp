#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"
#include "Tests/Support/ReportRecorder.h"

#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <random>

static constexpr MemLabelIdentifier kLabel = kMemLabelGeneral;

struct ReleaseData {
    void operator()(const MemoryFileData* data) const { data->Release(); }
};
using OwnedData = std::unique_ptr<MemoryFileData, ReleaseData>;

static OwnedData MakeSingleBlock() {
    return OwnedData(New<SingleBlockMemoryFileData>(kLabel, kLabel, nullptr, 0u, false));
}
static OwnedData MakeBlocksOf(size_t blockSize) {
    return OwnedData(New<MultiBlocksMemoryFileData>(kLabel, kLabel, blockSize));
}

static std::string Read(const MemoryFileData& data, UInt64 from = 0, UInt64 size = 100'000) {
    std::string text(size, '?');
    return text.substr(0, data.Read(from, size, text.data()));
}

static std::vector<std::string> Reports(std::vector<std::string> texts) {
    for (std::string& text : texts)
        text = "./Runtime/VirtualFileSystem/" + text;
    return texts;
}

// Both forms of contents, the chain with blocks of several sizes.
class MemoryFileDataTest : public testing::TestWithParam<size_t> {
protected:
    bool IsSingleBlock() const { return GetParam() == 0; }

    const OwnedData data = IsSingleBlock() ? MakeSingleBlock() : MakeBlocksOf(GetParam());
};

INSTANTIATE_TEST_SUITE_P(BlockSize, MemoryFileDataTest, testing::Values(0, 1, 7, 1'000, 100'000),
                         [](const auto& test) { return test.param == 0 ? "Single" : std::to_string(test.param); });

TEST_P(MemoryFileDataTest, HoldsWhatATwinDoes) {
    std::mt19937 random(1);
    std::string twin;
    for (int step = 0; step < 500; ++step) {
        SCOPED_TRACE(step);
        const size_t from = random() % (twin.size() + 1);
        const std::string piece(random() % 200, static_cast<char>(step));
        if (step % 50 == 49) {
            data->SetLength(from);
            twin.resize(from);
        } else {
            ASSERT_EQ(piece.size(), data->Write(from, piece.size(), piece.data()));
            twin.replace(from, piece.size(), piece);
        }
        ASSERT_EQ(twin.size(), data->Size().Cast<UInt64>());
        ASSERT_EQ(twin.substr(from, 300), Read(*data, from, 300));
    }
    EXPECT_EQ(twin, Read(*data));
}

TEST_P(MemoryFileDataTest, LockGivesTheWholeContents) {
    const std::string text = "0123456789";
    ASSERT_EQ(text.size(), data->Write(0, text.size(), text.data()));
    void* contents = nullptr;
    EXPECT_TRUE(data->Lock(&contents));
    EXPECT_EQ(text, std::string(static_cast<char*>(contents), text.size()));
    *static_cast<char*>(contents) = 'L';
    data->Unlock(contents);
    const bool isInPlace = IsSingleBlock() || GetParam() >= text.size();
    EXPECT_EQ(isInPlace ? "L123456789" : text, Read(*data));
}

TEST_P(MemoryFileDataTest, EmptyContentsLockAsNull) {
    void* contents = this;
    EXPECT_TRUE(data->Lock(&contents));
    EXPECT_EQ(nullptr, contents);
    data->Unlock(contents);
}

TEST_P(MemoryFileDataTest, ACloneIsIndependent) {
    ASSERT_EQ(10u, data->Write(0, 10, "0123456789"));
    const OwnedData copy(data->Clone());
    EXPECT_EQ(1, copy->GetRefCount());
    EXPECT_EQ("0123456789", Read(*copy));
    EXPECT_EQ(7u, copy->Write(0, 7, "changed"));
    EXPECT_EQ("changed789", Read(*copy));
    EXPECT_EQ("0123456789", Read(*data));
}

TEST_P(MemoryFileDataTest, RefusedMemoryChangesNothing) {
    ASSERT_EQ(10u, data->Write(0, 10, "0123456789"));
    for (const UInt64 tooMuch : {1ull << 60, ~0ull - 5, ~0ull}) {
        data->SetLength(tooMuch);
        EXPECT_EQ(10u, data->Size().Cast<UInt64>()) << tooMuch;
        EXPECT_EQ(0u, data->Write(tooMuch, 1, "x")) << tooMuch;
        EXPECT_EQ(0u, data->Write(2, tooMuch, "x")) << tooMuch;
        EXPECT_EQ("", Read(*data, tooMuch)) << tooMuch;
    }
    EXPECT_EQ("0123456789", Read(*data));
}

TEST_P(MemoryFileDataTest, AWriteWaitsForTheLock) {
    for (const UInt64 size : {0u, 1u}) {
        void* contents = nullptr;
        EXPECT_TRUE(data->Lock(&contents));
        std::future<UInt64> write = std::async(std::launch::async, [&] { return data->Write(0, size, "x"); });
        EXPECT_EQ(std::future_status::timeout, write.wait_for(std::chrono::milliseconds(50))) << size;
        data->Unlock(contents);
        EXPECT_EQ(size, write.get());
    }
}

TEST(MultiBlocksMemoryFileData, AnEmptyWritePastTheEndExtends) {
    const OwnedData data = MakeBlocksOf(8);
    EXPECT_EQ(0u, data->Write(20, 0, ""));
    EXPECT_EQ(20u, data->Size().Cast<UInt64>());
}

TEST(MultiBlocksMemoryFileData, AnUnwrittenBlockReadsAsZerosAndIsReported) {
    const OwnedData data = MakeBlocksOf(8);
    EXPECT_EQ(1u, data->Write(16, 1, "x"));
    ReportRecorder reports;
    EXPECT_EQ(std::string(2, '\0') + "x", Read(*data, 14, 9));
    EXPECT_EQ(Reports({"MemoryFileSystem/MultiBlocksMemoryFileData:80: "
                       "Assertion failed in MultiBlocksMemoryFileData::Read(): Dirty data read \n"}),
              reports.Take());
}

TEST(MultiBlocksMemoryFileData, ABlockShowsNothingOfTheHeap) {
    const OwnedData data = MakeBlocksOf(64);
    EXPECT_EQ(1u, data->Write(63, 1, "x"));
    EXPECT_EQ(std::string(63, '\0') + "x", Read(*data));
}

TEST(MemoryFile, ReadsUpToTheEndOfTheFile) {
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    ASSERT_TRUE(file.Write(12, "twelve bytes", nullptr));
    struct {
        UInt64 from;
        bool isRead;
        UInt64 count, position; // the position afterwards
    } const kCases[] = {
        {.from = 7, .isRead = true, .count = 5, .position = 12},
        {.from = 3, .isRead = true, .count = 9, .position = 12},
        {.from = 12, .isRead = true, .count = 0, .position = 5},
        {.from = 13, .isRead = false, .count = 0, .position = 5},
    };
    for (const auto& c : kCases) {
        char bytes[100];
        UInt64 count = 99;
        ASSERT_TRUE(file.Seek(5, kFileOriginBegin));
        EXPECT_EQ(c.isRead, file.Read(c.from, sizeof(bytes), bytes, &count, kFileReadFlagsNone)) << c.from;
        EXPECT_EQ(c.count, count) << c.from;
        EXPECT_EQ(c.position, file.Position().Cast<UInt64>()) << c.from;
    }
}

TEST(MemoryFile, SeeksOnlyWithinTheFile) {
    constexpr UInt64 kSize = 12, kRefused = 5; // 5 is the position before each seek
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    ASSERT_TRUE(file.Write(kSize, "twelve bytes", nullptr));
    struct {
        SInt64 offset;
        FileOrigin origin;
        UInt64 position;
    } const kCases[] = {
        {.offset = 0, .origin = kFileOriginBegin, .position = 0},
        {.offset = 12, .origin = kFileOriginBegin, .position = kSize},
        {.offset = 13, .origin = kFileOriginBegin, .position = kRefused},
        {.offset = -5, .origin = kFileOriginCurrent, .position = 0},
        {.offset = -6, .origin = kFileOriginCurrent, .position = kRefused},
        {.offset = 7, .origin = kFileOriginCurrent, .position = kSize},
        {.offset = 8, .origin = kFileOriginCurrent, .position = kRefused},
        {.offset = INT64_MAX, .origin = kFileOriginCurrent, .position = kRefused},
        {.offset = 0, .origin = kFileOriginEnd, .position = kSize},
        {.offset = 10, .origin = kFileOriginEnd, .position = 2}, // counted backwards
        {.offset = 13, .origin = kFileOriginEnd, .position = kRefused},
        {.offset = INT64_MIN, .origin = kFileOriginEnd, .position = kRefused},
        {.offset = -1, .origin = kFileOriginEnd, .position = kRefused},
        {.offset = 0, .origin = FileOrigin(4), .position = kRefused},
    };
    for (const auto& c : kCases) {
        ASSERT_TRUE(file.Seek(kRefused, kFileOriginBegin));
        EXPECT_EQ(c.position != kRefused, file.Seek(c.offset, c.origin)) << c.offset << " from " << c.origin;
        EXPECT_EQ(c.position, file.Position().Cast<UInt64>()) << c.offset << " from " << c.origin;
    }
}

TEST(MemoryFile, ANegativePositionIsReported) {
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    ReportRecorder reports;
    EXPECT_FALSE(file.Seek(-1, kFileOriginBegin));
    EXPECT_EQ(Reports({"VirtualFileSystemTypes:128: Casting a negative value into an unsigned type."}), reports.Take());
}

TEST(MemoryFile, APositionDoesNotWrapIntoTheFile) {
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    ASSERT_TRUE(file.Write(12, "twelve bytes", nullptr));
    UInt64 count = 99;
    EXPECT_TRUE(file.Write(~0ull, 1, "x", &count));
    EXPECT_EQ(0u, count);
    EXPECT_FALSE(file.Seek(5, kFileOriginCurrent));
}

TEST(MemoryFile, ThePermissionDecidesWhatIsRefused) {
    const std::string file = "MemoryFileSystem/MemoryFile:";
    const std::string isReadable = "Assertion failed on expression: 'IsReadable()'";
    const std::string isWritable = "Assertion failed on expression: 'IsWritable()'";
    struct {
        FilePermission permission;
        bool canRead, canWrite;
    } const kCases[] = {
        {.permission = kFilePermissionRead, .canRead = true, .canWrite = false},
        {.permission = kFilePermissionWrite, .canRead = false, .canWrite = true},
        {.permission = kFilePermissionReadWrite, .canRead = true, .canWrite = true},
        {.permission = kFilePermissionAppend, .canRead = false, .canWrite = true},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.permission);
        ReportRecorder reports;
        std::vector<std::string> expected;
        if (!c.canRead) expected.push_back(file + "37: " + isReadable);
        if (!c.canWrite) expected.insert(expected.end(), {file + "64: " + isWritable, file + "109: " + isWritable});
        MemoryFile opened(kLabel, nullptr, c.permission);
        EXPECT_EQ(c.canRead, opened.Read(0, nullptr, nullptr, kFileReadFlagsNone));
        EXPECT_EQ(c.canWrite, opened.Write(3, "abc", nullptr));
        EXPECT_EQ(c.canWrite, opened.SetLength(2));
        EXPECT_EQ(c.canWrite ? 2u : 0u, opened.Size().Cast<UInt64>());
        EXPECT_EQ(Reports(expected), reports.Take());
    }
}

TEST(MemoryFile, AClosedFileFailsEveryOperation) {
    ReportRecorder reports;
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    ASSERT_TRUE(file.Write(3, "abc", nullptr));
    EXPECT_TRUE(file.IsOpen());
    EXPECT_TRUE(file.Close());
    EXPECT_FALSE(file.IsOpen());
    EXPECT_FALSE(file.Read(0, nullptr, nullptr, kFileReadFlagsNone));
    EXPECT_FALSE(file.Write(3, "abc", nullptr));
    EXPECT_FALSE(file.SetLength(2));
    EXPECT_FALSE(file.Seek(0, kFileOriginBegin));
    EXPECT_EQ(0u, file.Size().Cast<UInt64>());
    EXPECT_EQ(std::vector<std::string>(), reports.Take());
}

TEST(MemoryFile, FilesShareTheirContents) {
    const OwnedData data = MakeBlocksOf(8);
    MemoryFile writer(kLabel, data.get(), kFilePermissionWrite), reader(kLabel, data.get(), kFilePermissionRead);
    EXPECT_EQ(3, data->GetRefCount());
    char bytes[3] = {};
    EXPECT_TRUE(writer.Write(3, "abc", nullptr));
    EXPECT_EQ(0u, reader.Position().Cast<UInt64>());
    EXPECT_TRUE(reader.Read(3, bytes, nullptr, kFileReadFlagsNone));
    EXPECT_EQ("abc", std::string(bytes, sizeof(bytes)));
    EXPECT_TRUE(writer.Close());
    EXPECT_EQ(2, data->GetRefCount());
}

// The address sanitizer reports a leak, and memory that is freed twice, in these.
TEST(MemoryFile, AnEntryOverTheCallersMemoryDoesNotGrow) {
    char memory[17] = {};
    FileSystemEntry entry =
        MemoryFile::CreateFileSystemEntry(kLabel, kFilePermissionReadWrite, memory, sizeof(memory) - 1, false);
    FileAccessor accessor;
    UInt64 count = 0;
    EXPECT_TRUE(accessor.Open(entry, kFilePermissionRead));
    EXPECT_TRUE(accessor.Seek(6, kFileOriginEnd));
    EXPECT_TRUE(accessor.Write(10, "0123456789", &count));
    EXPECT_EQ(6u, count);
    EXPECT_EQ(16u, accessor.Size().Cast<UInt64>());
    EXPECT_TRUE(accessor.Close());
    EXPECT_STREQ("012345", memory + 10);
}

TEST(MemoryFile, AnEntryOverMemoryTakenOverGrows) {
    void* const memory = malloc_internal(16, 16, kLabel, kAllocateOptionNone, __FILE__, __LINE__);
    FileSystemEntry entry = MemoryFile::CreateFileSystemEntry(kLabel, kFilePermissionReadWrite, memory, 16, true);
    FileAccessor accessor;
    UInt64 count = 0;
    char text[10];
    EXPECT_TRUE(accessor.Open(entry, kFilePermissionRead));
    EXPECT_TRUE(accessor.Seek(6, kFileOriginEnd));
    EXPECT_TRUE(accessor.Write(10, "0123456789", &count));
    EXPECT_EQ(10u, count);
    EXPECT_TRUE(accessor.Read(10, sizeof(text), text, &count));
    EXPECT_EQ("0123456789", std::string(text, count));
    EXPECT_EQ(20u, accessor.Position().Cast<UInt64>());
    EXPECT_TRUE(accessor.Close());
}

TEST(MemoryFile, AnEntryServesOneOpen) {
    FileSystemEntry entry = MemoryFile::CreateFileSystemEntry(kLabel, kFilePermissionRead, nullptr, 0, false);
    FileAccessor accessor;
    EXPECT_TRUE(accessor.Open(entry, kFilePermissionRead));
    EXPECT_TRUE(accessor.Close());
    EXPECT_FALSE(accessor.Close()) << "the first has freed the adapter";
}
