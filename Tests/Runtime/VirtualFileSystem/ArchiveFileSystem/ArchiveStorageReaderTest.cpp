#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/ConsoleCapture.h"

#include <malloc.h>

// What this thread asks for through the runtime's allocator; the request that requestsLeft counts down to is refused.
struct Memory {
    int requestsLeft = -1; // none
    UInt64 bytes = 0;
};
static thread_local Memory t_Memory;

extern "C" int posix_memalign(void** pointer, size_t align, size_t size) {
    t_Memory.bytes += size;
    if (t_Memory.requestsLeft > 0 && --t_Memory.requestsLeft == 0) return ENOMEM;
    *pointer = memalign(align, size);
    return *pointer != nullptr ? 0 : ENOMEM;
}

// Files that lie apart in one block cost one decoding of it, and files behind its damage, or behind the end of a file
// that was cut, none at all.
TEST(ArchiveReader, NoBlockIsDecodedAgainForEachFileInIt) {
    constexpr UInt64 kSize = 1'000'000;
    const std::string text = SampleText(kSize);
    enum Harm { kWhole, kDamaged, kCut };
    struct {
        const char* what;
        CompressionType type;
        bool streamed;
        Harm harm;
    } const cases[] = {
        {"LZMA stream", kCompressionLzma, true, kWhole},     {"damaged LZMA stream", kCompressionLzma, true, kDamaged},
        {"cut LZMA stream", kCompressionLzma, true, kCut},   {"LZMA", kCompressionLzma, false, kWhole},
        {"damaged LZMA", kCompressionLzma, false, kDamaged}, {"cut LZMA", kCompressionLzma, false, kCut},
        {"cut LZ4", kCompressionLz4, false, kCut},
    };
    for (const auto& [what, type, streamed, harm] : cases) {
        SCOPED_TRACE(what);
        std::string bytes = BuildArchive({.entries = {{"", text}}, .blocks = {{kSize, type, streamed}}}).bytes;
        const size_t wholeSize = bytes.size();
        if (harm == kDamaged) bytes[wholeSize / 2] ^= '\xFF';
        if (harm == kCut) bytes.resize(wholeSize / 2);
        DisturbedDisk disk;
        OpenedArchive archive(bytes);
        for (UInt64 from = 0; from < kSize - 100; from += 5'000) {
            const std::string got = archive.Read(from, 100);
            EXPECT_EQ(got == "refused" && harm != kWhole ? got : text.substr(from, 100), got) << from;
        }
        EXPECT_LT(disk.bytes, wholeSize * 3 / 2);
    }
}

