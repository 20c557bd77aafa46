#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

struct Filling {
    const char* name;
    std::string (*make)(size_t size);
};

const Filling kFillings[] = {
    {"incompressible", [](size_t size) { return Incompressible(size); }},
    {"compressible", [](size_t size) { return Compressible(size); }},
    {"extremely compressible", ExtremelyCompressible},
};

ArchiveDescription Streamed(bool endMark) {
    ArchiveDescription archive;
    archive.type = kCompressionLzma;
    archive.streamed = true;
    archive.lzma.endMark = endMark;
    return archive;
}

void ExpectWholeExtraction(const ArchiveDescription& archive) {
    const BuiltArchive built = BuildArchive(archive);
    ExpectOutcome(0, Report(7, built.bytes.size()), TreeOf(archive.entries), Extract(built.bytes));
}

// One archive holds all sizes, each as a block and a file of its own.
TEST(StreamedBlocks, OfEverySizeComeOutWhole) {
    for (const Filling& filling : kFillings) {
        for (const bool endMark : {false, true}) {
            SCOPED_TRACE(testing::Message() << filling.name << (endMark ? " with end mark" : ""));
            ArchiveDescription archive = Streamed(endMark);
            for (const UInt64 size : std::vector<UInt64>{1, 2, 3, 4, 5, 13, 65'535, 65'536, 65'537, 131'071, 131'072,
                                                         131'073, 196'607, 196'608, 196'609, 327'680}) {
                archive.entries.push_back({.path = std::to_string(size), .bytes = filling.make(size)});
                archive.blocks.push_back({.size = size});
            }
            ExpectWholeExtraction(archive);
        }
    }
}

// The number of incompressible bytes that the encoder makes exactly this many stored bytes of.
size_t PlainSizeFor(size_t storedSize, const LzmaSettings& lzma) {
    const std::string plain = Incompressible(storedSize);
    size_t low = 0, high = storedSize;
    while (low < high) {
        const size_t middle = (low + high) / 2;
        if (CompressLzma(plain.substr(0, middle), lzma).size() < storedSize)
            low = middle + 1;
        else
            high = middle;
    }
    return low;
}

TEST(StreamedBlocks, OfStoredSizesAtAndAroundTheInputPieceComeOutWhole) {
    for (const bool endMark : {false, true}) {
        ArchiveDescription archive = Streamed(endMark);
        for (const size_t storedSize : std::vector<size_t>{13, 65'535, 65'536, 65'537, 131'072, 131'073}) {
            const size_t size = PlainSizeFor(storedSize, archive.lzma);
            const std::string bytes = Incompressible(storedSize).substr(0, size);
            // Some sizes the encoder skips; what it makes is then one or two bytes more.
            EXPECT_NEAR(static_cast<double>(storedSize), static_cast<double>(CompressLzma(bytes, archive.lzma).size()),
                        endMark ? 8 : 2);
            archive.entries.push_back({.path = std::to_string(storedSize), .bytes = bytes});
            archive.blocks.push_back({.size = size});
        }
        SCOPED_TRACE(endMark ? "with end mark" : "without end mark");
        ExpectWholeExtraction(archive);
    }
}

struct Range {
    UInt64 offset, size;
};

// Nodes that name ranges of one block, whose bytes are not listed otherwise.
void AddRanges(const std::vector<Range>& ranges, ArchiveDescription* archive) {
    for (size_t index = 0; index < ranges.size(); ++index) {
        const std::string name = std::to_string(index);
        archive->entries.push_back({.path = name});
        archive->fields["node[" + name + "].offset"] = ranges[index].offset;
        archive->fields["node[" + name + "].size"] = ranges[index].size;
    }
}

TEST(StreamedBlocks, RangesInAnyOrder) {
    constexpr UInt64 kSize = 300'000;
    const std::vector<Range> ranges = {
        {0, 1},          {65'535, 1},      {65'536, 1}, {131'071, 1}, {131'072, 1}, {kSize - 1, 1}, {196'608, 70'000},
        {131'071, 2},    {65'535, 65'537}, {65'534, 3}, {1, 1},       {0, kSize},   {kSize - 1, 1}, {200'000, 100'000},
        {65'537, 1'000}, {66'538, 1'000},  {0, 65'536}, {1, 65'536},
    };
    for (const Filling& filling : kFillings) {
        for (const CompressionType type : {kCompressionNone, kCompressionLzma}) {
            SCOPED_TRACE(testing::Message() << filling.name << ", kind " << type);
            ArchiveDescription archive = Streamed(false);
            archive.type = type;
            archive.chunkSize = 0;
            archive.entries = {{.bytes = filling.make(kSize), .listed = false}};
            const std::string stream = archive.entries[0].bytes;
            AddRanges(ranges, &archive);
            FolderTree contents;
            for (size_t index = 0; index < ranges.size(); ++index)
                contents[std::to_string(index)] = stream.substr(ranges[index].offset, ranges[index].size);
            const BuiltArchive built = BuildArchive(archive);
            ExpectOutcome(0, Report(7, built.bytes.size()), OutputTree(contents), Extract(built.bytes));
        }
    }
}

std::string Failures(std::initializer_list<int> nodes, const std::string& before = "") {
    std::string messages;
    for (const int node : nodes)
        messages += before + "ERROR: failed to decompress file " + std::to_string(node) + "\n";
    return messages;
}

// What lies behind damage is lost, what lies before it is not, and reading on after a failure does no harm.
TEST(StreamedBlocks, DamageSpoilsOnlyWhatLiesBehindIt) {
    ArchiveDescription archive = Streamed(false);
    archive.chunkSize = 0;
    const std::string stream = Incompressible(300'000);
    archive.entries = {{.bytes = stream, .listed = false}};
    AddRanges({{0, 1'000},
               {64'536, 1'000},
               {150'000, 1'000},
               {65'536, 1'000},
               {151'000, 1'000},
               {299'999, 1},
               {1'000, 64'536}},
              &archive);
    BuiltArchive built = BuildArchive(archive);
    built.bytes.replace(built.dataOffset + 140'000, 300, std::string(300, '\xFF'));

    FolderTree contents = {{"2", ""}, {"4", ""}, {"5", ""}};
    contents["0"] = stream.substr(0, 1'000);
    contents["1"] = stream.substr(64'536, 1'000);
    contents["3"] = stream.substr(65'536, 1'000);
    contents["6"] = stream.substr(1'000, 64'536);
    ExpectOutcome(1, Report(7, built.bytes.size(), Failures({2, 4, 5})), OutputTree(contents), Extract(built.bytes));
}

// The second window gets its first bytes from a good input piece and fails in the next one: those bytes stay lost.
TEST(StreamedBlocks, WindowThatFailedInItsMiddleIsNotReadFromAgain) {
    ArchiveDescription archive = Streamed(false);
    archive.chunkSize = 0;
    const std::string stream = Incompressible(300'000);
    archive.entries = {{.bytes = stream, .listed = false}};
    AddRanges({{0, 10}, {70'000, 10}, {70'000, 10}, {70'010, 10}, {10, 10}}, &archive);
    BuiltArchive built = BuildArchive(archive);
    built.bytes.replace(built.dataOffset + 131'072 + 10, 300, std::string(300, '\xFF'));
    ExpectOutcome(
        1, Report(7, built.bytes.size(), Failures({1, 2, 3})),
        OutputTree({{"0", stream.substr(0, 10)}, {"1", ""}, {"2", ""}, {"3", ""}, {"4", stream.substr(10, 10)}}),
        Extract(built.bytes));
}

TEST(StreamedBlocks, TooShortForTheirPropertiesOrTheirDataFail) {
    const std::string stored = CompressLzma(Incompressible(1'000));
    for (const size_t storedSize : std::vector<size_t>{0, 1, 4, 5, 8, 9, 10}) {
        SCOPED_TRACE(storedSize);
        ArchiveDescription archive = Streamed(false);
        // The file goes on in the block behind, whose bytes must not take the place of those that are missing.
        archive.entries = {{.path = "0", .bytes = Incompressible(1'500)}, {.path = "1", .bytes = "text"}};
        archive.blocks = {{.size = 1'000, .stored = stored.substr(0, storedSize)}, {.size = 504}};
        const BuiltArchive built = BuildArchive(archive);
        ExpectOutcome(1, Report(7, built.bytes.size(), Failures({0})), OutputTree({{"0", ""}, {"1", "text"}}),
                      Extract(built.bytes));
    }
}

TEST(StreamedBlocks, OfKindsThatCannotBeStreamedFail) {
    const std::string kNotStarted = "Decompressor's stream must be initialized!\n";
    const std::string kUnsupported = "Decompressing this format (4) is not supported on this platform.\n";
    const std::string kOutOfBounds = "Assertion failed on expression: 't < kCompressionCount'\n";
    struct {
        UInt32 type;
        bool streamed;
        std::string messages; // of each read
    } const rows[] = {
        {kCompressionLz4, true, kNotStarted},
        {kCompressionLz4HC, true, kNotStarted},
        {4, false, kUnsupported},
        {4, true, kUnsupported + kUnsupported}, // asked for to start the stream, then to fill from it
        {5, false, kOutOfBounds},
        {63, true, kOutOfBounds + kOutOfBounds},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::Message() << "kind " << row.type << (row.streamed ? " streamed" : ""));
        ArchiveDescription archive;
        archive.entries = {{.path = "0", .bytes = "some text"}, {.path = "1", .bytes = Compressible(500)}};
        archive.streamed = row.streamed;
        archive.fields = {{"block[0].flags", row.type | (row.streamed ? 0x40u : 0u)}};
        const BuiltArchive built = BuildArchive(archive);
        ExpectOutcome(1, Report(7, built.bytes.size(), Failures({0, 1}, row.messages)),
                      OutputTree({{"0", ""}, {"1", ""}}), Extract(built.bytes));
    }
}

} // namespace
