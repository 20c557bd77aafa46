#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"

#include <sstream>

static std::string DescribeRecords(const ArchiveStorageReader& reader) {
    const ArchiveStorageHeader::Header& header = reader.GetHeader();
    std::ostringstream text;
    text << header.signature.c_str() << ' ' << header.version << ' ' << header.size << ' '
         << header.compressedBlocksInfoSize << ' ' << header.uncompressedBlocksInfoSize << ' ' << header.flags;
    for (const auto& block : Access::Blocks(reader))
        text << " b " << block.uncompressedSize << '/' << block.compressedSize << '/' << block.flags;
    for (const auto& node : reader.GetDirectoryInfo().nodes)
        text << " n " << node.offset << '/' << node.size << '/' << node.flags;
    return text.str();
}

TEST(ArchiveLayouts, EndUpInTheSameRecordsUnlessTheyAreCutOrHostile) {
    using enum ArchiveLayout;
    // The number of levels, a field and its value; a cut before the signature's length is no archive, one before the
    // needed length is a short read.
    const std::tuple<ArchiveLayout, UInt32, UInt32, const char*, UInt64, size_t, size_t, std::string> kRows[] = {
        {kBlockBased, 8, 0, "block[0].flags", 0xFF80, 7, 332,
         "ZarvoFS 8 360 166 166 64 b 9/9/65408 b 9/9/0 n 0/1/0 n 1/3/0 n 4/9/0 n 13/5/0"},
        {kWebVersion6, 6, 0, "node[3].flags", 0xFFFFFFFE, 8, 319,
         "ZarvoFS 6 347 166 166 320 b 9/9/0 b 9/9/0 n 0/1/0 n 1/3/0 n 4/9/0 n 13/5/4294967294"},
        {kWeb, 1, 2, "level[1].compressedSize", 90, 8, 174, "ZarvoWeb 1 0 174 174 0 b 96/82/65"},
        {kRaw, 1, 1, "node[0].offset", 0xFFFFFFFF, 8, 244,
         "ZarvoRaw 1 0 166 166 0 b 96/96/64 n 4294967295/1/4 n 79/3/4 n 82/9/4 n 91/5/0"},
        {kRaw, 4, 3, "levelBound", 0, 8, 288,
         "ZarvoRaw 4 306 210 210 0 b 96/96/64 n 78/1/4 n 79/3/4 n 82/9/4 n 91/5/0"},
        {kArchive, 5, 0, "running[1].type", 0xFFFFFFC1, 12, 388,
         "ZarvoArchive 5 0 388 388 576 b 9/9/0 b 9/9/1 n 0/1/0 n 1/3/0 n 4/9/0 n 13/5/0"}};
    for (const auto& [layout, version, levels, field, value, signatureLength, neededLength, records] : kRows) {
        SCOPED_TRACE(field);
        ArchiveDescription description{.layout = layout, .chunkSize = 9, .version = version, .levelCount = levels};
        for (const char* const path : {"level0", "x.assets", "y.sharedAssets", "z.resource"})
            description.entries.push_back({.path = path, .bytes = path + 5});
        description.engineVersion.resize(63, 'v'); // a string is read in pieces of 64 bytes
        description.engineRevision.resize(64, 'r');
        description.fields = {{field, value}};
        const BuiltArchive whole = BuildArchive(description);
        const ConsoleCapture console;
        EXPECT_EQ(records, DescribeRecords(OpenedArchive(whole).reader));
        for (BuiltArchive cut = whole; !cut.bytes.empty();) {
            cut.bytes.pop_back();
            const size_t length = cut.bytes.size();
            EXPECT_EQ(length < signatureLength ? -1 : length < neededLength, OpenedArchive(cut).result) << length;
        }
        for (const auto& [name, place] : whole.fields) {
            for (const UInt64 hostile : {0ull, 2ull, 0x7FFFFFFFull, 0x80000000ull, 0xFFFFFFFFull, ~0ull >> 1, ~0ull}) {
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
