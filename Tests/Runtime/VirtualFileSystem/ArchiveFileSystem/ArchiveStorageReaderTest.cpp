#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"

#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/FaultyFileSystem.h"
#include "Tests/Support/TemporaryFolder.h"

#include <random>

using Access = ArchiveStorageReaderTestAccess;

namespace {

struct BlockKind {
    const char* name;
    CompressionType type;
    bool isStreamed;
};
const BlockKind kBlockKinds[] = {
    {"stored", kCompressionNone, false},  {"LZMA", kCompressionLzma, false},
    {"LZ4", kCompressionLz4, false},      {"LZ4HC", kCompressionLz4HC, false},
    {"streamed", kCompressionNone, true}, {"LZMA streamed", kCompressionLzma, true},
};

ArchiveDescription Describe(std::string contents, const BlockKind& kind, UInt64 chunkSize) {
    ArchiveDescription description;
    description.entries = {{.path = "a.txt", .bytes = std::move(contents)}};
    description.type = kind.type;
    description.streamed = kind.isStreamed;
    description.chunkSize = chunkSize;
    return description;
}

} // namespace

TEST(ArchiveReader, EveryRangeOfEveryKindOfBlockIsDelivered) {
    constexpr size_t kSize = 400'000;
    const std::string text = SampleText(kSize);
    for (const BlockKind& kind : kBlockKinds) {
        for (UInt64 chunkSize : {1'000u, 65'535u, 65'536u, 65'537u, 131'072u, 0u}) {
            OpenedArchive archive(Describe(text, kind, chunkSize));
            ASSERT_EQ(0, archive.result);
            EXPECT_EQ(text, archive.Read(0, kSize));
            const unsigned seed = static_cast<unsigned>(chunkSize);
            std::mt19937 random(seed);
            for (int count = 0; count < 60; ++count) {
                const size_t from = random() % kSize;
                const size_t size = 1 + random() % std::min<size_t>(kSize - from, 1u << (random() % 19));
                const auto flags = static_cast<FileReadFlags>(random() % 2);
                ASSERT_EQ(text.substr(from, size), archive.Read(from, size, flags))
                    << kind.name << " in blocks of " << chunkSize << ", seed " << seed << ", " << size << " bytes from "
                    << from << ", flags " << flags;
                ASSERT_TRUE(Access::IsCacheIdle(archive.reader));
            }
        }
    }
}

TEST(ArchiveReader, RangesOutsideTheStreamAreRefusedWhole) {
    OpenedArchive archive(Describe(SampleText(1'000), kBlockKinds[1], 300));
    ASSERT_EQ(0, archive.result);
    const UInt64 kMax = ~UInt64{0};
    const std::pair<UInt64, UInt64> kRefused[] = {
        {1'000, 0},  {1'000, 1}, {999, 2},     {0, 1'001},           {10, kMax},
        {999, kMax}, {kMax, 1},  {kMax, kMax}, {1, UInt64{1} << 32},
    };
    for (const auto& [from, size] : kRefused) {
        UInt64 count = 77;
        char byte;
        EXPECT_FALSE(archive.reader.Read(from, size, &byte, &count)) << size << " from " << from;
        EXPECT_EQ(77u, count);
    }
    EXPECT_EQ(SampleText(1'000).substr(999), archive.Read(999, 1));
    UInt64 count = 77;
    EXPECT_TRUE(archive.reader.Read(0, 0, nullptr, &count));
    EXPECT_EQ(0u, count);
}

TEST(ArchiveReader, WithoutBlocksEveryReadIsRefused) {
    ArchiveDescription description;
    OpenedArchive archive(description);
    ASSERT_EQ(0, archive.result);
    EXPECT_EQ("refused", archive.Read(0, 0));
    EXPECT_EQ("refused", archive.Read(0, 1));
    ArchiveStorageReader idle(kMemLabelFileSystem);
    UInt64 count = 0;
    EXPECT_FALSE(idle.Read(0, 0, nullptr, &count));
}

TEST(ArchiveReader, OneThreadNeedsOneRecordAndWholeBlocksNone) {
    const std::string text = SampleText(40'000);
    OpenedArchive archive(Describe(text, kBlockKinds[2], 10'000));
    EXPECT_EQ(text.substr(10'000, 20'000), archive.Read(10'000, 20'000));
    EXPECT_EQ(0u, Access::CachedBlockCount(archive.reader));
    EXPECT_EQ(text.substr(10'000, 10'000), archive.Read(10'000, 10'000, kFileReadFlagsThroughCache));
    EXPECT_EQ(1u, Access::CachedBlockCount(archive.reader));
    for (size_t from = 0; from < text.size(); from += 1'234)
        archive.Read(from, std::min<size_t>(1'234, text.size() - from));
    EXPECT_EQ(1u, Access::CachedBlockCount(archive.reader));
}

// A stream is gone on with where the window ends, started anew for what lies before it, and read over for what lies
// behind it.
TEST(ArchiveReader, StreamedBlocksServeEveryOrderOfReads) {
    const std::string text = SampleText(300'000);
    const UInt64 kOrders[][6] = {
        {0, 65'536, 131'072, 196'608, 262'144, 0},
        {299'999, 0, 65'535, 65'536, 131'071, 131'072},
        {200'000, 131'072, 65'536, 0, 299'999, 150'000},
        {65'537, 65'536, 65'536, 262'145, 262'143, 10},
    };
    for (const auto& order : kOrders) {
        OpenedArchive archive(Describe(text, kBlockKinds[5], 0));
        for (UInt64 from : order) {
            const size_t size = std::min<size_t>(70'000, text.size() - static_cast<size_t>(from));
            ASSERT_EQ(text.substr(static_cast<size_t>(from), size), archive.Read(from, size)) << from;
        }
        EXPECT_EQ(1u, Access::CachedBlockCount(archive.reader));
    }
}

// Stored bytes that are not those of the block: whatever is damaged, the other blocks come out, and a block that failed
// fails again, without a crash.
TEST(ArchiveReader, ADamagedBlockFailsAloneAndEveryTime) {
    const std::string text = SampleText(300'000);
    for (const BlockKind& kind : {kBlockKinds[1], kBlockKinds[2], kBlockKinds[5]}) {
        SCOPED_TRACE(kind.name);
        ArchiveDescription description = Describe(text, kind, 100'000);
        BuiltArchive built = BuildArchive(description);
        const size_t second = static_cast<size_t>(built.dataOffset) +
                              Compress(kind.type, std::string_view(text).substr(0, 100'000)).size();
        for (size_t index = second + 200; index < second + 400; ++index)
            built.bytes[index] = static_cast<char>(~built.bytes[index]);
        OpenedArchive archive(std::move(built));
        ASSERT_EQ(0, archive.result);
        for (int round = 0; round < 3; ++round) {
            EXPECT_EQ("refused", archive.Read(199'990, 5));
            EXPECT_EQ("refused", archive.Read(100'000, 100'000));
            EXPECT_EQ("refused", archive.Read(0, 300'000)); // a whole block fails the call, whatever came before it
            EXPECT_EQ(text.substr(50'000, 50'000), archive.Read(50'000, 149'000)); // a part of one only ends it
            EXPECT_EQ(text.substr(200'001, 99'999), archive.Read(200'001, 99'999));
            EXPECT_TRUE(Access::IsCacheIdle(archive.reader));
        }
    }
}

namespace {

// Counts the stored bytes that are read.
class ReadCounter : public FaultyFileSystem {
public:
    using FaultyFileSystem::Read;
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override {
        bytes += size;
        return FaultyFileSystem::Read(entry, size, buffer, actual, flags);
    }
    UInt64 bytes = 0;
};

} // namespace

// Files that lie apart in one stream cost one decoding of it, and files behind its damage, or behind the end of a file
// that was cut, none at all.
TEST(ArchiveReader, AStreamIsNotDecodedAgainForEveryFileInIt) {
    TemporaryFolder folder;
    const BuiltArchive built = BuildArchive(Describe(SampleText(2'000'000), kBlockKinds[5], 0));
    const UInt64 storedSize = built.bytes.size();
    std::string damaged = built.bytes;
    damaged[damaged.size() / 2] = static_cast<char>(~damaged[damaged.size() / 2]);
    std::string cut = built.bytes.substr(0, built.bytes.size() / 2);
    for (const std::string& bytes : {built.bytes, damaged, cut}) {
        const std::string path = folder / "archive";
        WriteFile(path, bytes);
        ReadCounter counter;
        ArchiveStorageReader reader(kMemLabelFileSystem);
        ASSERT_EQ(0, reader.Initialize(core::string(path.c_str()), 0));
        counter.bytes = 0;
        std::string piece(100, '\0');
        UInt64 count = 0;
        for (UInt64 from = 0; from < 2'000'000 - 100; from += 5'000) {
            if (!reader.Read(from, 100, piece.data(), &count)) continue;
            EXPECT_EQ(built.stream.substr(static_cast<size_t>(from), 100), piece);
        }
        EXPECT_LT(counter.bytes, storedSize + storedSize / 2);
    }
}

// The file ends exactly where a block starts, or inside it: no byte at all is a failed read.
TEST(ArchiveReader, CutFilesAreToldApart) {
    TemporaryFolder folder;
    const BuiltArchive built = BuildArchive(Describe(SampleText(100'000), kBlockKinds[1], 50'000));
    const size_t second = static_cast<size_t>(built.dataOffset) +
                          Compress(kCompressionLzma, std::string_view(built.stream).substr(0, 50'000)).size();
    const std::pair<size_t, int> kCases[] = {
        {second, -2}, {second + 1, 1}, {built.bytes.size() - 1, 1}, {built.bytes.size(), 0}};
    for (const auto& [length, expected] : kCases) {
        const std::string path = folder / "cut";
        WriteFile(path, built.bytes.substr(0, length));
        ArchiveStorageReader reader(kMemLabelFileSystem);
        ASSERT_EQ(0, reader.Initialize(core::string(path.c_str()), 0));
        EXPECT_EQ(expected, Access::Fill(reader, 1)) << "cut at " << length;
        EXPECT_EQ(0, Access::Fill(reader, 0));
    }
}

TEST(ArchiveReader, StreamsThatEndEarlyDeliverWhatTheyHold) {
    ArchiveDescription description = Describe(SampleText(200'000), kBlockKinds[5], 0);
    description.lzma.endMark = true;
    description.fields = {{"block[0].uncompressedSize", 250'000}};
    OpenedArchive archive(description);
    ASSERT_EQ(0, archive.result);
    EXPECT_EQ(archive.built.stream.substr(190'000), archive.Read(190'000, 60'000));
    EXPECT_EQ("refused", archive.Read(210'000, 10));
}

// Properties may name a dictionary of 4 GiB: it is asked for, and only what is decoded is touched.
TEST(ArchiveReader, ADictionaryLargerThanTheDataChangesNothing) {
    const std::string text = SampleText(100'000);
    std::string stored = CompressLzma(text);
    stored.replace(1, 4, 4, '\xFF');
    for (bool isStreamed : {false, true}) {
        ArchiveDescription description = Describe(text, kBlockKinds[1], 0);
        description.blocks = {{.size = text.size(), .streamed = isStreamed, .stored = stored}};
        OpenedArchive archive(description);
        ASSERT_EQ(0, archive.result);
        EXPECT_EQ(text.substr(70'000, 20'000), archive.Read(70'000, 20'000));
    }
}

TEST(ArchiveReader, KindsWithoutADecoderFailAndSaySo) {
    struct Case {
        UInt16 flags;
        std::string output;
    };
    const std::string kNoStream = "Decompressor's stream must be initialized!\n";
    const Case kCases[] = {
        {4, "Decompressing this format (4) is not supported on this platform.\n"},
        {5, "Assertion failed on expression: 't < kCompressionCount'\n"},
        {0x42, kNoStream},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(row.flags);
        ArchiveDescription description = Describe(SampleText(1'000), kBlockKinds[0], 0);
        description.fields = {{"block[0].flags", row.flags}};
        OpenedArchive archive(description);
        ASSERT_EQ(0, archive.result);
        ConsoleCapture capture;
        EXPECT_EQ("refused", archive.Read(1, 10));
        const std::string output = capture.Text();
        EXPECT_EQ(row.output, output.substr(0, row.output.size())) << output;
        EXPECT_TRUE(Access::IsCacheIdle(archive.reader));
    }
}

TEST(ArchiveReader, StoredBytesSkipTheHiddenSizeField) {
    ArchiveDescription description = Describe(SampleText(70'000), kBlockKinds[0], 0);
    description.layout = ArchiveLayout::kWeb;
    OpenedArchive archive(description);
    ASSERT_EQ(0, archive.result);
    std::string stored = archive.built.bytes.substr(static_cast<size_t>(archive.built.dataOffset));
    stored.erase(5, 8);
    for (UInt64 position = 0; position < 8; ++position) {
        for (UInt64 size = 1; size < 12; ++size) {
            std::string bytes(static_cast<size_t>(size), '\0');
            UInt64 delivered = 0;
            ASSERT_TRUE(Access::ReadStored(archive.reader, position, size, bytes.data(), &delivered));
            EXPECT_EQ(size, delivered);
            EXPECT_EQ(stored.substr(static_cast<size_t>(position), static_cast<size_t>(size)), bytes) << position;
        }
    }
}

TEST(ArchiveReader, ADirectoryInTheDataIsCollectedFromReadsInOrder) {
    ArchiveDescription description;
    description.layout = ArchiveLayout::kWeb;
    for (int index = 0; index < 3'000; ++index)
        description.entries.push_back({.path = "folder/file" + std::to_string(index), .bytes = "x"});
    for (UInt64 pieceSize : {1'000u, 65'536u, 70'000u}) {
        OpenedArchive archive(description);
        ASSERT_EQ(0, archive.result);
        EXPECT_FALSE(archive.reader.IsDirectoryReady());
        const UInt64 length = archive.built.stream.size();
        const UInt64 directorySize = length - 3'000;
        for (UInt64 from = 0; from < length; from += pieceSize) {
            EXPECT_EQ(from >= directorySize, archive.reader.IsDirectoryReady()) << from;
            ASSERT_NE("refused", archive.Read(from, std::min(pieceSize, length - from)));
            archive.Read(0, 10); // collected before: no harm
        }
        ASSERT_TRUE(archive.reader.IsDirectoryReady());
        ASSERT_EQ(3'000u, archive.reader.GetDirectoryInfo().nodes.size());
        EXPECT_STREQ("folder/file2999", archive.reader.GetDirectoryInfo().nodes[2'999].path.c_str());
    }

    // Across a gap nothing is parsed: its zeros would be an empty directory.
    OpenedArchive archive(description);
    archive.Read(50'000, 100);
    EXPECT_FALSE(archive.reader.IsDirectoryReady());

    // A count that the stream can't hold is known at once.
    description.fields = {{"entryCount", 0xFFFFFFFF}};
    OpenedArchive hopeless(description);
    EXPECT_TRUE(hopeless.reader.CanDirectoryBecomeReady());
    hopeless.Read(0, 4);
    EXPECT_FALSE(hopeless.reader.CanDirectoryBecomeReady());
}

TEST(ArchiveReader, UseCountOpensAndClosesTheFile) {
    TemporaryFolder folder;
    const std::string path = folder / "archive";
    const std::string text = SampleText(1'000);
    WriteFile(path, BuildArchive(Describe(text, kBlockKinds[2], 0)).bytes);
    const size_t descriptors = CountOpenDescriptors();
    FileSystemEntry entry(path.c_str());
    for (bool canRelease : {true, false}) {
        ArchiveStorageReader reader(kMemLabelFileSystem);
        ASSERT_EQ(0, reader.Initialize(entry, 0, canRelease, true));
        char bytes[10];
        UInt64 count = 0;
        EXPECT_TRUE(reader.Read(5, 10, bytes, &count));
        EXPECT_TRUE(reader.MakeStorageUsed(true));
        reader.MakeStorageUnused();
        EXPECT_EQ(descriptors + 1, CountOpenDescriptors());
        EXPECT_EQ(1u, Access::CachedBlockCount(reader));
        reader.MakeStorageUnused();
        EXPECT_EQ(descriptors + (canRelease ? 0 : 1), CountOpenDescriptors());
        EXPECT_EQ(canRelease ? 0u : 1u, Access::CachedBlockCount(reader));
        if (canRelease) {
            EXPECT_FALSE(reader.Read(5, 10, bytes, &count));
            ConsoleCapture capture;
            reader.MakeStorageUnused();
            EXPECT_EQ("ArchiveStorageReader has mismatched MakeStorageUsed/MakeStorageUnused calls\n", capture.Text());
            EXPECT_TRUE(reader.MakeStorageUsed(true)); // from -1 to 0: not a first use
        }
        EXPECT_TRUE(reader.MakeStorageUsed(true));
        EXPECT_TRUE(reader.Read(5, 10, bytes, &count));
        EXPECT_EQ(text.substr(5, 10), std::string(bytes, 10));
    }
    EXPECT_EQ(descriptors, CountOpenDescriptors());
}

namespace {

// Answers queries of the modification time with a code, and counts down to another time.
class TimeTeller : public FaultyFileSystem {
public:
    DateTime LastModified(const FileEntryData& entry) const override {
        entry.lastError = error;
        return time;
    }
    FileSystemError error = kFileSystemErrorNone;
    DateTime time;
};

} // namespace

TEST(ArchiveReader, AFileThatHasChangedIsRefused) {
    TemporaryFolder folder;
    const std::string path = folder / "archive";
    WriteFile(path, BuildArchive(Describe("text", kBlockKinds[0], 0)).bytes);
    struct Case {
        FileSystemError error;
        bool isChanged;
        std::string initializeOutput;
        bool isUsable;
        std::string useOutput;
    };
    const std::string kModified =
        "Archive file was modified while it was opened, and can no longer be accessed: " + path + "\n";
    const std::string kUnexpected =
        "Unexpected FileSystemError code 14 after call to FileSystemEntry::LastModified() \n";
    const Case kCases[] = {
        {kFileSystemErrorNone, false, "", true, ""},
        {kFileSystemErrorNone, true, "", false, kModified},
        {kFileSystemErrorNotSupported, true, "", true, ""},
        {kFileSystemErrorUnknown, false, kUnexpected + kUnexpected, true, kUnexpected},
        {kFileSystemErrorUnknown, true, kUnexpected + kUnexpected, false, kUnexpected + kModified},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << "error " << row.error << (row.isChanged ? ", changed" : ", unchanged"));
        TimeTeller teller;
        teller.error = row.error;
        ArchiveStorageReader reader(kMemLabelFileSystem);
        {
            ConsoleCapture capture;
            EXPECT_EQ(0, reader.Initialize(core::string(path.c_str()), 0));
            EXPECT_EQ(row.initializeOutput, capture.Text());
        }
        if (row.isChanged) teller.time.ticks = 1;
        ConsoleCapture capture;
        EXPECT_EQ(row.isUsable, reader.MakeStorageUsed(true));
        EXPECT_EQ(row.useOutput, capture.Text());
        EXPECT_EQ(row.isUsable, reader.MakeStorageUsed(false));
    }
}

TEST(ArchiveReader, AnArchiveMayStartInsideAFile) {
    TemporaryFolder folder;
    const std::string text = SampleText(100'000);
    for (bool isAtEnd : {false, true}) {
        ArchiveDescription description = Describe(text, kBlockKinds[1], 30'000);
        description.sectionAtEnd = isAtEnd;
        description.sectionType = kCompressionLz4;
        WriteFile(folder / "container", "prefix!" + BuildArchive(description).bytes);
        ArchiveStorageReader reader(kMemLabelFileSystem);
        ASSERT_EQ(0, reader.Initialize(core::string((folder / "container").c_str()), 7));
        std::string bytes(text.size(), '\0');
        UInt64 count = 0;
        EXPECT_TRUE(reader.Read(0, bytes.size(), bytes.data(), &count));
        EXPECT_EQ(text, bytes);
    }
}
