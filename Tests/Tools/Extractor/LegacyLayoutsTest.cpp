#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

constexpr UInt64 kTransferSize = 65'536;

ArchiveDescription Legacy(ArchiveLayout layout) {
    ArchiveDescription archive;
    archive.layout = layout;
    archive.entries = {
        {.path = "level0", .bytes = Compressible(3'000)},
        {.path = "folder/sharedassets0.assets", .bytes = Compressible(150'000, 2)},
        {.path = "empty"},
        {.path = "data.resource", .bytes = "text"},
    };
    return archive;
}

// A ZarvoWeb archive whose directory takes directorySize bytes of a data stream of streamSize bytes.
ArchiveDescription WebOfSizes(UInt64 directorySize, UInt64 streamSize) {
    ArchiveDescription archive;
    archive.layout = ArchiveLayout::kWeb;
    for (UInt64 left = directorySize - 4; left > 0;) {
        const UInt64 size = left < 800 ? left : 400; // of an entry: its path and 9 bytes
        const std::string name = "/" + std::to_string(archive.entries.size());
        archive.entries.push_back({.path = PathOfLength(size - 9 - name.size()) + name});
        left -= size;
    }
    archive.entries.back().bytes = ExtremelyCompressible(streamSize - directorySize);
    return archive;
}

TEST(LegacyLayouts, EveryVersionAndNumberOfLevels) {
    for (const ArchiveLayout layout : {ArchiveLayout::kWeb, ArchiveLayout::kRaw}) {
        for (const UInt32 version : {0u, 1u, 2u, 3u, 4u, 5u, 0x7FFFFFFFu}) {
            for (const UInt32 levels : {1u, 2u, 5u}) {
                SCOPED_TRACE(testing::Message() << (layout == ArchiveLayout::kWeb ? "web" : "raw") << ", version "
                                                << version << ", levels " << levels);
                ArchiveDescription archive = Legacy(layout);
                archive.version = version;
                archive.levelCount = levels;
                // The stored flags of nodes play no part here, and the bound may be below the count.
                archive.fields = {{"levelBound", levels - 1}};
                const BuiltArchive built = BuildArchive(archive);
                ExpectOutcome(0, Report(version, version < 2 ? 0 : built.bytes.size()), TreeOf(archive.entries),
                              Extract(built.bytes));
            }
        }
    }
}

TEST(LegacyLayouts, WithoutLevelsThereIsNoData) {
    ArchiveDescription archive = Legacy(ArchiveLayout::kRaw);
    archive.levelCount = 0;
    BuiltArchive built = BuildArchive(archive);
    ExpectOutcome(
        1,
        Report(3, built.bytes.size(),
               "ERROR: failed to decompress file level0\n"
               "ERROR: failed to decompress file folder/sharedassets0.assets\n"
               "ERROR: failed to decompress file data.resource\n"),
        OutputTree({{"level0", ""}, {"folder/sharedassets0.assets", ""}, {"empty", ""}, {"data.resource", ""}}),
        Extract(built.bytes));

    archive.layout = ArchiveLayout::kWeb;
    built = BuildArchive(archive);
    ExpectOutcome(1, HeaderReport(3, built.bytes.size()) + kNoDirectory, {}, Extract(built.bytes));
}

// Every read that looks for the directory asks for 65,536 bytes, and a stream that can't give as many is refused.
TEST(LegacyLayouts, WebDirectoryIsFoundInWholePiecesOnly) {
    struct {
        UInt64 directorySize, streamSize;
        bool isFound;
    } const rows[] = {
        {1'000, kTransferSize - 1, false},
        {1'000, kTransferSize, true},
        {1'000, kTransferSize + 1, true},
        {kTransferSize - 1, kTransferSize, true},
        {kTransferSize, kTransferSize, true},
        {kTransferSize + 1, kTransferSize + 1, false},
        {kTransferSize + 1, 2 * kTransferSize - 1, false},
        {kTransferSize + 1, 2 * kTransferSize, true},
        {2 * kTransferSize, 2 * kTransferSize, true},
        {2 * kTransferSize + 4, 3 * kTransferSize, true},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::Message() << "directory of " << row.directorySize << ", stream of " << row.streamSize);
        const ArchiveDescription archive = WebOfSizes(row.directorySize, row.streamSize);
        const BuiltArchive built = BuildArchive(archive);
        EXPECT_EQ(row.streamSize, built.stream.size());
        if (row.isFound)
            ExpectOutcome(0, Report(3, built.bytes.size()), TreeOf(archive.entries), Extract(built.bytes));
        else
            ExpectOutcome(1, HeaderReport(3, built.bytes.size()) + kNoDirectory, {}, Extract(built.bytes));
    }
}

TEST(LegacyLayouts, WebStreamWithOrWithoutEndMarkAtEveryStoredSizeAroundTheInputPiece) {
    for (const bool endMark : {false, true}) {
        for (const size_t size : std::vector<size_t>{64'400, 64'700, 65'536, 131'072, 200'000}) {
            SCOPED_TRACE(testing::Message() << size << (endMark ? " with end mark" : ""));
            ArchiveDescription archive;
            archive.layout = ArchiveLayout::kWeb;
            archive.lzma.endMark = endMark;
            archive.entries = {{.path = "random", .bytes = Incompressible(size)},
                               {.path = "tail", .bytes = ExtremelyCompressible(70'000)}};
            const BuiltArchive built = BuildArchive(archive);
            ExpectOutcome(0, Report(3, built.bytes.size()), TreeOf(archive.entries), Extract(built.bytes));
        }
    }
}

TEST(LegacyLayouts, WebDataThatIsTooShortForAStreamIsNoDirectory) {
    const std::string stored = CompressLzma(ExtremelyCompressible(kTransferSize));
    for (const size_t storedSize : std::vector<size_t>{0, 1, 4, 5, 8, 9, 12, 13, 14}) {
        SCOPED_TRACE(storedSize);
        ArchiveDescription archive = WebOfSizes(1'000, kTransferSize);
        archive.blocks = {{.size = kTransferSize, .stored = stored.substr(0, storedSize)}};
        const BuiltArchive built = BuildArchive(archive);
        ExpectOutcome(1, HeaderReport(3, built.bytes.size()) + kNoDirectory, {}, Extract(built.bytes));
    }
}

TEST(OldArchive, EveryKindOfBlockWithItsHeaderBeforeOrBehindTheData) {
    for (const CompressionType type : {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC}) {
        for (const bool streamed : {false, true}) {
            for (const bool headerAtEnd : {false, true}) {
                if (streamed && (type == kCompressionLz4 || type == kCompressionLz4HC)) continue;
                SCOPED_TRACE(testing::Message() << "kind " << type << (streamed ? " streamed" : "")
                                                << (headerAtEnd ? ", header at the end" : ""));
                ArchiveDescription archive = Legacy(ArchiveLayout::kArchive);
                archive.entries.push_back({.path = "folder/inner", .flags = kFolderEntry});
                archive.type = type;
                archive.streamed = streamed;
                archive.sectionAtEnd = headerAtEnd;
                ExpectOutcome(0, Report(5, 0), TreeOf(archive.entries), Extract(BuildArchive(archive).bytes));
            }
        }
    }
}

TEST(OldArchive, OnlyTheFirstBitOfTheStreamedWordCounts) {
    const std::string kNotStarted = "Decompressor's stream must be initialized!\n";
    struct {
        UInt64 word;
        bool isStreamed;
    } const rows[] = {{2, false}, {3, true}, {0xFFFFFFFE, false}, {0xFFFFFFFF, true}};
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::Message() << "streamed word " << row.word);
        ArchiveDescription archive;
        archive.layout = ArchiveLayout::kArchive;
        archive.entries = {{.path = "a.bin", .bytes = Compressible(5'000)}};
        archive.type = kCompressionLz4;
        // LZ4 can't be streamed, so a block that is taken as streamed fails.
        archive.fields = {{"running[0].streamed", row.word}, {"running[0].type", 0xFFFFFFC2}};
        const std::string failure = kNotStarted + "ERROR: failed to decompress file a.bin\n";
        ExpectOutcome(row.isStreamed ? 1 : 0, Report(5, 0, row.isStreamed ? failure : kAllOk),
                      OutputTree({{"a.bin", row.isStreamed ? "" : archive.entries[0].bytes}}),
                      Extract(BuildArchive(archive).bytes));
    }
}

TEST(OldArchive, DifferencesThatAreTooWideAreReportedAndKeepTheirLowBits) {
    struct {
        std::map<std::string, UInt64> fields;
        int reports;
    } const rows[] = {
        {{{"running[0].uncompressed", 0}, {"running[1].uncompressed", 0x7'0000'0004}}, 1},
        {{{"running[0].uncompressed", 100}, {"running[1].uncompressed", 0xFFFF'FFFF'0000'0068}}, 1}, // falls
        {{{"running[0].stored", 0}, {"running[1].stored", 0x1'0000'0004}}, 1},
        {{{"running[0].uncompressed", ~UInt64{0}}, {"running[1].uncompressed", 3}}, 0}, // 4 more, across 2^64
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.fields.begin()->first + ", " + std::to_string(row.fields.rbegin()->second));
        ArchiveDescription archive;
        archive.layout = ArchiveLayout::kArchive;
        archive.entries = {{.path = "a.txt", .bytes = "text"}};
        archive.fields = row.fields;
        const std::string report = Report(5, 0).replace(kStarting.size(), 0, row.reports == 1 ? kWideCast : "");
        ExpectOutcome(0, report, TreeOf(archive.entries), Extract(BuildArchive(archive).bytes));
    }
}

TEST(OldArchive, WithoutNodesOrBlocks) {
    ArchiveDescription archive;
    archive.layout = ArchiveLayout::kArchive;
    ExpectOutcome(0, Report(5, 0), OutputTree({}), Extract(BuildArchive(archive).bytes));
    archive.entries = {{.path = "empty"}, {.path = "folder", .flags = kFolderEntry}};
    ExpectOutcome(0, Report(5, 0), TreeOf(archive.entries), Extract(BuildArchive(archive).bytes));
}

} // namespace
