#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"

// Files that lie apart in one stream cost one decoding of it, and files behind its damage, or behind the end of a file
// that was cut, none at all.
TEST(ArchiveReader, AStreamIsNotDecodedAgainForEveryFileInIt) {
    BuiltArchive whole = BuildArchive(
        {.entries = {{.bytes = SampleText(2'000'000)}}, .chunkSize = 0, .type = kCompressionLzma, .streamed = true});
    BuiltArchive damaged = whole, cut = whole;
    damaged.bytes[whole.bytes.size() / 2] ^= '\xFF';
    cut.bytes.resize(whole.bytes.size() / 2);
    for (BuiltArchive* built : {&whole, &damaged, &cut}) {
        DisturbedDisk disk;
        OpenedArchive archive(*built);
        for (UInt64 from = 0; from < 2'000'000 - 100; from += 5'000) {
            const std::string text = archive.Read(from, 100);
            EXPECT_EQ(text == "refused" && built != &whole ? text : whole.stream.substr(from, 100), text);
        }
        EXPECT_LT(disk.bytes, whole.bytes.size() * 3 / 2);
    }
}

// It also asks for a dictionary of 4 GiB.
TEST(ArchiveReader, AStreamThatEndsBeforeItsBlockDeliversWhatItHolds) {
    const std::string stream = CompressLzma(SampleText(60'000), {.endMark = true}).replace(1, 4, 4, '\xFF');
    OpenedArchive archive({.entries = {{.bytes = SampleText(100'000)}},
                           .blocks = {{.size = 100'000, .streamed = true, .stored = stream}},
                           .type = kCompressionLzma});
    EXPECT_EQ(SampleText(60'000).substr(50'000), archive.Read(50'000, 40'000));
    EXPECT_EQ("refused", archive.Read(60'000, 10));
}

TEST(ArchiveReader, ADirectoryInTheDataIsReadyOnceItsLastByteHasBeenRead) {
    constexpr UInt64 kDirectorySize = 33, kSize = 36;
    ArchiveDescription description{.layout = ArchiveLayout::kWeb,
                                   .entries = {{.path = "", .bytes = "x"}, {.path = "folder/file", .bytes = "yz"}}};
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
    EXPECT_TRUE(withGap.Read(10, 5).size() == 5 && !withGap.reader.IsDirectoryReady());
    for (const UInt64 count : {3u, 4u}) { // of at least 9 bytes each
        description.fields = {{"entryCount", count}};
        OpenedArchive archive(description);
        EXPECT_TRUE(archive.Read(0, 4).size() == 4 && archive.reader.CanDirectoryBecomeReady() == (count == 3));
    }
}

TEST(ArchiveReader, UseCountOpensAndClosesTheFileUnlessItHasChanged) {
    const size_t descriptors = CountOpenDescriptors();
    DisturbedDisk disk;
    OpenedArchive archive({.entries = {{.bytes = "0123456789"}}, .type = kCompressionLz4});
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
    EXPECT_FALSE(reader.Read(10, 0, nullptr, &count) || reader.Read(1, ~0ull, nullptr, &count) ||
                 reader.Read(~0ull, 2, nullptr, &count) || count != 77);
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
