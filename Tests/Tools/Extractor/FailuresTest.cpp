#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <algorithm>
#include <cstring>
#include <filesystem>

namespace {

ArchiveDescription OneFile() {
    ArchiveDescription archive;
    archive.entries = {{.path = "a.txt", .bytes = Compressible(1'000)}};
    return archive;
}

TEST(UnreadableArchive, MissingFileAndFolderInItsPlace) {
    const TemporaryFolder folder;
    const RunOptions options = {.workingDirectory = folder.Path()};
    EXPECT_EQ((Transcript{.status = 1, .output = kStarting + "Unable to open archive file: a.zarvo\n" + kCantRead}),
              RunVarnex({"a.zarvo"}, options));
    EXPECT_EQ("", Differences({}, ReadFolderTree(folder.Path())));

    std::filesystem::create_directory(folder / "a.zarvo");
    EXPECT_EQ((Transcript{.status = 1, .output = kStarting + kNoHeader}), RunVarnex({"a.zarvo"}, options));
    EXPECT_EQ("", Differences({{"a.zarvo", kFolder}}, ReadFolderTree(folder.Path())));
}

TEST(UnreadableArchive, BytesThatAreNoArchive) {
    const std::string rest = BuildArchive(OneFile()).bytes.substr(8);
    const std::string rows[] = {
        "",
        std::string(1, '\0') + rest,
        std::string("ZarvoF") + '\0' + rest,
        std::string("ZarvoFSx") + '\0' + rest,
        std::string("zarvofs") + '\0' + rest,
        std::string("ZarvoArchiv") + '\0' + rest,
        std::string(64, 'Z'),
        std::string(65, 'Z'),
        std::string(100'000, 'Z'),
        std::string(200, 'Z') + '\0' + rest,
    };
    for (const std::string& bytes : rows) {
        SCOPED_TRACE(testing::PrintToString(bytes.substr(0, 70)) + " and more: " + std::to_string(bytes.size()));
        ExpectOutcome(1, kStarting + kNoHeader, {}, Extract(bytes));
    }
}

TEST(UnreadableArchive, HeaderAndSectionThatContradictThemselves) {
    const std::string kUnsupported = "Decompressing this format (%) is not supported on this platform.\n";
    const auto Unsupported = [&](const char* kind) { return std::string(kUnsupported).replace(27, 1, kind); };
    const ArchiveLayout kBlocks = ArchiveLayout::kBlockBased, kOld = ArchiveLayout::kArchive,
                        kRaw = ArchiveLayout::kRaw;
    struct {
        const char* what;
        ArchiveLayout layout;
        CompressionType sectionType;
        bool atEnd;
        std::map<std::string, UInt64> fields;
        std::string messages;
    } const rows[] = {
        {"version 9", kBlocks, kCompressionNone, false, {{"version", 9}}, kNoHeader},
        {"version 2^32 - 1", kBlocks, kCompressionNone, false, {{"version", 0xFFFFFFFF}}, kNoHeader},
        {"old version 4", kOld, kCompressionNone, false, {{"version", 4}}, kNoHeader},
        {"old version 6", kOld, kCompressionNone, true, {{"version", 6}}, kNoHeader},
        {"compressed above uncompressed",
         kBlocks,
         kCompressionNone,
         false,
         {{"uncompressedBlocksInfoSize", 59}},
         kNoHeader},
        {"the same, with LZ4", kBlocks, kCompressionLz4, false, {{"compressedBlocksInfoSize", 61}}, kNoHeader},
        {"section of kind 4", kBlocks, kCompressionNone, false, {{"flags", 0x44}}, Unsupported("4") + kNoHeader},
        {"section of kind 5", kBlocks, kCompressionNone, false, {{"flags", 0x45}}, Unsupported("5") + kNoHeader},
        {"section of kind 63", kBlocks, kCompressionNone, true, {{"flags", 0xFF}}, Unsupported("63") + kNoHeader},
        {"at the end of size 0", kBlocks, kCompressionNone, true, {{"size", 0}}, kWideCast + kCantRead},
        {"at the end of less than itself", kBlocks, kCompressionNone, true, {{"size", 59}}, kWideCast + kCantRead},
        {"at the end of 2^64 - 1", kBlocks, kCompressionNone, true, {{"size", ~UInt64{0}}}, kWideCast + kCantRead},
        {"at the end of too much", kBlocks, kCompressionNone, true, {{"size", 100'000}}, kCantRead},
        {"LZ4 for a stored section", kBlocks, kCompressionNone, false, {{"flags", 0x42}}, kCantRead},
        {"LZMA for a stored section",
         kBlocks,
         kCompressionNone,
         false,
         {{"flags", 0x41}, {"hash.high", ~UInt64{0}}},
         kCantRead},
        {"LZ4 section of fewer bytes",
         kBlocks,
         kCompressionLz4,
         false,
         {{"uncompressedBlocksInfoSize", 61}},
         kCantRead},
        {"LZ4 section of more bytes", kBlocks, kCompressionLz4, false, {{"uncompressedBlocksInfoSize", 59}}, kCantRead},
        {"LZMA section of more bytes",
         kBlocks,
         kCompressionLzma,
         false,
         {{"uncompressedBlocksInfoSize", 61}},
         kCantRead},
        {"LZMA section cut by its size",
         kBlocks,
         kCompressionLzma,
         false,
         {{"uncompressedBlocksInfoSize", 54}},
         kCantRead},
        {"more blocks than the section", kBlocks, kCompressionLz4, false, {{"blockCount", 5}}, kCantRead},
        {"more nodes than the section", kBlocks, kCompressionLz4, false, {{"nodeCount", 2}}, kCantRead},
        {"2^32 - 1 blocks", kBlocks, kCompressionNone, false, {{"blockCount", 0xFFFFFFFF}}, kCantRead},
        {"2^32 - 1 nodes", kBlocks, kCompressionNone, false, {{"nodeCount", 0xFFFFFFFF}}, kCantRead},
        {"levels above their count", kRaw, kCompressionNone, false, {{"levelBound", 2}}, kCantRead},
        {"2^32 - 1 levels", kRaw, kCompressionNone, false, {{"levelCount", 0xFFFFFFFF}}, kCantRead},
        {"2^32 - 1 entries", kRaw, kCompressionNone, false, {{"entryCount", 0xFFFFFFFF}}, kCantRead},
        {"legacy data past the end", kRaw, kCompressionNone, false, {{"headerSize", 1'000'000}}, kCantRead},
        {"old header past the end", kOld, kCompressionNone, false, {{"headerPosition", 1'000'000}}, kCantRead},
        {"old directory past the end", kOld, kCompressionNone, true, {{"directoryPosition", 1'000'000}}, kCantRead},
        {"2^32 - 1 old nodes", kOld, kCompressionNone, false, {{"nodeCount", 0xFFFFFFFF}}, kCantRead},
        {"2^32 - 1 old blocks", kOld, kCompressionNone, false, {{"blockCount", 0xFFFFFFFF}}, kCantRead},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        ArchiveDescription archive = OneFile();
        archive.layout = row.layout;
        archive.sectionType = row.sectionType;
        archive.sectionAtEnd = row.atEnd;
        archive.fields = row.fields;
        ExpectOutcome(1, kStarting + row.messages, {}, Extract(BuildArchive(archive).bytes));
    }
}

TEST(UnreadableArchive, StoredSectionOfTwoSizesIsReportedAndRead) {
    ArchiveDescription archive = OneFile();
    archive.fields = {{"uncompressedBlocksInfoSize", 61}};
    const BuiltArchive built = BuildArchive(archive);
    std::string report = Report(7, built.bytes.size());
    report.insert(kStarting.size(), "Archive file has invalid uncompressed header size!\n");
    ExpectOutcome(0, report, TreeOf(archive.entries), Extract(built.bytes));
}

// How much of an archive of one file, a.txt of 20 bytes, is needed for what.
struct TruncationRow {
    const char* what;
    ArchiveDescription archive;
    size_t signatureLength; // without its NUL, which may be missing
    size_t loadEnd;         // bytes that must be there for the archive to be opened
    size_t nameEnd;         // the name is cut with the file when it ends before; 0: never
    size_t dataStart;       // of the file's bytes
};

std::vector<TruncationRow> TruncationRows() {
    std::vector<TruncationRow> rows;
    const auto Add = [&](const char* what, ArchiveLayout layout, CompressionType sectionType, bool atEnd) {
        ArchiveDescription archive;
        archive.entries = {{.path = "a.txt", .bytes = Incompressible(20)}};
        archive.layout = layout;
        archive.sectionType = sectionType;
        archive.sectionAtEnd = atEnd;
        const BuiltArchive built = BuildArchive(archive);
        const size_t dataStart = built.bytes.find(archive.entries[0].bytes);
        // With its section stored, the last thing that is read before the data is the name, of at least one character.
        const bool isNameLast = layout == ArchiveLayout::kBlockBased && sectionType == kCompressionNone;
        const size_t directoryEnd = atEnd ? built.bytes.size() : dataStart;
        rows.push_back({what, archive, strlen(built.bytes.c_str()), isNameLast ? directoryEnd - 5 : directoryEnd,
                        isNameLast ? directoryEnd - 1 : 0, dataStart});
    };
    Add("section before the data", ArchiveLayout::kBlockBased, kCompressionNone, false);
    Add("section behind the data", ArchiveLayout::kBlockBased, kCompressionNone, true);
    Add("compressed section before the data", ArchiveLayout::kBlockBased, kCompressionLz4, false);
    Add("compressed section behind the data", ArchiveLayout::kBlockBased, kCompressionLzma, true);
    Add("raw", ArchiveLayout::kRaw, kCompressionNone, false);
    Add("old, header before the data", ArchiveLayout::kArchive, kCompressionNone, false);
    Add("old, header behind the data", ArchiveLayout::kArchive, kCompressionNone, true);
    return rows;
}

TEST(TruncatedArchive, EveryCutEndsInTheRightMessage) {
    for (const TruncationRow& row : TruncationRows()) {
        const std::string whole = BuildArchive(row.archive).bytes;
        const std::string header = row.archive.layout == ArchiveLayout::kArchive ? Report(5, 0, "")
                                   : row.archive.layout == ArchiveLayout::kRaw   ? Report(3, whole.size(), "")
                                                                                 : Report(7, whole.size(), "");
        for (size_t cut = 0; cut <= whole.size(); ++cut) {
            SCOPED_TRACE(testing::Message() << row.what << ", cut at " << cut);
            const Outcome outcome = Extract(whole.substr(0, cut));
            if (cut < row.loadEnd) {
                ExpectOutcome(1, kStarting + (cut < row.signatureLength ? kNoHeader : kCantRead), {}, outcome);
                continue;
            }
            const std::string name = std::string("a.txt").substr(0, cut < row.nameEnd ? 5 - (row.nameEnd - cut) : 5);
            const std::string bytes =
                whole.substr(row.dataStart, 20).substr(0, cut < row.dataStart ? 0 : cut - row.dataStart);
            const bool isWhole = bytes.size() == 20;
            ExpectOutcome(isWhole ? 0 : 1,
                          header + (isWhole ? kAllOk : "ERROR: failed to decompress file " + name + "\n"),
                          OutputTree({{name, bytes}}), outcome);
        }
    }
}

TEST(TruncatedArchive, WebStreamThatIsCutHasNoDirectory) {
    ArchiveDescription archive;
    archive.layout = ArchiveLayout::kWeb;
    archive.entries = {{.path = "a.txt", .bytes = ExtremelyCompressible(65'600)}};
    const BuiltArchive whole = BuildArchive(archive);
    // The decoder does without the last bytes, which only end the stream.
    for (size_t cut = 0; cut < whole.bytes.size() - 5; ++cut) {
        SCOPED_TRACE(cut);
        const std::string output = cut < 8                  ? kStarting + kNoHeader
                                   : cut < whole.dataOffset ? kStarting + kCantRead
                                                            : HeaderReport(3, whole.bytes.size()) + kNoDirectory;
        ExpectOutcome(1, output, {}, Extract(whole.bytes.substr(0, cut)));
    }
}

std::string FailedToDecompress(const std::string& path) { return "ERROR: failed to decompress file " + path + "\n"; }

TEST(DamagedData, NodesPastTheEndOfTheDataFailAndTheOthersDoNot) {
    constexpr UInt64 kSize = 100'000;
    struct {
        UInt64 offset, size, delivered;
    } const rows[] = {
        {0, kSize, kSize},
        {0, kSize + 1, 65'536}, // the pieces before the one that passes the end
        {kSize - 1, 1, 1},
        {kSize - 1, 2, 0},
        {kSize, 0, 0}, // nothing is read
        {kSize, 1, 0},
        {kSize + 1, 0, 0},
        {0x7FFFFFFF, 1, 0},
        {0x80000000, 1, 0},
        {0xFFFFFFFF, 1, 0},
        {10, 0xFFFFFFFF, 65'536},
        {10, 0x7FFF'FFFF'FFFF'FFFF, 65'536},
        {10, ~UInt64{0}, 65'536},
        {0x7FFF'FFFF'FFFF'FFFF, 1, 0},
        {0x8000'0000'0000'0000, 0x8000'0000'0000'0000, 0},
        {~UInt64{0}, 1, 0},
        {~UInt64{0}, ~UInt64{0}, 0},
        {0, kSize, kSize},
    };
    for (const CompressionType type : {kCompressionNone, kCompressionLzma, kCompressionLz4}) {
        for (const UInt64 chunkSize : std::vector<UInt64>{0, 30'000}) {
            SCOPED_TRACE(testing::Message() << "kind " << type << ", blocks of " << chunkSize);
            ArchiveDescription archive;
            archive.type = type;
            archive.chunkSize = chunkSize;
            archive.entries = {{.bytes = Compressible(kSize), .listed = false}};
            const std::string stream = archive.entries[0].bytes;
            FolderTree contents;
            std::string messages;
            for (size_t index = 0; index < std::size(rows); ++index) {
                const std::string name = std::to_string(index);
                archive.entries.push_back({.path = name});
                archive.fields["node[" + name + "].offset"] = rows[index].offset;
                archive.fields["node[" + name + "].size"] = rows[index].size;
                contents[name] =
                    rows[index].delivered == 0 ? "" : stream.substr(rows[index].offset, rows[index].delivered);
                if (rows[index].delivered != rows[index].size) messages += FailedToDecompress(name);
            }
            const BuiltArchive built = BuildArchive(archive);
            ExpectOutcome(1, Report(7, built.bytes.size(), messages), OutputTree(contents), Extract(built.bytes));
        }
    }
}

// What is delivered of a file when one of the blocks that hold it is damaged.
TEST(DamagedData, WholeBlockThatFailsSpoilsItsReadAndPartOfOneOnlyItself) {
    struct {
        const char* what;
        UInt64 chunkSize;
        size_t damagedBlock;
        UInt64 delivered;
    } const rows[] = {
        {"the first block", 50'000, 0, 0},
        {"a block that the first read needs in part", 50'000, 1, 50'000},
        {"a block that the first read needs whole", 20'000, 1, 0},
        {"a block of the second read", 65'536, 1, 65'536},
    };
    for (const auto& row : rows) {
        for (const CompressionType type : {kCompressionLz4, kCompressionLz4HC, kCompressionLzma}) {
            SCOPED_TRACE(testing::Message() << row.what << ", kind " << type);
            ArchiveDescription archive;
            archive.entries = {{.path = "a.bin", .bytes = Compressible(100'000)}, {.path = "b.txt", .bytes = "text"}};
            archive.type = type;
            for (UInt64 position = 0; position < 100'000; position += row.chunkSize)
                archive.blocks.push_back({.size = std::min(row.chunkSize, 100'000 - position)});
            archive.blocks.push_back({.size = 4});
            archive.blocks[row.damagedBlock].stored = std::string(1'000, '\xFF');
            const BuiltArchive built = BuildArchive(archive);
            ExpectOutcome(1, Report(7, built.bytes.size(), FailedToDecompress("a.bin")),
                          OutputTree({{"a.bin", archive.entries[0].bytes.substr(0, row.delivered)}, {"b.txt", "text"}}),
                          Extract(built.bytes));
        }
    }
}

TEST(DamagedData, BlocksWhoseSizesAreNotThoseOfTheirBytes) {
    const std::string kPastEnd = "Assertion failed on expression: 'position + size <= m_EndPos'\n";
    struct {
        const char* what;
        CompressionType type;
        std::map<std::string, UInt64> fields;
        size_t cut; // bytes that the file lacks at its end
        UInt64 delivered;
        std::string messages;
    } const rows[] = {
        {"LZ4 of fewer bytes", kCompressionLz4, {{"block[0].uncompressedSize", 1'001}}, 0, 0, ""},
        {"LZ4 of more bytes", kCompressionLz4, {{"block[0].uncompressedSize", 999}, {"node[0].size", 999}}, 0, 0, ""},
        {"LZMA of fewer bytes", kCompressionLzma, {{"block[0].uncompressedSize", 1'001}}, 0, 0, ""},
        {"LZ4 cut by a byte", kCompressionLz4, {}, 1, 0, ""},
        {"LZMA cut by 10 bytes", kCompressionLzma, {}, 10, 0, ""},
        {"LZ4 cut whole", kCompressionLz4, {{"block[0].compressedSize", 900}}, 900, 0, ""},
        {"stored, cut", kCompressionNone, {}, 100, 900, ""},
        {"stored in fewer bytes", kCompressionNone, {{"block[0].compressedSize", 900}}, 100, 900, kPastEnd + kPastEnd},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.what);
        ArchiveDescription archive;
        archive.entries = {{.path = "a.bin", .bytes = Compressible(1'000)}};
        archive.type = row.type;
        archive.fields = row.fields;
        std::string bytes = BuildArchive(archive).bytes;
        const UInt64 size = bytes.size();
        bytes.resize(size - std::min<size_t>(row.cut, size - BuildArchive(archive).dataOffset));
        ExpectOutcome(1, Report(7, size, row.messages + FailedToDecompress("a.bin")),
                      OutputTree({{"a.bin", archive.entries[0].bytes.substr(0, row.delivered)}}), Extract(bytes));
    }
}

} // namespace
