#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveFieldReading.h"
#include "Tests/Support/BigEndianBytes.h"
#include "Tests/Support/BytesFile.h"

#include <gtest/gtest.h>

using namespace ArchiveStorageHeader;

namespace {

constexpr const char* kEngineVersion = "5.x.x";
constexpr const char* kEngineRevision = "7041.3.0b12";
constexpr UInt64 kNoPosition = ~UInt64{0};

// What follows the signature of a block-based archive.
BigEndianBytes HeaderFields(UInt32 version, UInt32 compressedSize, UInt32 uncompressedSize) {
    return BigEndianBytes()
        .U32(version)
        .String(kEngineVersion)
        .String(kEngineRevision)
        .U64(10'000)
        .U32(compressedSize)
        .U32(uncompressedSize)
        .U32(0xC3);
}

std::string Text(const core::string& text) { return std::string(text.data(), text.size()); }

} // namespace

TEST(ArchiveHeader, SignatureDecidesLayoutFlagsAndPosition) {
    constexpr UInt32 kOldFlags = 0xFFFFFE7F; // every bit but those of the section at the end and the web signature
    struct Case {
        std::string bytes;
        int result;
        const char* signature;
        UInt32 flags;
        UInt64 position;
    };
    const std::string longName(200, 'Z');
    const Case kCases[] = {
        {BigEndianBytes().String("ZarvoFS").U32(8).Get(), 0, "ZarvoFS", kOldFlags, 8},
        {BigEndianBytes().String("ZarvoArchive").U32(8).Get(), 0, "ZarvoArchive", 0xFFFFFE40, 13},
        {BigEndianBytes().String("ZarvoRaw").U32(6).Get(), 0, "ZarvoRaw", 0xFFFFFE40, 9},
        {BigEndianBytes().String("ZarvoWeb").U32(5).Get(), 0, "ZarvoWeb", 0xFFFFFE00, 9},
        {BigEndianBytes().String("ZarvoWeb").U32(6).Get(), 0, "ZarvoFS", 0xFFFFFF00, 9},
        {BigEndianBytes().String("ZarvoWeb").Fill(3).Get(), 0, "ZarvoWeb", 0xFFFFFE00, 9},
        {BigEndianBytes().String("ZarvoFSx").Get(), -1, "ZarvoFSx", kOldFlags, 9},
        {BigEndianBytes().String("zarvofs").Get(), -1, "zarvofs", kOldFlags, 8},
        {BigEndianBytes().String("").String("ZarvoFS").Get(), -1, "", kOldFlags, 1},
        {"", -1, "", kOldFlags, 0},
        {longName, -1, longName.c_str(), kOldFlags, 200},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(row.bytes);
        BytesFile file(row.bytes);
        Header header(kMemLabelFileSystem);
        header.flags = kOldFlags;
        EXPECT_EQ(row.result, ReadHeaderSignature(file.accessor, header));
        EXPECT_EQ(row.signature, Text(header.signature));
        EXPECT_EQ(row.flags, header.flags);
        EXPECT_EQ(row.position, file.Position());
    }
}

TEST(ArchiveHeader, StringsOfAnyLengthAreReadAndThePositionIsPastTheirNul) {
    for (size_t length : {0u, 1u, 63u, 64u, 65u, 127u, 128u, 129u, 1000u}) {
        for (bool hasNul : {true, false}) {
            SCOPED_TRACE(testing::Message() << length << (hasNul ? " with NUL" : " without NUL"));
            const std::string text(length, 'x');
            const std::string bytes = hasNul ? text + '\0' + "rest" : text;
            BytesFile file(bytes);
            core::string out("what was there before, longer than the text in place", kMemLabelGeneral);
            EXPECT_EQ(hasNul || length != 0, ReadString(file.accessor, &out));
            EXPECT_EQ(text, Text(out));
            EXPECT_EQ(length + (hasNul ? 1 : 0), file.Position());
            EXPECT_LE(64u, out.capacity());
        }
    }
}

TEST(ArchiveHeader, BlockBasedHeaderIsReadWholeOrNotAtAll) {
    const std::string bytes = HeaderFields(7, 91, 120).Get();
    for (size_t length = 0; length <= bytes.size(); ++length) {
        const std::string cut = bytes.substr(0, length);
        BytesFile file(cut);
        Header header(kMemLabelFileSystem);
        EXPECT_EQ(length == bytes.size() ? 0 : 1, ReadHeader(file.accessor, header)) << "cut at " << length;
    }
    BytesFile file(bytes);
    Header header(kMemLabelFileSystem);
    ASSERT_EQ(0, ReadHeader(file.accessor, header));
    EXPECT_EQ(7u, header.version);
    EXPECT_EQ(kEngineVersion, Text(header.engineVersion));
    EXPECT_EQ(kEngineRevision, Text(header.engineRevision));
    EXPECT_EQ(10'000u, header.size);
    EXPECT_EQ(91u, header.compressedBlocksInfoSize);
    EXPECT_EQ(120u, header.uncompressedBlocksInfoSize);
    EXPECT_EQ(0xC3u, header.flags);
    EXPECT_EQ(bytes.size(), file.Position());
}

TEST(ArchiveHeader, ContradictionsAreRefusedBeforeWhatFollowsIsRead) {
    const std::string newer = HeaderFields(9, 91, 120).Get().substr(0, 4);
    BytesFile newerFile(newer);
    Header header(kMemLabelFileSystem);
    EXPECT_EQ(-1, ReadHeader(newerFile.accessor, header));

    const std::string larger = HeaderFields(8, 121, 120).Get();
    const std::string withoutFlags = larger.substr(0, larger.size() - 4);
    BytesFile largerFile(withoutFlags);
    EXPECT_EQ(-1, ReadHeader(largerFile.accessor, header));

    header.signature = kSignatureRaw;
    BytesFile otherLayout(larger);
    EXPECT_EQ(-1, ReadHeader(otherLayout.accessor, header));
    EXPECT_EQ(0u, otherLayout.Position());
}

TEST(ArchiveHeader, PositionsFollowFromTheHeader) {
    struct Case {
        const char* signature;
        UInt32 version, flags;
        UInt64 size;
        UInt32 compressedSize;
        UInt64 blocksInfoOffset, dataOffset;
    };
    const Case kCases[] = {
        {"ZarvoFS", 6, 0x43, 0, 91, 50, 141},
        {"ZarvoFS", 7, 0x43, 0, 91, 64, 155},
        {"ZarvoFS", 8, 0x43, 0, 91, 64, 155},
        {"ZarvoFS", 8, 0x243, 0, 91, 64, 160},
        {"ZarvoFS", 8, 0x243, 0, 96, 64, 160},
        {"ZarvoFS", 6, 0x143, 0, 91, 52, 143},
        {"ZarvoFS", 7, 0x143, 0, 91, 64, 155},
        {"ZarvoFS", 8, 0xC3, 10'000, 91, 9'909, 64},
        {"ZarvoFS", 8, 0x2C3, 10'000, 91, 9'909, 64},
        {"ZarvoFS", 8, 0xC3, 0, 91, kNoPosition, 64},
        {"ZarvoFS", 8, 0x243, 0, 0xFFFFFFF8, 64, 64},
        {"ZarvoFS", 8, 0xC3, 50, 91, ~UInt64{0} - 40, 64},
        {"ZarvoWeb", 3, 0, 0, 63, 9, 63},
        {"ZarvoRaw", 3, 0, 0, 63, 9, 63},
        {"ZarvoArchive", 5, 0x240, 0, 77, 55, 77},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(testing::Message() << row.signature << " version " << row.version << " flags " << row.flags);
        Header header(kMemLabelFileSystem);
        header.signature = row.signature;
        header.version = row.version;
        header.flags = row.flags;
        header.size = row.size;
        header.compressedBlocksInfoSize = row.compressedSize;
        EXPECT_EQ(row.blocksInfoOffset, GetBlocksInfoOffset(header));
        EXPECT_EQ(row.dataOffset, GetDataOffset(header));
    }
}

TEST(ArchiveBlocksInfo, BlocksAreTenBytesEachAndReplaceThoseBefore) {
    const std::string hash = "0123456789abcdef";
    const std::string bytes =
        BigEndianBytes().Raw(hash).U32(2).U32(100).U32(60).U16(0xFF43).U32(7).U32(0xFFFFFFFF).U16(0x40).Get();
    Header header(kMemLabelFileSystem);
    for (size_t length = 0; length <= bytes.size(); ++length) {
        const std::string cut = bytes.substr(0, length);
        BytesFile file(cut);
        BlocksInfo blocks(kMemLabelFileSystem);
        blocks.storageBlocks.resize_initialized(5);
        EXPECT_EQ(length == bytes.size() ? 0 : 1, ReadBlocksInfo(file.accessor, header, blocks)) << "cut at " << length;
        EXPECT_EQ(length == bytes.size() ? 2u : 5u, blocks.storageBlocks.size());
        if (length < bytes.size()) continue;
        EXPECT_EQ(hash, std::string(reinterpret_cast<const char*>(blocks.hash), sizeof(blocks.hash)));
        EXPECT_EQ(100u, blocks.storageBlocks[0].uncompressedSize);
        EXPECT_EQ(60u, blocks.storageBlocks[0].compressedSize);
        EXPECT_EQ(0xFF43u, blocks.storageBlocks[0].flags);
        EXPECT_EQ(0xFFFFFFFFu, blocks.storageBlocks[1].compressedSize);
    }
}

TEST(ArchiveDirectory, NodesAreKeptAsStored) {
    const std::string bytes = BigEndianBytes()
                                  .U32(3)
                                  .U64(0)
                                  .U64(~UInt64{0})
                                  .U32(0xFFFFFFFE)
                                  .String("a/b/c")
                                  .U64(1)
                                  .U64(2)
                                  .U32(1)
                                  .String("")
                                  .U64(3)
                                  .U64(4)
                                  .U32(4)
                                  .String("../x")
                                  .Get();
    Header header(kMemLabelFileSystem);
    const size_t lastPathStart = bytes.size() - 5; // a path may end with the file, once it has a character
    for (size_t length = 0; length <= bytes.size(); ++length) {
        const std::string cut = bytes.substr(0, length);
        BytesFile file(cut);
        DirectoryInfo directory(kMemLabelFileSystem);
        EXPECT_EQ(length > lastPathStart ? 0 : 1, ReadDirectoryInfo(file.accessor, header, directory))
            << "cut at " << length;
    }
    BytesFile file(bytes);
    DirectoryInfo directory(kMemLabelFileSystem);
    ASSERT_EQ(0, ReadDirectoryInfo(file.accessor, header, directory));
    ASSERT_EQ(3u, directory.nodes.size());
    EXPECT_EQ(~UInt64{0}, directory.nodes[0].size);
    EXPECT_EQ(0xFFFFFFFEu, directory.nodes[0].flags);
    EXPECT_EQ("a/b/c", Text(directory.nodes[0].path));
    EXPECT_EQ(kMemLabelFileSystem, directory.nodes[0].path.get_memory_label());
    EXPECT_EQ("", Text(directory.nodes[1].path));
    EXPECT_EQ(3u, directory.nodes[2].offset);
    EXPECT_EQ("../x", Text(directory.nodes[2].path));

    header.signature = kSignatureArchive;
    BytesFile refused(bytes);
    EXPECT_EQ(-1, ReadDirectoryInfo(refused.accessor, header, directory));
    EXPECT_EQ(0u, refused.Position());
}

// A count that the bytes behind it can't hold never sizes an array.
TEST(ArchiveDirectory, CountsThatTheFileCannotHoldAreRefused) {
    for (UInt64 count : {2ull, 0x7FFFFFFFull, 0x80000000ull, 0xFFFFFFFFull}) {
        SCOPED_TRACE(count);
        Header header(kMemLabelFileSystem);
        BlocksInfo blocks(kMemLabelFileSystem);
        DirectoryInfo directory(kMemLabelFileSystem);
        const std::string blockList = BigEndianBytes().Fill(16).U32(count).Fill(19).Get();
        BytesFile blockFile(blockList);
        EXPECT_EQ(1, ReadBlocksInfo(blockFile.accessor, header, blocks));
        EXPECT_EQ(0u, blocks.storageBlocks.capacity());

        const std::string nodes = BigEndianBytes().U32(count).Fill(41).Get();
        BytesFile nodeFile(nodes);
        EXPECT_EQ(1, ReadDirectoryInfo(nodeFile.accessor, header, directory));
        const std::string legacyNodes = BigEndianBytes().U32(count).Fill(17).Get();
        BytesFile legacyFile(legacyNodes);
        EXPECT_EQ(1, ReadDirectoryInfo_ZarvoWebAndZarvoRaw(legacyFile.accessor, header, directory));
        EXPECT_EQ(0u, directory.nodes.capacity());
    }
}
