#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/ConsoleCapture.h"

// Files that lie apart in one stream cost one decoding of it, and files behind its damage, or behind the end of a file
// that was cut, none at all.
TEST(ArchiveReader, AStreamIsNotDecodedAgainForEveryFileInIt) {
    constexpr UInt64 kSize = 2'000'000;
    const std::string text = SampleText(kSize);
    std::string whole = BuildArchive({.entries = {{"", text}}, .blocks = {{kSize, kCompressionLzma, true}}}).bytes;
    std::string damaged = whole;
    damaged[whole.size() / 2] ^= '\xFF';
    for (const std::string& bytes : {whole, damaged, whole.substr(0, whole.size() / 2)}) {
        DisturbedDisk disk;
        OpenedArchive archive(bytes);
        for (UInt64 from = 0; from < kSize - 100; from += 5'000) {
            const std::string got = archive.Read(from, 100);
            EXPECT_EQ(got == "refused" && bytes != whole ? got : text.substr(from, 100), got) << from;
        }
        EXPECT_LT(disk.bytes, whole.size() * 3 / 2);
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
