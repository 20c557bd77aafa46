#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"
#include "Tests/Support/ReportRecorder.h"

#include <future>
#include <gtest/gtest.h>
#include <random>

static constexpr MemLabelIdentifier kLabel = kMemLabelGeneral;

static std::string Read(const MemoryFileData& data, UInt64 from = 0, UInt64 size = 100'000) {
    std::string text(size, '?');
    return text.substr(0, data.Read(from, size, text.data()));
}

TEST(MemoryFileData, HoldsWhatATwinDoes) {
    for (const size_t blockSize : {0u, 1u, 7u, 1'000u, 100'000u}) { // 0: in one buffer
        MemoryFileData* data = New<SingleBlockMemoryFileData>(kLabel, kLabel, nullptr, 0u, false);
        if (blockSize != 0) data->Release(), data = New<MultiBlocksMemoryFileData>(kLabel, kLabel, blockSize);
        std::mt19937 random(1);
        std::string twin;
        for (int step = 0; step < 500; ++step) {
            SCOPED_TRACE(testing::Message() << "blocks of " << blockSize << ", step " << step);
            const size_t from = random() % (twin.size() + 1);
            const std::string piece(random() % 200, static_cast<char>(step));
            if (step % 50 == 49) {
                data->SetLength(from);
                twin.resize(from);
            } else if (step % 50 == 48) {
                void* contents = nullptr;
                ASSERT_TRUE(data->Lock(&contents) && memcmp(contents, twin.data(), twin.size()) == 0);
                *static_cast<char*>(contents) = 'L';
                data->Unlock(contents);
                if (blockSize == 0 || blockSize >= twin.size()) twin[0] = 'L'; // else it was a copy
            } else {
                ASSERT_EQ(data->Write(from, piece.size(), piece.data()), piece.size());
                twin.replace(from, piece.size(), piece);
            }
            ASSERT_EQ(data->Size(), twin.size());
            ASSERT_EQ(Read(*data, from, 300), twin.substr(from, 300));
        }
        MemoryFileData* copy = data->Clone();
        EXPECT_TRUE(Read(*copy) == twin && copy->Write(0, 7, "changed") == 7);
        copy->Release();
        for (const UInt64 from : {1ull << 60, ~0ull - 5, ~0ull}) { // memory that is refused, and no positions
            data->SetLength(from);
            EXPECT_EQ(data->Write(from, 1, "x") + data->Write(2, from, "x") + Read(*data, from).size(), 0u) << from;
        }
        EXPECT_EQ(Read(*data), twin);
        data->Release();
    }
}

TEST(MemoryFileData, EveryWriteWaitsForTheLock) {
    MemoryFileData* const kForms[] = {New<SingleBlockMemoryFileData>(kLabel, kLabel, nullptr, 0u, false),
                                      New<MultiBlocksMemoryFileData>(kLabel, kLabel, size_t{8})};
    for (MemoryFileData* data : kForms) {
        for (const UInt64 size : {0u, 1u}) {
            void* contents = nullptr;
            data->Lock(&contents);
            std::future<UInt64> write = std::async(std::launch::async, [&] { return data->Write(0, size, "x"); });
            EXPECT_EQ(write.wait_for(std::chrono::milliseconds(100)), std::future_status::timeout) << size;
            data->Unlock(contents);
            EXPECT_EQ(write.get(), size);
        }
        data->Release();
    }
}

