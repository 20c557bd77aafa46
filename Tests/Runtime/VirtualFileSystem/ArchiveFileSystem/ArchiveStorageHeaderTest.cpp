#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/ConsoleCapture.h"

#include <array>

using namespace ArchiveStorageHeader;

namespace {

struct ParsedHeader {
    UInt32 version;
    UInt64 size;
    UInt32 flags;
    UInt32 sectionSize;
    UInt32 uncompressedSectionSize;

    bool operator==(const ParsedHeader&) const = default;
};

// What the parsers of any layout make of an archive.
struct Parsed {
    ParsedHeader header;
    std::vector<std::array<UInt64, 3>> blocks = {}; // uncompressedSize, compressedSize, flags
    std::vector<std::array<UInt64, 3>> nodes = {};  // offset, size, flags

    bool operator==(const Parsed&) const = default;
    friend void PrintTo(const Parsed& parsed, std::ostream* out) {
        *out << "version " << parsed.header.version << ", size " << parsed.header.size << ", flags "
             << parsed.header.flags << ", sections " << parsed.header.sectionSize << " and "
             << parsed.header.uncompressedSectionSize << ", blocks " << testing::PrintToString(parsed.blocks)
             << ", nodes " << testing::PrintToString(parsed.nodes);
    }
};

Parsed LookAt(ArchiveStorageReader& reader) {
    const Header& header = reader.GetHeader();
    Parsed parsed{.header = {header.version, header.size, header.flags, header.compressedBlocksInfoSize,
                             header.uncompressedBlocksInfoSize}};
    for (const StorageBlock& block : Access::Blocks(reader))
        parsed.blocks.push_back({block.uncompressedSize, block.compressedSize, block.flags});
    for (const Node& node : reader.GetDirectoryInfo().nodes)
        parsed.nodes.push_back({node.offset, node.size, node.flags});
    return parsed;
}

constexpr UInt64 kStreamed = kStorageBlockStreamed;

// Each with an odd value in one field.
struct Layout {
    std::string name;
    ArchiveLayout layout;
    UInt32 version;
    UInt32 levels = 0;
    const char* field;
    UInt64 value;
    size_t neededLength; // of the file, for Initialize to succeed
    Parsed expected;
} const kLayouts[] = {
    {.name = "BlockBased",
     .layout = ArchiveLayout::kBlockBased,
     .version = 8,
     .field = "block[0].flags",
     .value = 0xFF80, // the bits that nothing uses
     .neededLength = 332,
     .expected = {.header = {8, 360, kArchiveDirectoryInBlocksInfo, 166, 166},
                  .blocks = {{9, 9, 0xFF80}, {9, 9, 0}},
                  .nodes = {{0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0}}}},
    {.name = "WebVersion6",
     .layout = ArchiveLayout::kWebVersion6,
     .version = 6,
     .field = "node[3].flags",
     .value = 0xFFFFFFFE,
     .neededLength = 319,
     .expected = {.header = {6, 347, kArchiveDirectoryInBlocksInfo | kArchiveWebSignatureHeader, 166, 166},
                  .blocks = {{9, 9, 0}, {9, 9, 0}},
                  .nodes = {{0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0xFFFFFFFE}}}},
    {.name = "Web",
     .layout = ArchiveLayout::kWeb,
     .version = 1,
     .levels = 2,
     .field = "level[1].compressedSize",
     .value = 90, // with the 8 hidden bytes
     .neededLength = 174,
     .expected = {.header = {1, 0, 0, 174, 174}, .blocks = {{96, 82, kStreamed | kCompressionLzma}}, .nodes = {}}},
    {.name = "RawVersion1",
     .layout = ArchiveLayout::kRaw,
     .version = 1,
     .levels = 1,
     .field = "node[0].offset",
     .value = 0xFFFFFFFF,
     .neededLength = 244,
     .expected =
         {.header = {1, 0, 0, 166, 166},
          .blocks = {{96, 96, kStreamed}},
          .nodes = {{0xFFFFFFFF, 1, kNodeAssetData}, {79, 3, kNodeAssetData}, {82, 9, kNodeAssetData}, {91, 5, 0}}}},
    {.name = "RawVersion4",
     .layout = ArchiveLayout::kRaw,
     .version = 4,
     .levels = 3,
     .field = "levelBound",
     .value = 0,
     .neededLength = 288,
     .expected = {.header = {4, 306, 0, 210, 210},
                  .blocks = {{96, 96, kStreamed}},
                  .nodes = {{78, 1, kNodeAssetData}, {79, 3, kNodeAssetData}, {82, 9, kNodeAssetData}, {91, 5, 0}}}},
    {.name = "Archive",
     .layout = ArchiveLayout::kArchive,
     .version = 5,
     .field = "running[1].type",
     .value = 0xFFFFFF00 | 3 << 6 | kCompressionLzma, // bits 0 to 5 count
     .neededLength = 388,
     .expected = {.header = {5, 0, kArchiveDirectoryInBlocksInfo | kArchiveBlocksInfoPadded, 388, 388},
                  .blocks = {{9, 9, 0}, {9, 9, kCompressionLzma}},
                  .nodes = {{0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0}}}},
};

class ArchiveLayouts : public testing::TestWithParam<Layout> {
protected:
    static BuiltArchive Build(const char* field, UInt64 value) {
        ArchiveDescription description{.layout = GetParam().layout,
                                       .chunkSize = 9,
                                       .version = GetParam().version,
                                       .levelCount = GetParam().levels,
                                       .fields = {{field, value}}};
        for (const char* const path : {"level0", "x.assets", "y.sharedAssets", "z.resource"})
            description.entries.push_back({.path = path, .bytes = path + 5});
        description.engineVersion.resize(63, 'v'); // a string is read in pieces of 64 bytes
        description.engineRevision.resize(64, 'r');
        return BuildArchive(description);
    }
    static BuiltArchive Build() { return Build(GetParam().field, GetParam().value); }

