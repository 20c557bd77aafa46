#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/RefusedMemory.h"

#include <algorithm>
#include <filesystem>

namespace fs = std::filesystem;

TEST(ArchiveReader, FilesInOneBlockCostOneDecoding) {
    constexpr UInt64 kSize = 1'000'000;
    constexpr UInt64 kFile = 100;
    const std::string text = SampleText(kSize);
    enum Harm { kWhole, kDamaged, kCut };
    struct {
        const char* what;
        CompressionType type;
        bool streamed = false;
        Harm harm = kWhole;
    } const rows[] = {
        {.what = "LZMA stream", .type = kCompressionLzma, .streamed = true},
        {.what = "damaged LZMA stream", .type = kCompressionLzma, .streamed = true, .harm = kDamaged},
        {.what = "cut LZMA stream", .type = kCompressionLzma, .streamed = true, .harm = kCut},
        {.what = "LZMA", .type = kCompressionLzma},
        {.what = "damaged LZMA", .type = kCompressionLzma, .harm = kDamaged},
        {.what = "cut LZMA", .type = kCompressionLzma, .harm = kCut},
        {.what = "cut LZ4", .type = kCompressionLz4, .harm = kCut},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        std::string bytes = BuildArchive({.entries = {{"", text}}, .blocks = {{kSize, row.type, row.streamed}}}).bytes;
        const size_t wholeSize = bytes.size();
        if (row.harm == kDamaged) bytes[wholeSize / 2] ^= '\xFF';
        if (row.harm == kCut) bytes.resize(wholeSize / 2);
        DisturbedDisk disk;
        OpenedArchive archive(bytes);
        for (UInt64 from = 0; from < kSize - kFile; from += 5'000) {
            const std::string got = archive.Read(from, kFile);
            if (row.harm == kWhole || got != kRefused) {
                EXPECT_EQ(text.substr(from, kFile), got) << from;
            }
        }
        EXPECT_LT(disk.bytes, wholeSize * 3 / 2);
    }
}