TEST(MemoryFile, ReadsAndSeeksReachOnlyWhatLiesInTheFile) {
    ReportRecorder reports;
    MemoryFile file(kLabel, nullptr, kFilePermissionReadWrite);
    UInt64 count = 0;
    char bytes[101] = {};
    EXPECT_TRUE(file.Write(12, "twelve bytes", nullptr) && file.Read(7, 100, bytes, &count, kFileReadFlagsNone));
    EXPECT_TRUE(count == 5 && file.Position() == 12 && file.Read(12, 4, bytes, &count, kFileReadFlagsNone));
    EXPECT_TRUE(count == 0 && !file.Read(13, 0, bytes, &count, kFileReadFlagsNone) && file.Position() == 12);
    const std::tuple<SInt64, int, UInt64> kSeeks[] = {
        // offset, origin, and the position: 5 when it is refused
        {0, 1, 0},         {12, 1, 12}, {13, 1, 5}, {-1, 1, 5}, {-5, 2, 0},        {-6, 2, 5}, {7, 2, 12}, {8, 2, 5},
        {INT64_MAX, 2, 5}, {0, 3, 12},  {10, 3, 2}, {13, 3, 5}, {INT64_MIN, 3, 5}, {-1, 3, 5}, {0, 4, 5}};
    for (const auto& [offset, origin, position] : kSeeks) {
        EXPECT_TRUE(file.Seek(5, kFileOriginBegin));
        EXPECT_EQ(file.Seek(offset, static_cast<FileOrigin>(origin)), position != 5) << offset << " from " << origin;
        EXPECT_EQ(file.Position(), position) << offset << " from " << origin;
    }
    // Stores nothing, and leaves the position there, which must not wrap into the file.
    EXPECT_TRUE(file.Write(~0ull, 1, "x", nullptr) && !file.Seek(5, kFileOriginCurrent));
    EXPECT_TRUE(file.Write(20'000, 1, "x", nullptr) && file.Read(16'383, 2, bytes, &count, kFileReadFlagsNone));
    const std::vector<std::string> log = reports.Take(); // of a negative position, and of a block that is not there
    EXPECT_TRUE(log[0].ends_with(":128: Casting a negative value into an unsigned type.") && *bytes + bytes[1] == 0);
    EXPECT_TRUE(log[1].ends_with(":80: Assertion failed in MultiBlocksMemoryFileData::Read(): Dirty data read \n"));
}

TEST(MemoryFile, PermissionAndCloseDecideWhatIsRefusedAndReported) {
    const auto read = [](MemoryFile& file) { return file.Read(0, nullptr, nullptr, kFileReadFlagsNone); };
    ReportRecorder reports;
    MemoryFile source(kLabel, nullptr, kFilePermissionRead), sink(kLabel, nullptr, kFilePermissionAppend);
    EXPECT_TRUE(sink.Write(3, "abc", nullptr) && sink.SetLength(2) && sink.Size() == 2 && read(source));
    EXPECT_FALSE(source.Write(3, "abc", nullptr) || source.SetLength(2) || read(sink));
    EXPECT_TRUE(reports.Take().size() == 3 && source.Close() && sink.IsOpen() && sink.Close() && !sink.IsOpen());
    EXPECT_FALSE(read(source) || sink.Write(3, "abc", nullptr) || sink.SetLength(2) || sink.Seek(0, kFileOriginBegin));
}

// What is leaked, or freed twice, the address sanitizer reports.
TEST(MemoryFile, EntryWrapsMemoryThatGrowsOnlyWhenTakenOver) {
    for (const bool isOwned : {false, true}) {
        char callers[17] = {}, text[32] = {};
        void* memory = callers;
        if (isOwned) memory = malloc_internal(16, 16, kLabel, kAllocateOptionNone, __FILE__, __LINE__);
        FileSystemEntry entry =
            MemoryFile::CreateFileSystemEntry(kLabel, kFilePermissionReadWrite, memory, 16, isOwned);
        FileAccessor accessor;
        UInt64 count = 0;
        EXPECT_TRUE(accessor.Open(entry, kFilePermissionRead) && accessor.Seek(6, kFileOriginEnd));
        EXPECT_TRUE(accessor.Write(10, "0123456789", &count) && count == (isOwned ? 10u : 6u));
        EXPECT_TRUE(accessor.Read(10, 32, text, &count) && accessor.Position() == (isOwned ? 20u : 16u));
        EXPECT_TRUE(accessor.Close() && !accessor.Close() && text[count - 1] == (isOwned ? '9' : '5')); // it is gone
        EXPECT_STREQ(callers + 10, isOwned ? "" : "012345");
    }
}