// What a read delivers that goes on into a block with cut or damaged stored bytes, which only the first one looks at.
TEST(ArchiveReader, ABrokenBlockGivesTheSameAnswerEachTime) {
    constexpr UInt64 kFirst = 1'000;
    std::string text(6'000'000, ' ');
    std::generate(text.begin(), text.end(), std::mt19937(7));
    const std::string start = text.substr(0, kFirst);
    struct {
        const char* what;
        UInt64 blockSize;
        size_t lost; // of the file's end
        bool isDamaged;
        std::string wholeBlock;
    } const cases[] = {
        {"cut, larger than what is read ahead", 5'000'000, 100, false, start},
        {"cut", 50'000, 100, false, "refused"},
        {"all of it lost", 50'000, 100'000, false, "refused"},
        {"damaged", 50'000, 0, true, "refused"},
    };
    for (const auto& [what, blockSize, lost, isDamaged, wholeBlock] : cases) {
        SCOPED_TRACE(what);
        std::string stored = Compress(kCompressionLz4, text.substr(kFirst, blockSize));
        if (isDamaged) stored.assign(stored.size(), '\xFF');
        const BuiltArchive built =
            BuildArchive({.entries = {{"", text.substr(0, kFirst + blockSize)}},
                          .blocks = {{kFirst, kCompressionNone}, {blockSize, kCompressionLz4, false, stored}}});
        const std::string bytes =
            built.bytes.substr(0, built.dataOffset + kFirst + stored.size() - std::min(lost, stored.size()));
        DisturbedDisk disk;
        OpenedArchive archive(bytes);
        for (const char* const time : {"first", "second"}) {
            EXPECT_EQ(start.substr(990), archive.Read(990, 20)) << time;
            EXPECT_EQ(wholeBlock, archive.Read(0, kFirst + blockSize)) << time;
            disk.bytes = 0;
            EXPECT_EQ("refused", archive.Read(kFirst + 7, 10)) << time;
            EXPECT_EQ("refused", archive.Read(kFirst, blockSize)) << time;
            EXPECT_EQ(0u, disk.bytes) << time;
        }
    }
}

TEST(ArchiveReader, AStreamedLz4BlockIsReportedForEachRead) {
    ArchiveDescription description{.entries = {{"", SampleText(9'000)}}, .blocks = {{9'000, kCompressionLz4, true}}};
    const BuiltArchive built = BuildArchive(description);
    for (const size_t size : {built.bytes.size(), size_t{built.dataOffset}}) { // whole, and with nothing of the block
        SCOPED_TRACE(size);
        OpenedArchive archive(built.bytes.substr(0, size));
        std::string reports;
        const ConsoleCapture console;
        for (int file = 0; file < 3; ++file) {
            EXPECT_EQ("refused", archive.Read(10, 20));
            reports += "Decompressor's stream must be initialized!\n";
            EXPECT_EQ(reports, console.Text());
        }
    }
}

// Whichever request for memory is refused, the block can be read afterwards.
TEST(ArchiveReader, RefusedMemoryIsNotRememberedAsDamage) {
    constexpr UInt64 kSize = 100'000;
    const std::string text = SampleText(kSize);
    struct {
        const char* what;
        CompressionType type;
        bool streamed;
        UInt64 from, size;
    } const cases[] = {
        {"part of LZMA", kCompressionLzma, false, 10, 50},
        {"all of LZMA", kCompressionLzma, false, 0, kSize},
        {"part of an LZMA stream", kCompressionLzma, true, 70'000, 50},
        {"all of an LZMA stream", kCompressionLzma, true, 0, kSize},
        {"part of LZ4", kCompressionLz4, false, 10, 50},
    };
    for (const auto& [what, type, streamed, from, size] : cases) {
        SCOPED_TRACE(what);
        const std::string bytes = BuildArchive({.entries = {{"", text}}, .blocks = {{kSize, type, streamed}}}).bytes;
        std::string got(size, '\xEE');
        int refusals = 0;
        for (bool isRefused = true; isRefused; ++refusals) {
            OpenedArchive archive(bytes);
            UInt64 count = 0;
            const ConsoleCapture console; // a stream that can't be made is reported
            t_Memory = {.requestsLeft = refusals + 1};
            const bool isRead = archive.reader.Read(from, size, got.data(), &count);
            isRefused = t_Memory.requestsLeft == 0;
            t_Memory = {};
            EXPECT_EQ(!isRefused, isRead) << refusals;
            EXPECT_EQ(text.substr(from, size), archive.Read(from, size)) << refusals;
        }
        EXPECT_GT(refusals, 2);
    }
}

TEST(ArchiveReader, ABrokenBlockTakesNoMemoryForTheOthers) {
    constexpr size_t kBlocks = 10'000;
    ArchiveDescription description{.entries = {{"", SampleText(kBlocks)}}, .chunkSize = 1};
    description.blocks = {{1, kCompressionLz4, false, "bad"}};
    OpenedArchive archive(description);
    char byte;
    UInt64 count = 0;
    t_Memory = {};
    EXPECT_FALSE(archive.reader.Read(0, 1, &byte, &count));
    EXPECT_LT(t_Memory.bytes, kBlocks);
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
            EXPECT_EQ("refused", archive.Read(10 * block + 1, 5)) << block;
        return disk.reads.load();
    };
    EXPECT_EQ(kBlocks, countReads());
    EXPECT_EQ(0u, countReads());
    archive.reader.MakeStorageUnused();
    ASSERT_TRUE(archive.reader.MakeStorageUsed(true)); // it may be whole now
    EXPECT_EQ(kBlocks, countReads());
}

TEST(ArchiveReader, EmptyBlocksThatCantFailCostNothing) {
    constexpr UInt32 kEmptyBlocks = 1'000;
    const auto unknown = static_cast<CompressionType>(9);
    struct {
        const char* what;
        ArchiveBlock block;
        UInt32 blocksToRead;
        std::string answer;
    } const cases[] = {
        {"stored as is", {0, kCompressionNone, false, ""}, 2, "bcde"},
        {"stored as is, with bytes", {0, kCompressionNone, true, "!"}, 2, "bcde"},
        {"LZ4", {0, kCompressionLz4, false, ""}, 2, "bcde"},
        {"LZ4, with bytes", {0, kCompressionLz4, false, "!"}, kEmptyBlocks + 2, "refused"},
        {"LZ4 stream", {0, kCompressionLz4, true, ""}, kEmptyBlocks + 2, "bcde"},
        {"LZMA stream", {0, kCompressionLzma, true, "!"}, 2, "bcde"},
        {"LZMA, with bytes", {0, kCompressionLzma, false, "!"}, kEmptyBlocks + 2, "refused"},
        {"unknown", {0, unknown, false, ""}, kEmptyBlocks + 2, "refused"},
    };
    for (const auto& [what, block, blocksToRead, answer] : cases) {
        SCOPED_TRACE(what);
        ArchiveDescription description{.entries = {{"", "abcdef"}}, .chunkSize = 3};
        description.blocks = {{3}};
        description.blocks.resize(1 + kEmptyBlocks, block);
        const ConsoleCapture console;
        OpenedArchive archive(description);
        EXPECT_EQ(blocksToRead, Access::CountBlocksToRead(archive.reader));
        EXPECT_EQ(kEmptyBlocks + 2, archive.reader.GetBlockCount());
        EXPECT_EQ(answer, archive.Read(1, 4));
    }
}

TEST(ArchiveReader, WhatEndsEarlyDeliversWhatItHolds) {
    // A stream that ends before its block does, and asks for a dictionary of 4 GiB.
    const std::string lzma = CompressLzma(SampleText(60'000), {.endMark = true}).replace(1, 4, 4, '\xFF');
    OpenedArchive archive({.entries = {{"", SampleText(90'000)}}, .blocks = {{90'000, kCompressionLzma, true, lzma}}});
    EXPECT_EQ(SampleText(60'000).substr(50'000), archive.Read(50'000, 30'000));
    EXPECT_EQ("refused", archive.Read(60'000, 10));
    // A file that ends inside of the bytes that a read needs of its last block.
    const BuiltArchive built = BuildArchive({.entries = {{"", "0123456789abcdefghij"}}, .chunkSize = 10});
    EXPECT_EQ("0123456789", OpenedArchive(built.bytes.substr(0, built.dataOffset + 12)).Read(0, 15));
}

TEST(ArchiveReader, ADirectoryInTheDataIsReadyOnceItsLastByteHasBeenRead) {
    constexpr UInt64 kDirectorySize = 33, kSize = 36;
    ArchiveDescription description{.layout = ArchiveLayout::kWeb, .entries = {{"", "x"}, {"folder/file", "yz"}}};
    for (UInt64 piece = 1; piece <= kSize; ++piece) {
        OpenedArchive archive(description);
        for (UInt64 from = 0; from < kSize; from += piece) {
            EXPECT_EQ(from >= kDirectorySize, archive.reader.IsDirectoryReady()) << from << " in pieces of " << piece;
            EXPECT_NE("refused", archive.Read(from, std::min(piece, kSize - from)));
            EXPECT_TRUE(archive.Read(0, 10).size() == 10 && archive.reader.CanDirectoryBecomeReady()); // read again
        }
        const auto& nodes = archive.reader.GetDirectoryInfo().nodes;
        EXPECT_TRUE(nodes.size() == 2 && nodes[1].path == "folder/file") << piece;
    }
    OpenedArchive withGap(description); // whose zeros would be an empty directory
    EXPECT_TRUE(withGap.Read(4, 5).size() == 5 && !withGap.reader.IsDirectoryReady());
    description.fields = {{"entryCount", 4}}; // of at least 9 bytes each: one too many
    OpenedArchive hopeless(description);
    EXPECT_TRUE(hopeless.Read(0, 4).size() == 4 && !hopeless.reader.CanDirectoryBecomeReady());
}

TEST(ArchiveReader, UseCountOpensAndClosesTheFileUnlessItHasChanged) {
    const size_t descriptors = CountOpenDescriptors();
    DisturbedDisk disk;
    OpenedArchive archive({.entries = {{.bytes = "0123456789"}}, .type = kCompressionLz4, .sectionAtEnd = true});
    ArchiveStorageReader& reader = archive.reader;
    EXPECT_TRUE(archive.Read(5, 3) == "567" && reader.MakeStorageUsed(true));
    reader.MakeStorageUnused();
    EXPECT_TRUE(Access::Look(reader).records == 1 && CountOpenDescriptors() == descriptors + 1);
    reader.MakeStorageUnused();
    EXPECT_TRUE(Access::Look(reader).records == 0 && CountOpenDescriptors() == descriptors);
    const ConsoleCapture console;
    reader.MakeStorageUnused();
    EXPECT_TRUE(reader.MakeStorageUsed(true) && archive.Read(5, 3) == "refused"); // from -1 to 0 opens nothing
    EXPECT_TRUE(reader.MakeStorageUsed(true) && archive.Read(6, 3) == "678" && archive.Read(0, 0).empty());
    UInt64 count = 77;
    EXPECT_FALSE(reader.Read(5, ~0ull - 2, nullptr, &count) || reader.Read(~0ull, 2, nullptr, &count) || count != 77);
    disk.Arm(1, {false, false}); // the question when the file was changed
    EXPECT_FALSE(reader.MakeStorageUsed(true));
    EXPECT_EQ("ArchiveStorageReader has mismatched MakeStorageUsed/MakeStorageUnused calls\n"
              "Unexpected FileSystemError code 14 after call to FileSystemEntry::LastModified() \n"
              "Archive file was modified while it was opened, and can no longer be accessed: " +
                  archive.path + "\n",
              console.Text());
    FileSystemEntry entry(archive.path.c_str());
    ArchiveStorageReader kept(kMemLabelFileSystem);
    EXPECT_EQ(0, kept.Initialize(entry, 0, false, true));
    kept.MakeStorageUnused();
    EXPECT_EQ(descriptors + 2, CountOpenDescriptors());
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
    } const cases[] = {
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
    };
    for (const auto& test : cases) {
        SCOPED_TRACE(test.what);
        const BuiltArchive built = BuildArchive(test.description);
        OpenedArchive archive(built.bytes, kOffset);
        const std::string file = std::string(kOffset, '!') + built.bytes;
        ASSERT_EQ(test.stored.size(), archive.reader.GetBlockCount());
        UInt64 position = 0;
        for (UInt32 index = 0; index < test.stored.size(); ++index) {
            const ArchiveStorageReader::Block block = archive.reader.GetBlock(index);
            std::string stored;
            for (const auto& piece : block.pieces)
                stored += file.substr(piece.offset, piece.size);
            EXPECT_EQ(test.stored[index], stored);
            EXPECT_EQ(test.stored[index].size(), block.storedSize);
            EXPECT_EQ(test.streamed[index], block.isStreamed);
            EXPECT_EQ(position, block.position);
            position += block.size;
        }
        EXPECT_EQ(built.stream.size(), position);
        EXPECT_EQ(test.firstPieceSize, archive.reader.GetBlock(0).pieces[0].size);
    }
}

// The rules about pieces, where the directory takes 1,000 bytes and the stream is as long as each row says.
TEST(ArchiveReader, FindDirectoryReadsAsFarAsItHasTo) {
    constexpr UInt64 kDirectorySize = 1'000;
    struct {
        const char* what;
        UInt64 streamSize;
        ArchiveStorageReader::DirectoryPieces pieces = ArchiveStorageReader::kDirectoryPiecesUpToTheEnd;
        UInt64 readBefore = 0;
        size_t lost = 0;      // of the file's end
        size_t codedSize = 0; // of the stream, when that ends before its block does
        std::map<std::string, UInt64> fields = {};
        bool isFound = true;
    } const cases[] = {
        {.what = "shorter than a piece", .streamSize = 1'000},
        {.what = "cut, behind its first piece", .streamSize = 100'000, .lost = 100},
        {.what = "ends early", .streamSize = 5'000, .codedSize = 2'000},
        {.what = "part was read before", .streamSize = 5'000, .readBefore = 500},
        {.what = "part with the directory was read before", .streamSize = 5'000, .readBefore = 1'500},
        {.what = "no directory", .streamSize = 5'000, .fields = {{"entryCount", 9'999}}, .isFound = false},
        {.what = "a whole piece", .streamSize = 65'536, .pieces = ArchiveStorageReader::kDirectoryPiecesWhole},
        {.what = "no whole piece",
         .streamSize = 65'535,
         .pieces = ArchiveStorageReader::kDirectoryPiecesWhole,
         .isFound = false},
    };
    for (const auto& test : cases) {
        SCOPED_TRACE(test.what);
        ArchiveDescription description{.layout = ArchiveLayout::kWeb, .fields = test.fields};
        description.entries = {
            {std::string(kDirectorySize - 4 - 9, 'p'), SampleText(test.streamSize - kDirectorySize)}};
        if (test.codedSize != 0) {
            const std::string coded =
                CompressLzma(BuildArchive(description).stream.substr(0, test.codedSize), {.endMark = true});
            description.blocks = {{test.streamSize, {}, {}, coded.substr(0, 5) + "8 bytes!" + coded.substr(5)}};
        }
        const std::string bytes = BuildArchive(description).bytes;
        OpenedArchive archive(bytes.substr(0, bytes.size() - test.lost));
        EXPECT_EQ(test.readBefore, archive.Read(0, test.readBefore).size());
        EXPECT_EQ(test.isFound, archive.reader.FindDirectory(test.pieces));
        EXPECT_EQ(test.isFound, archive.reader.IsDirectoryReady());
        EXPECT_EQ(test.isFound ? 1u : 0u, archive.reader.GetDirectoryInfo().nodes.size());
    }
}

// Reads that leave out the stream's start can't find a directory: they keep nothing, and spoil nothing.
TEST(ArchiveReader, OnlyTheStartOfAStreamIsKeptForItsDirectory) {
    constexpr UInt64 kPiece = 65'536, kPieces = 40;
    ArchiveDescription description{.layout = ArchiveLayout::kWeb, .entries = {{"file", SampleText(kPieces * kPiece)}}};
    OpenedArchive archive(description);
    std::string piece(kPiece, '\xEE');
    UInt64 count = 0;
    ASSERT_TRUE(archive.reader.Read(kPiece, kPiece, piece.data(), &count)); // the decoder takes what it needs
    t_Memory = {};
    for (UInt64 from = 2 * kPiece; from < kPieces * kPiece; from += kPiece)
        ASSERT_TRUE(archive.reader.Read(from, kPiece, piece.data(), &count)) << from;
    EXPECT_LT(t_Memory.bytes, kPiece);
    EXPECT_FALSE(archive.reader.IsDirectoryReady());
    EXPECT_TRUE(archive.reader.FindDirectory());
}