    const ConsoleCapture m_Console; // drops the reports
};

} // namespace

TEST_P(ArchiveLayouts, EndUpInTheSameRecords) {
    OpenedArchive archive(Build().bytes);
    EXPECT_EQ(GetParam().expected, LookAt(archive.reader));
}

TEST_P(ArchiveLayouts, OpenFromTheNeededLengthOn) {
    const std::string bytes = Build().bytes;
    const size_t signatureLength = bytes.find('\0');
    for (size_t length = 0; length < bytes.size(); ++length) {
        const int expected = length < signatureLength           ? kHeaderNotAnArchive
                             : length < GetParam().neededLength ? kHeaderShortRead
                                                                : kHeaderOk;
        EXPECT_EQ(expected, OpenedArchive(bytes.substr(0, length)).result) << "cut at " << length;
    }
}

TEST_P(ArchiveLayouts, BelieveNoHostileNumber) {
    constexpr size_t kMostEntries = 10; // that an archive of this length can hold, with room to spare
    for (const auto& [name, place] : Build().fields) {
        for (const UInt64 hostile : {0ull, 20ull, 0x7FFFFFFFull, 0x80000000ull, 0xFFFFFFFFull, ~0ull >> 1, ~0ull}) {
            SCOPED_TRACE(testing::Message() << name << " = " << hostile);
            OpenedArchive archive(Build(name.c_str(), hostile).bytes);
            EXPECT_LE(archive.reader.GetDirectoryInfo().nodes.capacity(), kMostEntries);
            EXPECT_LE(Access::Blocks(archive.reader).capacity(), kMostEntries);
            if (archive.result == kHeaderOk) {
                EXPECT_LE(archive.Read(1, 20).size(), 20u);
            }
            const Access::Cache cache = Access::Look(archive.reader);
            EXPECT_EQ(Access::Cache{.records = cache.records}, cache);
        }
    }
}

INSTANTIATE_TEST_SUITE_P(, ArchiveLayouts, testing::ValuesIn(kLayouts), [](const auto& row) { return row.param.name; });

TEST(ArchiveHeader, FileOfAnotherFormatIsNotReadWhole) {
    constexpr UInt64 kReadAhead = 16'384;
    for (const char* const start : {"some text", "ZarvoFS is a signature", "ZarvoArchive of something"}) {
        SCOPED_TRACE(start);
        const ConsoleCapture console;
        DisturbedDisk disk;
        const OpenedArchive archive(start + std::string(1'000'000, '.'));
        EXPECT_EQ(kHeaderNotAnArchive, archive.result);
        EXPECT_LE(disk.bytes, kReadAhead);
    }
}
