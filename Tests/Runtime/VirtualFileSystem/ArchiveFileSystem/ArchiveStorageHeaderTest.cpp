#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/ConsoleCapture.h"

TEST(ArchiveLayouts, EndUpInTheSameRecordsUnlessTheyAreCutOrHostile) {
    using enum ArchiveLayout;
    // The version and number of levels, a field and its value, and how much of the archive is needed.
    const std::tuple<ArchiveLayout, UInt32, UInt32, const char*, UInt64, size_t> kRows[] = {
        {kBlockBased, 8, 0, "block[0].flags", 0xFF80, 332},
        {kWebVersion6, 6, 0, "node[3].flags", 0xFFFFFFFE, 319},
        {kWeb, 1, 2, "level[1].compressedSize", 90, 174},
        {kRaw, 1, 1, "node[0].offset", 0xFFFFFFFF, 244},
        {kRaw, 4, 3, "levelBound", 0, 288},
        {kArchive, 5, 0, "running[1].type", 0xFFFFFFC1, 388}};
    // Their version, size and flags; sizes of the section; sizes and flags of blocks; place, size and flags of nodes.
    using Records = std::vector<std::array<UInt64, 3>>;
    const Records kRecords[] = {
        {{8, 360, 0x40}, {166, 166}, {9, 9, 0xFF80}, {9, 9, 0}, {0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0}},
        {{6, 347, 0x140}, {166, 166}, {9, 9, 0}, {9, 9, 0}, {0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0xFFFFFFFE}},
        {{1, 0, 0}, {174, 174}, {96, 82, 0x41}},
        {{1, 0, 0}, {166, 166}, {96, 96, 0x40}, {0xFFFFFFFF, 1, 4}, {79, 3, 4}, {82, 9, 4}, {91, 5, 0}},
        {{4, 306, 0}, {210, 210}, {96, 96, 0x40}, {78, 1, 4}, {79, 3, 4}, {82, 9, 4}, {91, 5, 0}},
        {{5, 0, 0x240}, {388, 388}, {9, 9, 0}, {9, 9, 1}, {0, 1, 0}, {1, 3, 0}, {4, 9, 0}, {13, 5, 0}}};
    for (size_t row = 0; row < std::size(kRows); ++row) {
        const auto& [layout, version, levels, field, value, neededLength] = kRows[row];
        SCOPED_TRACE(field);
        ArchiveDescription description{.layout = layout, .chunkSize = 9, .version = version, .levelCount = levels};
        for (const char* const path : {"level0", "x.assets", "y.sharedAssets", "z.resource"})
            description.entries.push_back({.path = path, .bytes = path + 5});
        description.engineVersion.resize(63, 'v'); // a string is read in pieces of 64 bytes
        description.engineRevision.resize(64, 'r');
        description.fields = {{field, value}};
        const BuiltArchive whole = BuildArchive(description);
        const ConsoleCapture console;
        OpenedArchive opened(whole.bytes);
        const ArchiveStorageHeader::Header& header = opened.reader.GetHeader();
        Records records = {{header.version, header.size, header.flags},
                           {header.compressedBlocksInfoSize, header.uncompressedBlocksInfoSize}};
        for (const auto& block : Access::Blocks(opened.reader))
            records.push_back({block.uncompressedSize, block.compressedSize, block.flags});
        for (const auto& node : opened.reader.GetDirectoryInfo().nodes)
            records.push_back({node.offset, node.size, node.flags});
        EXPECT_EQ(kRecords[row], records);
        for (size_t length = 0; length < whole.bytes.size(); ++length) {
            const OpenedArchive cut(whole.bytes.substr(0, length));
            EXPECT_EQ(length < whole.bytes.find('\0') ? -1 : length < neededLength, cut.result) << length;
        }
        for (const auto& [name, place] : whole.fields) {
            for (const UInt64 hostile : {0ull, 20ull, 0x7FFFFFFFull, 0x80000000ull, 0xFFFFFFFFull, ~0ull >> 1, ~0ull}) {
                description.fields = {{name, hostile}};
                OpenedArchive archive(description);
                const size_t nodes = archive.reader.GetDirectoryInfo().nodes.capacity();
                EXPECT_GE(10u, std::max(nodes, Access::Blocks(archive.reader).capacity())) << name << " = " << hostile;
                EXPECT_TRUE(archive.result != 0 || archive.Read(1, 20).size() <= 20) << name << " = " << hostile;
                EXPECT_TRUE(Access::Look(archive.reader).isIdle) << name << " = " << hostile;
            }
        }
    }
}

TEST(ArchiveLayouts, AFileThatIsNoArchiveIsNotReadWhole) {
    for (const char* const start : {"some text", "ZarvoFS is a signature", "ZarvoArchive of something"}) {
        SCOPED_TRACE(start);
        const ConsoleCapture console;
        DisturbedDisk disk;
        const OpenedArchive archive(start + std::string(1'000'000, '.'));
        EXPECT_EQ(-1, archive.result);
        EXPECT_LE(disk.bytes, 16'384u); // one fill of the buffer that headers are read through
    }
}