// Only the first read looks at the stored bytes of a cut or damaged block.
TEST(ArchiveReader, BrokenBlockGivesTheSameAnswerEachTime) {
    constexpr UInt64 kFirst = 1'000; // a stored block before the broken one
    std::string text(6'000'000, ' ');
    std::generate(text.begin(), text.end(), std::mt19937(7));
    const std::string start = text.substr(0, kFirst);
    struct {
        const char* what;
        UInt64 blockSize = 50'000;
        size_t lost = 0; // of the file's end
        bool isDamaged = false;
        std::string bothBlocks = kRefused;
    } const rows[] = {
        {.what = "cut, larger than the window", .blockSize = 5'000'000, .lost = 100, .bothBlocks = start},
        {.what = "cut", .lost = 100},
        {.what = "all of it lost", .lost = 100'000},
        {.what = "damaged", .isDamaged = true},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        std::string stored = Compress(kCompressionLz4, text.substr(kFirst, row.blockSize));
        if (row.isDamaged) stored.assign(stored.size(), '\xFF');
        const BuiltArchive built =
            BuildArchive({.entries = {{"", text.substr(0, kFirst + row.blockSize)}},
                          .blocks = {{kFirst, kCompressionNone}, {row.blockSize, kCompressionLz4, false, stored}}});
        const size_t left = stored.size() - std::min(row.lost, stored.size());
        DisturbedDisk disk;
        OpenedArchive archive(built.bytes.substr(0, built.dataOffset + kFirst + left));
        for (const char* const time : {"first", "second"}) {
            SCOPED_TRACE(time);
            EXPECT_EQ(start.substr(990), archive.Read(990, 20));
            EXPECT_EQ(row.bothBlocks, archive.Read(0, kFirst + row.blockSize));
            disk.bytes = 0;
            EXPECT_EQ(kRefused, archive.Read(kFirst + 7, 10));
            EXPECT_EQ(kRefused, archive.Read(kFirst, row.blockSize));
            EXPECT_EQ(0u, disk.bytes);
        }
    }
}

TEST(ArchiveReader, StreamedLz4BlockIsReportedForEachRead) {
    ArchiveDescription description{.entries = {{"", SampleText(9'000)}}, .blocks = {{9'000, kCompressionLz4, true}}};
    const BuiltArchive built = BuildArchive(description);
    for (const size_t size : {built.bytes.size(), size_t{built.dataOffset}}) { // with and without the block's bytes
        SCOPED_TRACE(size);
        OpenedArchive archive(built.bytes.substr(0, size));
        std::string reports;
        const ConsoleCapture console;
        for (int file = 0; file < 3; ++file) {
            EXPECT_EQ(kRefused, archive.Read(10, 20));
            reports += "Decompressor's stream must be initialized!\n";
            EXPECT_EQ(reports, console.Text());
        }
    }
}

TEST(ArchiveReader, RefusedMemoryIsNotTakenForDamage) {
    constexpr UInt64 kSize = 100'000;
    constexpr size_t kLarge = 1'024; // the program ends without smaller requests
    const std::string text = SampleText(kSize);
    struct {
        const char* what;
        CompressionType type;
        bool streamed = false;
        UInt64 from = 0;
        UInt64 size = kSize;
    } const rows[] = {
        {.what = "part of LZMA", .type = kCompressionLzma, .from = 10, .size = 50},
        {.what = "all of LZMA", .type = kCompressionLzma},
        {.what = "part of an LZMA stream", .type = kCompressionLzma, .streamed = true, .from = 70'000, .size = 50},
        {.what = "all of an LZMA stream", .type = kCompressionLzma, .streamed = true},
        {.what = "part of LZ4", .type = kCompressionLz4, .from = 10, .size = 50},
    };
    for (const auto& row : rows) {
        const std::string bytes =
            BuildArchive({.entries = {{"", text}}, .blocks = {{kSize, row.type, row.streamed}}}).bytes;
        std::string got(row.size, '\xEE');
        int refused = 0;
        for (bool hasStruck = true; hasStruck; ++refused) {
            SCOPED_TRACE(testing::Message() << row.what << ", request " << refused + 1);
            OpenedArchive archive(bytes);
            UInt64 count = 0;
            bool isRead;
            {
                const RefusedMemory refusal(refused + 1, false, kLarge);
                isRead = archive.reader.Read(row.from, row.size, got.data(), &count);
                hasStruck = RefusedMemory::HasStruck();
            }
            EXPECT_EQ(!hasStruck, isRead);
            EXPECT_EQ(text.substr(row.from, row.size), archive.Read(row.from, row.size));
        }
        EXPECT_GE(refused, 2) << row.what;
    }
}

TEST(ArchiveReader, BrokenBlockTakesNoMemoryForTheOthers) {
    constexpr size_t kBlocks = 10'000;
    ArchiveDescription description{.entries = {{"", SampleText(kBlocks)}}, .chunkSize = 1};
    description.blocks = {{1, kCompressionLz4, false, "bad"}};
    OpenedArchive archive(description);
    char byte;
    UInt64 count = 0;
    const RefusedMemory refusal(1, true, kBlocks);
    EXPECT_FALSE(archive.reader.Read(0, 1, &byte, &count));
    EXPECT_FALSE(RefusedMemory::HasStruck());
}

TEST(ArchiveReader, BrokenBlocksAreKnownUntilTheFileIsClosed) {
    constexpr UInt64 kBlocks = 100;
    DisturbedDisk disk;
    ArchiveDescription description{.entries = {{"", SampleText(10 * kBlocks)}}};
    description.blocks.resize(kBlocks, ArchiveBlock{10, kCompressionLz4, false, "no LZ4 data"});
    OpenedArchive archive(description);
    const auto countReads = [&] {
        disk.reads = 0;
        for (UInt64 block = 0; block < kBlocks; ++block)
            EXPECT_EQ(kRefused, archive.Read(10 * block + 1, 5)) << block;
        return disk.reads.load();
    };
    EXPECT_EQ(kBlocks, countReads());
    EXPECT_EQ(0u, countReads());
    archive.reader.MakeStorageUnused();
    ASSERT_TRUE(archive.reader.MakeStorageUsed(true)); // the file may be whole now
    EXPECT_EQ(kBlocks, countReads());
}

TEST(ArchiveReader, EmptyBlocksThatCantFailAreSkipped) {
    constexpr UInt32 kEmptyBlocks = 1'000;
    constexpr UInt32 kAllBlocks = kEmptyBlocks + 2;
    constexpr auto kUnknown = static_cast<CompressionType>(9);
    struct {
        const char* what;
        ArchiveBlock block;
        UInt32 blocksToRead = 2;
        std::string answer = "bcde";
    } const rows[] = {
        {.what = "stored", .block = {0, kCompressionNone, false, ""}},
        {.what = "stored, with bytes", .block = {0, kCompressionNone, true, "!"}},
        {.what = "LZ4", .block = {0, kCompressionLz4, false, ""}},
        {.what = "LZ4, with bytes",
         .block = {0, kCompressionLz4, false, "!"},
         .blocksToRead = kAllBlocks,
         .answer = kRefused},
        {.what = "LZ4 stream", .block = {0, kCompressionLz4, true, ""}, .blocksToRead = kAllBlocks},
        {.what = "LZMA stream", .block = {0, kCompressionLzma, true, "!"}},
        {.what = "LZMA, with bytes",
         .block = {0, kCompressionLzma, false, "!"},
         .blocksToRead = kAllBlocks,
         .answer = kRefused},
        {.what = "unknown", .block = {0, kUnknown, false, ""}, .blocksToRead = kAllBlocks, .answer = kRefused},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        ArchiveDescription description{.entries = {{"", "abcdef"}}, .chunkSize = 3};
        description.blocks = {{3}};
        description.blocks.resize(1 + kEmptyBlocks, row.block);
        const ConsoleCapture console;
        OpenedArchive archive(description);
        EXPECT_EQ(row.blocksToRead, Access::CountBlocksToRead(archive.reader));
        EXPECT_EQ(kAllBlocks, archive.reader.GetBlockCount());
        EXPECT_EQ(row.answer, archive.Read(1, 4));
    }
}

TEST(ArchiveReader, StreamThatEndsEarlyDeliversWhatItHolds) {
    // It asks for a dictionary of 4 GiB.
    const std::string lzma = CompressLzma(SampleText(60'000), {.endMark = true}).replace(1, 4, 4, '\xFF');
    OpenedArchive archive({.entries = {{"", SampleText(90'000)}}, .blocks = {{90'000, kCompressionLzma, true, lzma}}});
    EXPECT_EQ(SampleText(60'000).substr(50'000), archive.Read(50'000, 30'000));
    EXPECT_EQ(kRefused, archive.Read(60'000, 10));
}

TEST(ArchiveReader, StreamLongerThanItsBlockIsDamaged) {
    const std::string lzma = CompressLzma(SampleText(70'000), {});
    OpenedArchive archive({.entries = {{"", SampleText(60'000)}}, .blocks = {{60'000, kCompressionLzma, true, lzma}}});
    EXPECT_EQ(kRefused, archive.Read(0, 60'000));
}

TEST(ArchiveReader, ChunkShorterThanItsBlockIsDamaged) {
    const std::string lzma = CompressLzma(SampleText(60'000), {.endMark = true});
    OpenedArchive archive({.entries = {{"", SampleText(90'000)}}, .blocks = {{90'000, kCompressionLzma, false, lzma}}});
    EXPECT_EQ(kRefused, archive.Read(0, 90'000));
    EXPECT_EQ(kRefused, archive.Read(10, 20));
}

TEST(ArchiveReader, StoredBlockIsNotReadPastTheRange) {
    constexpr UInt64 kBlock = 10'000;
    const std::string text = SampleText(2 * kBlock);
    DisturbedDisk disk;
    OpenedArchive archive({.entries = {{"", text}}, .chunkSize = kBlock});
    disk.bytes = 0;
    EXPECT_EQ(text.substr(kBlock - 10, 30), archive.Read(kBlock - 10, 30));
    EXPECT_EQ(30u, disk.bytes);
}

TEST(ArchiveReader, CutStoredBlockEndsAReadBeforeIt) {
    const BuiltArchive built = BuildArchive({.entries = {{"", "0123456789abcdefghij"}}, .chunkSize = 10});
    EXPECT_EQ("0123456789", OpenedArchive(built.bytes.substr(0, built.dataOffset + 12)).Read(0, 15));
}

TEST(ArchiveReader, StreamIsWholeAfterAFailedRead) {
    constexpr UInt64 kWindow = 65'536;
    constexpr UInt64 kSize = 3 * kWindow;
    std::string text(kSize, ' ');
    std::generate(text.begin(), text.end(), std::mt19937(7)); // several pieces of stored bytes
    DisturbedDisk disk;
    OpenedArchive archive({.entries = {{"", text}}, .blocks = {{kSize, kCompressionLzma, true}}});
    EXPECT_EQ(text.substr(10, 20), archive.Read(10, 20));
    disk.failures = 1;
    EXPECT_EQ(kRefused, archive.Read(2 * kWindow, 20));
    EXPECT_EQ(text.substr(2 * kWindow, 20), archive.Read(2 * kWindow, 20));
}

TEST(ArchiveReader, OnlyPartsOfBlocksAreKeptInTheCache) {
    constexpr UInt64 kBlock = 1'000;
    const std::string text = SampleText(3 * kBlock);
    OpenedArchive archive({.entries = {{"", text}}, .chunkSize = kBlock, .type = kCompressionLz4});
    EXPECT_EQ(text, archive.Read(0, 3 * kBlock));
    EXPECT_EQ(Access::Cache{.records = 0}, Access::Look(archive.reader));
    EXPECT_EQ(text, archive.Read(0, 3 * kBlock, kFileReadFlagsThroughCache));
    EXPECT_EQ(Access::Cache{.records = 1}, Access::Look(archive.reader));
}

// A ZarvoWeb archive, in which 8 bytes between properties and coded bytes are hidden.
class HiddenSizeField : public testing::Test {
protected:
    DisturbedDisk m_Disk;
    OpenedArchive m_Archive{
        ArchiveDescription{.layout = ArchiveLayout::kWeb, .blocks = {{4, {}, {}, "props8 bytes!coded"}}}};
};

TEST_F(HiddenSizeField, IsNoPartOfTheStoredBytes) {
    EXPECT_EQ("propscoded", Access::ReadStored(m_Archive.reader, 0, 10));
    EXPECT_EQ("sc", Access::ReadStored(m_Archive.reader, 4, 2));
    EXPECT_EQ("props", Access::ReadStored(m_Archive.reader, 0, 5));
    EXPECT_EQ("cod", Access::ReadStored(m_Archive.reader, 5, 3));
}

TEST_F(HiddenSizeField, DoesNotFollowCutProperties) {
    m_Disk.Arm(1, {.isLasting = false, .isShort = true});
    EXPECT_EQ("pr", Access::ReadStored(m_Archive.reader, 0, 10));
}

// An archive of one short file.
class ArchiveStorage : public testing::Test {
protected:
    int CountOpenFiles() const { return static_cast<int>(CountOpenDescriptors()) - m_DescriptorsBefore; }

    const int m_DescriptorsBefore = static_cast<int>(CountOpenDescriptors());
    DisturbedDisk m_Disk;
    OpenedArchive m_Archive{
        ArchiveDescription{.entries = {{.bytes = "0123456789"}}, .type = kCompressionLz4, .sectionAtEnd = true}};
    ArchiveStorageReader& m_Reader = m_Archive.reader;
    const ConsoleCapture m_Console;
};

TEST_F(ArchiveStorage, FileAndCacheLastUntilTheLastUse) {
    EXPECT_EQ("567", m_Archive.Read(5, 3));
    EXPECT_TRUE(m_Reader.MakeStorageUsed(true));
    m_Reader.MakeStorageUnused();
    EXPECT_EQ(1u, Access::Look(m_Reader).records);
    EXPECT_EQ(1, CountOpenFiles());
    m_Reader.MakeStorageUnused();
    EXPECT_EQ(0u, Access::Look(m_Reader).records);
    EXPECT_EQ(0, CountOpenFiles());
    EXPECT_TRUE(m_Reader.MakeStorageUsed(true));
    EXPECT_EQ("567", m_Archive.Read(5, 3));
}

TEST_F(ArchiveStorage, FileThatMayNotBeReleasedStaysOpen) {
    FileSystemEntry entry(m_Archive.path.c_str());
    ArchiveStorageReader kept(kMemLabelFileSystem);
    EXPECT_EQ(0, kept.Initialize(entry, 0, false, true));
    kept.MakeStorageUnused();
    EXPECT_EQ(2, CountOpenFiles());
}

TEST_F(ArchiveStorage, UseBelowZeroIsReportedAndCounted) {
    m_Reader.MakeStorageUnused();
    m_Reader.MakeStorageUnused();
    EXPECT_EQ("ArchiveStorageReader has mismatched MakeStorageUsed/MakeStorageUnused calls\n", m_Console.Text());
    EXPECT_TRUE(m_Reader.MakeStorageUsed(true)); // from -1 to 0
    EXPECT_EQ(kRefused, m_Archive.Read(5, 3));
    EXPECT_TRUE(m_Reader.MakeStorageUsed(true));
    EXPECT_EQ("567", m_Archive.Read(5, 3));
}

TEST_F(ArchiveStorage, MissingFileIsReportedAndNotUsed) {
    m_Reader.MakeStorageUnused();
    fs::remove(m_Archive.path);
    EXPECT_FALSE(m_Reader.MakeStorageUsed(true));
    EXPECT_EQ("Unable to open archive file: " + m_Archive.path + "\n", m_Console.Text());
    EXPECT_EQ(0, CountOpenFiles());
}

TEST_F(ArchiveStorage, ChangedFileIsReportedAndNotUsed) {
    fs::last_write_time(m_Archive.path, fs::last_write_time(m_Archive.path) + std::chrono::seconds(1));
    EXPECT_FALSE(m_Reader.MakeStorageUsed(true));
    EXPECT_EQ("Archive file was modified while it was opened, and can no longer be accessed: " + m_Archive.path + "\n",
              m_Console.Text());
    EXPECT_FALSE(m_Reader.MakeStorageUsed(false)); // not to be reported
    EXPECT_EQ(1, std::ranges::count(m_Console.Text(), '\n'));
}

TEST_F(ArchiveStorage, UnknownTimeOfChangeIsReported) {
    m_Disk.Arm(1, {.isLasting = false, .isShort = false});
    EXPECT_FALSE(m_Reader.MakeStorageUsed(false));
    EXPECT_EQ("Unexpected FileSystemError code 14 after call to FileSystemEntry::LastModified() \n", m_Console.Text());
}

TEST_F(ArchiveStorage, RangePastTheEndIsRefusedWhole) {
    constexpr UInt64 kUntouched = 77;
    struct {
        UInt64 from;
        UInt64 size;
    } const rows[] = {{9, 2}, {10, 0}, {10, 1}, {5, ~0ull - 2}, {~0ull, 2}};
    for (const auto& [from, size] : rows) {
        UInt64 count = kUntouched;
        EXPECT_FALSE(m_Reader.Read(from, size, nullptr, &count)) << from << ", " << size;
        EXPECT_EQ(kUntouched, count) << from << ", " << size;
    }
    EXPECT_EQ("9", m_Archive.Read(9, 1));
    EXPECT_EQ("", m_Archive.Read(0, 0));
}

TEST(ArchiveReader, BlocksNameTheirBytesInTheFile) {
    constexpr size_t kOffset = 100;
    const std::string text = SampleText(3'000);
    const std::string lzma = CompressLzma(text.substr(0, 1'000), {});
    const std::string unknown = "of another kind";
    struct {
        const char* what;
        ArchiveDescription description;
        std::vector<std::string> stored; // of each block
        std::vector<bool> streamed;
        size_t firstPieceSize;
    } const rows[] = {
        {.what = "block-based",
         .description = {.entries = {{"", text}},
                         .blocks = {{1'000, kCompressionLzma, true, lzma},
                                    {500, kCompressionNone, true},
                                    {1'500, static_cast<CompressionType>(63), true, unknown}}},
         .stored = {lzma, text.substr(1'000, 500), unknown},
         .streamed = {true, false, true},
         .firstPieceSize = lzma.size()},
        {.what = "ZarvoWeb",
         .description = {.layout = ArchiveLayout::kWeb,
                         .blocks = {{4, {}, {}, lzma.substr(0, 5) + "8 bytes!" + lzma.substr(5)}}},
         .stored = {lzma},
         .streamed = {true},
         .firstPieceSize = 5},
        {.what = "ZarvoWeb, nothing but properties",
         .description = {.layout = ArchiveLayout::kWeb, .blocks = {{4, {}, {}, "prop8 bytes!"}}},
         .stored = {"prop"},
         .streamed = {true},
         .firstPieceSize = 4},
        {.what = "ZarvoWeb, too short for the field",
         .description = {.layout = ArchiveLayout::kWeb, .blocks = {{4, {}, {}, "8 bytes!"}}},
         .stored = {"8 bytes!"},
         .streamed = {true},
         .firstPieceSize = 8},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        const BuiltArchive built = BuildArchive(row.description);
        OpenedArchive archive(built.bytes, kOffset);
        const std::string file = std::string(kOffset, '!') + built.bytes;
        ASSERT_EQ(row.stored.size(), archive.reader.GetBlockCount());
        UInt64 position = 0;
        for (UInt32 index = 0; index < row.stored.size(); ++index) {
            const ArchiveStorageReader::Block block = archive.reader.GetBlock(index);
            std::string stored;
            for (const auto& piece : block.pieces)
                stored += file.substr(piece.offset, piece.size);
            EXPECT_EQ(row.stored[index], stored);
            EXPECT_EQ(row.stored[index].size(), block.storedSize);
            EXPECT_EQ(row.streamed[index], block.isStreamed);
            EXPECT_EQ(position, block.position);
            position += block.size;
        }
        EXPECT_EQ(built.stream.size(), position);
        EXPECT_EQ(row.firstPieceSize, archive.reader.GetBlock(0).pieces[0].size);
    }
}
