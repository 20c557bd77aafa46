#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/LegacyDirectoryScanner.h"
#include "Tests/Support/BigEndianBytes.h"
#include "Tests/Support/BytesFile.h"
#include "Tests/Support/ConsoleCapture.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

using namespace ArchiveStorageHeader;

namespace {

constexpr const char* kWideDifference =
    "Value cannot be stored by type cast target: exceeds maximum representable value. Result will be truncated.\n";

struct Records {
    explicit Records(const char* signature) { header.signature = signature; }

    Header header{kMemLabelFileSystem};
    BlocksInfo blocks{kMemLabelFileSystem};
    DirectoryInfo directory{kMemLabelFileSystem};
};

struct Level {
    UInt32 compressedSize, uncompressedSize;
};

// A ZarvoWeb or ZarvoRaw header from just past its signature.
std::string LegacyHeader(UInt32 version, UInt32 bounded, const std::vector<Level>& levels) {
    BigEndianBytes bytes;
    bytes.U32(version).String("5.x.x").String("7041.3.0b12");
    if (version >= 4) bytes.Fill(16, '!').U32(0xAAAAAAAA);
    bytes.U32(0xBBBBBBBB).U32(63).U32(bounded).U32(levels.size());
    for (const Level& level : levels)
        bytes.U32(level.compressedSize).U32(level.uncompressedSize);
    if (version >= 2) bytes.U32(181);
    if (version >= 3) bytes.U32(0xCCCCCCCC);
    return bytes.Get();
}

struct Running {
    UInt64 position, storedPosition;
    UInt32 type, streamed;
};

// A ZarvoArchive file behind its signature, the header right behind its own position.
std::string ZarvoArchive(UInt32 version, const std::vector<Running>& running) {
    BigEndianBytes bytes;
    bytes.String("ZarvoArchive").U64(21).U32(version).String("5.x.x").String("7041.3.0b12").Fill(24).U32(50);
    bytes.U32(7'000).U32(1).U64(11).U64(22).U32(4).String("a.txt"); // at 21 + 50
    bytes.U32(running.empty() ? 0 : running.size() - 1);
    for (const Running& entry : running)
        bytes.U64(entry.position);
    for (const Running& entry : running)
        bytes.U64(entry.storedPosition).U32(entry.type).U32(entry.streamed);
    return bytes.Get();
}

int ReadZarvoArchive(const std::string& bytes, Records& records) {
    BytesFile file(bytes);
    EXPECT_TRUE(file.accessor.Seek(13, kFileOriginBegin));
    return ReadAll(file.accessor, records.header, records.blocks, records.directory);
}

} // namespace

TEST(LegacyHeader, VersionAndLevelsDecideWhatIsRead) {
    struct Case {
        const char* signature;
        UInt32 version, bounded;
        std::vector<Level> levels;
        int result;
        UInt64 size;
        UInt32 uncompressedSize, compressedSize;
        UInt16 flags;
    };
    const Case kCases[] = {
        {"ZarvoRaw", 1, 0, {{118, 118}}, 0, 0, 118, 118, 0x40},
        {"ZarvoRaw", 2, 1, {{118, 118}}, 0, 181, 118, 118, 0x40},
        {"ZarvoRaw", 3, 1, {{1, 2}, {3, 4}, {90, 118}}, 0, 181, 118, 90, 0x40},
        {"ZarvoWeb", 4, 1, {{90, 118}}, 0, 181, 118, 90, 0x41},
        {"ZarvoWeb", 0xFFFFFFFF, 0, {{90, 118}}, 0, 181, 118, 90, 0x41},
        {"ZarvoWeb", 3, 0, {}, 0, 181, 0, 0, 0x41},
        {"ZarvoWeb", 3, 1, {}, 1, 0, 0, 0, 0},
        {"ZarvoRaw", 3, 3, {{1, 2}, {3, 4}}, 1, 0, 0, 0, 0},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << row.signature << " version " << row.version << ", " << row.levels.size()
                                        << " levels bounded by " << row.bounded);
        const std::string bytes = LegacyHeader(row.version, row.bounded, row.levels);
        Records records(row.signature);
        records.header.size = 99;
        BytesFile file(bytes);
        ASSERT_EQ(row.result,
                  ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(file.accessor, records.header, records.blocks));
        if (row.result != 0) continue;
        EXPECT_EQ(bytes.size(), file.Position());
        EXPECT_EQ(row.version, records.header.version);
        EXPECT_EQ(row.size, records.header.size);
        EXPECT_EQ(63u, records.header.compressedBlocksInfoSize);
        EXPECT_EQ(63u, records.header.uncompressedBlocksInfoSize);
        EXPECT_EQ(0u, records.header.flags);
        EXPECT_EQ(63u, GetDataOffset(records.header));
        ASSERT_EQ(1u, records.blocks.storageBlocks.size());
        EXPECT_EQ(row.uncompressedSize, records.blocks.storageBlocks[0].uncompressedSize);
        EXPECT_EQ(row.compressedSize, records.blocks.storageBlocks[0].compressedSize);
        EXPECT_EQ(row.flags, records.blocks.storageBlocks[0].flags);

        for (size_t length = 0; length < bytes.size(); ++length) {
            const std::string cut = bytes.substr(0, length);
            BytesFile cutFile(cut);
            Records cutRecords(row.signature);
            EXPECT_EQ(
                1, ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(cutFile.accessor, cutRecords.header, cutRecords.blocks))
                << "cut at " << length;
        }
    }
}

