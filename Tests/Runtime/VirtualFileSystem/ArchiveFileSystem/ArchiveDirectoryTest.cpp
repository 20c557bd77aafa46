// How the reader finds the directory of a ZarvoWeb archive, which is the start of the stream.
#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/RefusedMemory.h"

#include <algorithm>
#include <map>

TEST(ArchiveDirectory, IsReadyWithItsLastByte) {
    constexpr UInt64 kDirectorySize = 33;
    constexpr UInt64 kSize = 36;
    const ArchiveDescription description{.layout = ArchiveLayout::kWeb, .entries = {{"", "x"}, {"folder/file", "yz"}}};
    for (UInt64 piece = 1; piece <= kSize; ++piece) {
        SCOPED_TRACE(testing::Message() << "pieces of " << piece);
        OpenedArchive archive(description);
        for (UInt64 from = 0; from < kSize; from += piece) {
            EXPECT_EQ(from >= kDirectorySize, archive.reader.IsDirectoryReady()) << from;
            EXPECT_NE(kRefused, archive.Read(from, std::min(piece, kSize - from))) << from;
            EXPECT_EQ(10u, archive.Read(0, 10).size()) << from; // read again, which must not count
            EXPECT_TRUE(archive.reader.CanDirectoryBecomeReady()) << from;
        }
        const auto& nodes = archive.reader.GetDirectoryInfo().nodes;
        ASSERT_EQ(2u, nodes.size());
        EXPECT_EQ("folder/file", nodes[1].path);
    }
}

TEST(ArchiveDirectory, IsNotFoundByAReadPastAGap) {
    OpenedArchive archive({.layout = ArchiveLayout::kWeb, .entries = {{"", "x"}, {"folder/file", "yz"}}});
    EXPECT_EQ(5u, archive.Read(4, 5).size()); // the zeros of a gap would be an empty directory
    EXPECT_FALSE(archive.reader.IsDirectoryReady());
}

TEST(ArchiveDirectory, HoldsNoMoreEntriesThanTheStreamCan) {
    OpenedArchive archive({.layout = ArchiveLayout::kWeb,
                           .entries = {{"", "x"}, {"folder/file", "yz"}},
                           .fields = {{"entryCount", 4}}}); // of at least 9 bytes each: one too many
    EXPECT_EQ(4u, archive.Read(0, 4).size());
    EXPECT_FALSE(archive.reader.CanDirectoryBecomeReady());
}

TEST(ArchiveDirectory, IsReadForAsFarAsItHasToBe) {
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
    } const rows[] = {
        {.what = "shorter than a piece", .streamSize = 1'000},
        {.what = "cut, after its first piece", .streamSize = 100'000, .lost = 100},
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
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        ArchiveDescription description{.layout = ArchiveLayout::kWeb, .fields = row.fields};
        description.entries = {{std::string(kDirectorySize - 4 - 9, 'p'), SampleText(row.streamSize - kDirectorySize)}};
        if (row.codedSize != 0) {
            const std::string coded =
                CompressLzma(BuildArchive(description).stream.substr(0, row.codedSize), {.endMark = true});
            description.blocks = {{row.streamSize, {}, {}, coded.substr(0, 5) + "8 bytes!" + coded.substr(5)}};
        }
        const std::string bytes = BuildArchive(description).bytes;
        OpenedArchive archive(bytes.substr(0, bytes.size() - row.lost));
        EXPECT_EQ(row.readBefore, archive.Read(0, row.readBefore).size());
        EXPECT_EQ(row.isFound, archive.reader.FindDirectory(row.pieces));
        EXPECT_EQ(row.isFound, archive.reader.IsDirectoryReady());
        EXPECT_EQ(row.isFound ? 1u : 0u, archive.reader.GetDirectoryInfo().nodes.size());
    }
}

TEST(ArchiveDirectory, TakesNoMemoryWhileReadsAreElsewhere) {
    constexpr UInt64 kPiece = 65'536;
    constexpr UInt64 kPieces = 40;
    constexpr size_t kBlock = 8'192; // of the file that collects the stream's start
    OpenedArchive archive({.layout = ArchiveLayout::kWeb, .entries = {{"file", SampleText(kPieces * kPiece)}}});
    std::string piece(kPiece, '\xEE');
    UInt64 count = 0;
    ASSERT_TRUE(archive.reader.Read(kPiece, kPiece, piece.data(), &count)); // the decoder takes what it needs
    {
        const RefusedMemory refusal(1, true, kBlock);
        for (UInt64 from = 2 * kPiece; from < kPieces * kPiece; from += kPiece)
            ASSERT_TRUE(archive.reader.Read(from, kPiece, piece.data(), &count)) << from;
        EXPECT_FALSE(RefusedMemory::HasStruck());
    }
    EXPECT_FALSE(archive.reader.IsDirectoryReady());
    EXPECT_TRUE(archive.reader.FindDirectory());
}