TEST(LegacyDirectory, ExtensionsDecideTheNodeFlags) {
    const std::pair<const char*, UInt32> kCases[] = {
        {"level0", 4},
        {"sharedassets0.assets", 4},
        {"a/b.c/x.sharedAssets", 4},
        {"dir.x/level1", 4},
        {"name.", 4},
        {"", 4},
        {"data.resource", 0},
        {"x.ASSETS", 0},
        {".profile", 0},
        {"a.assets.txt", 0},
    };
    BigEndianBytes bytes;
    bytes.U32(std::size(kCases));
    for (const auto& [path, flags] : kCases)
        bytes.String(path).U32(0xFFFFFFFF).U32(5);
    BytesFile file(bytes.Get());
    Records records(kSignatureWeb);
    ASSERT_EQ(0, ReadDirectoryInfo(file.accessor, records.header, records.directory));
    ASSERT_EQ(std::size(kCases), records.directory.nodes.size());
    for (size_t index = 0; index < std::size(kCases); ++index) {
        const Node& node = records.directory.nodes[index];
        EXPECT_STREQ(kCases[index].first, node.path.c_str());
        EXPECT_EQ(kCases[index].second, node.flags) << node.path.c_str();
        EXPECT_EQ(0xFFFFFFFFu, node.offset);
        EXPECT_EQ(5u, node.size);
    }
}

// The scanner calls a directory complete exactly at its last byte, however it is cut into pieces.
TEST(LegacyDirectory, ScannerFindsTheEnd) {
    const std::string kDirectories[] = {
        BigEndianBytes().U32(0).Get(),
        BigEndianBytes().U32(1).String("").U64(0).Get(),
        BigEndianBytes().U32(2).String("a/b").U64(~UInt64{0}).String("longer/path").U64(7).Get(),
    };
    for (const std::string& directory : kDirectories) {
        for (size_t pieceSize = 1; pieceSize <= directory.size(); ++pieceSize) {
            LegacyDirectoryScanner scanner;
            for (size_t position = 0; position < directory.size() - 1; position += pieceSize) {
                const size_t size = std::min(pieceSize, directory.size() - 1 - position);
                EXPECT_FALSE(scanner.Scan(reinterpret_cast<const UInt8*>(directory.data()) + position, size));
                EXPECT_TRUE(scanner.CanCompleteWithin(directory.size()));
            }
            EXPECT_EQ(directory.size() - 1, scanner.Position());
            EXPECT_TRUE(scanner.Scan(reinterpret_cast<const UInt8*>(&directory.back()), 1)) << pieceSize;
        }
    }
    LegacyDirectoryScanner hopeless;
    hopeless.Scan(reinterpret_cast<const UInt8*>(kDirectories[2].data()), 4);
    EXPECT_TRUE(hopeless.CanCompleteWithin(4 + 2 * 9));
    EXPECT_FALSE(hopeless.CanCompleteWithin(4 + 2 * 9 - 1));
}

TEST(ZarvoArchive, RunningPositionsBecomeBlocks) {
    const std::string bytes = ZarvoArchive(5, {{100, 50, 1, 3}, {300, 90, 2, 2}, {301, 90, 0xFFFFFFFF, 1}});
    Records records(kSignatureArchive);
    ASSERT_EQ(0, ReadZarvoArchive(bytes, records));
    EXPECT_EQ(5u, records.header.version);
    EXPECT_STREQ("7041.3.0b12", records.header.engineRevision.c_str());
    EXPECT_EQ(7'000u, records.header.compressedBlocksInfoSize);
    EXPECT_EQ(7'000u, records.header.uncompressedBlocksInfoSize);
    EXPECT_EQ(0x240u, records.header.flags);
    EXPECT_EQ(7'000u, GetDataOffset(records.header));
    ASSERT_EQ(1u, records.directory.nodes.size());
    EXPECT_STREQ("a.txt", records.directory.nodes[0].path.c_str());
    EXPECT_EQ(4u, records.directory.nodes[0].flags);
    ASSERT_EQ(2u, records.blocks.storageBlocks.size());
    EXPECT_EQ(200u, records.blocks.storageBlocks[0].uncompressedSize);
    EXPECT_EQ(40u, records.blocks.storageBlocks[0].compressedSize);
    EXPECT_EQ(0x41u, records.blocks.storageBlocks[0].flags);
    EXPECT_EQ(1u, records.blocks.storageBlocks[1].uncompressedSize);
    EXPECT_EQ(0u, records.blocks.storageBlocks[1].compressedSize);
    EXPECT_EQ(0x02u, records.blocks.storageBlocks[1].flags); // bit 0 of the streamed word is clear

    for (size_t length = 13; length < bytes.size(); ++length) {
        Records cutRecords(kSignatureArchive);
        EXPECT_EQ(1, ReadZarvoArchive(bytes.substr(0, length), cutRecords)) << "cut at " << length;
    }
}

TEST(ZarvoArchive, WithoutBlocksTheListStaysAsItWas) {
    Records records(kSignatureArchive);
    records.blocks.storageBlocks.resize_initialized(3);
    EXPECT_EQ(0, ReadZarvoArchive(ZarvoArchive(5, {}), records));
    EXPECT_EQ(3u, records.blocks.storageBlocks.size());
    EXPECT_EQ(0x240u, records.header.flags);
}

TEST(ZarvoArchive, OtherVersionsAndSignaturesAreRefused) {
    for (UInt32 version : {0u, 4u, 6u, 0xFFFFFFFFu}) {
        Records records(kSignatureArchive);
        EXPECT_EQ(-1, ReadZarvoArchive(ZarvoArchive(version, {}), records)) << version;
    }
    for (const char* signature : {kSignature, kSignatureWeb}) {
        Records records(signature);
        EXPECT_EQ(-1, ReadZarvoArchive(ZarvoArchive(5, {}), records)) << signature;
    }
}

TEST(ZarvoArchive, DifferencesWiderThan32BitsAreReportedAndCut) {
    // A wide step, and one that falls.
    const std::string bytes = ZarvoArchive(5, {{0, 9, 0, 0}, {0x1'0000'0007, 8, 0, 0}, {0x1'0000'0008, 8, 0, 0}});
    Records records(kSignatureArchive);
    ConsoleCapture capture;
    EXPECT_EQ(0, ReadZarvoArchive(bytes, records));
    EXPECT_EQ(std::string(kWideDifference) + kWideDifference, capture.Text());
    EXPECT_EQ(7u, records.blocks.storageBlocks[0].uncompressedSize);
    EXPECT_EQ(0xFFFFFFFFu, records.blocks.storageBlocks[0].compressedSize);
    EXPECT_EQ(1u, records.blocks.storageBlocks[1].uncompressedSize);
    EXPECT_EQ(0u, records.blocks.storageBlocks[1].compressedSize);
}

TEST(ZarvoArchive, HostilePositionsAndCountsAreRefused) {
    for (UInt64 value : {~UInt64{0}, UInt64{1} << 63, (UInt64{1} << 63) - 1, UInt64{1} << 32}) {
        SCOPED_TRACE(value);
        std::string bytes = ZarvoArchive(5, {});
        bytes.replace(13, 8, BigEndianBytes().U64(value).Get());
        ConsoleCapture silenced;
        Records records(kSignatureArchive);
        EXPECT_EQ(1, ReadZarvoArchive(bytes, records));
    }
    const size_t countPositions[] = {67, 75, 105}; // D, the node count and the block count
    for (size_t position : countPositions) {
        for (UInt64 value : {0x7FFFFFFFull, 0x80000000ull, 0xFFFFFFFFull}) {
            SCOPED_TRACE(testing::Message() << value << " at " << position);
            std::string bytes = ZarvoArchive(5, {{0, 0, 0, 0}, {1, 1, 0, 0}});
            bytes.replace(position, 4, BigEndianBytes().U32(value).Get());
            Records records(kSignatureArchive);
            EXPECT_EQ(1, ReadZarvoArchive(bytes, records));
            EXPECT_EQ(0u, records.blocks.storageBlocks.capacity());
        }
    }
}
