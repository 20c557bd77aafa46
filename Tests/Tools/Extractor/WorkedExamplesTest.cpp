#include "Tests/Support/BigEndianBytes.h"
#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

const std::string kHundredBytes = Incompressible(100);

ArchiveDescription OneFile() {
    ArchiveDescription archive;
    archive.entries = {{.path = "a.txt", .bytes = kHundredBytes}};
    return archive;
}

TEST(WorkedExamples, SmallBlockBasedArchive) {
    BigEndianBytes bytes;
    bytes.String("ZarvoFS").U32(7).String("5.x.x").String("7041.3.0b12");
    bytes.U64(224).U32(60).U32(60).U32(0x40).AlignTo(16);
    EXPECT_EQ(64u, bytes.size());
    bytes.Fill(16).U32(1).U32(100).U32(100).U16(0);
    bytes.U32(1).U64(0).U64(100).U32(0).String("a.txt");
    EXPECT_EQ(124u, bytes.size());
    bytes.Raw(kHundredBytes);
    EXPECT_EQ(224u, bytes.size());

    ExpectOutcome(0, Report(7, 224), OutputTree({{"a.txt", kHundredBytes}}), Extract(bytes.Get()));
    EXPECT_EQ(bytes.Get(), BuildArchive(OneFile()).bytes);
}

TEST(WorkedExamples, SmallZarvoRawArchive) {
    BigEndianBytes bytes;
    bytes.String("ZarvoRaw").U32(3).String("5.x.x").String("7041.3.0b12");
    bytes.U32(0x55AA55AA).U32(63).U32(1).U32(1).U32(118).U32(118).U32(181).U32(0x55AA55AA);
    EXPECT_EQ(63u, bytes.size());
    bytes.U32(1).String("a.txt").U32(18).U32(100);
    EXPECT_EQ(63u + 18u, bytes.size());
    bytes.Raw(kHundredBytes);
    EXPECT_EQ(181u, bytes.size());

    ExpectOutcome(0, Report(3, 181), OutputTree({{"a.txt", kHundredBytes}}), Extract(bytes.Get()));
    ArchiveDescription archive = OneFile();
    archive.layout = ArchiveLayout::kRaw;
    EXPECT_EQ(bytes.Get(), BuildArchive(archive).bytes);
}

// 10,000 bytes with a section that LZ4 makes 91 bytes of: the path is made longer until that is so.
ArchiveDescription WithSectionOf91Bytes() {
    ArchiveDescription archive;
    archive.version = 8;
    archive.sectionType = kCompressionLz4HC;
    archive.entries = {{.path = "", .bytes = Incompressible(10'000 - 64 - 91)}};
    for (const char byte : Incompressible(200)) {
        if (BuildArchive(archive).sectionSize >= 91) break;
        archive.entries[0].path += static_cast<char>('a' + static_cast<unsigned char>(byte) % 26);
    }
    EXPECT_EQ(91u, BuildArchive(archive).sectionSize);
    return archive;
}

TEST(WorkedExamples, CompressedSectionOf91Bytes) {
    struct {
        bool atEnd, padded;
        UInt32 flags;
        UInt64 sectionOffset, dataOffset, size;
    } const rows[] = {
        {false, false, 0x43, 64, 155, 10'000},
        {false, true, 0x243, 64, 160, 10'005},
        {true, false, 0xC3, 9'909, 64, 10'000},
        {true, true, 0x2C3, 9'909, 64, 10'000}, // padding is of no effect at the end
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::Message() << "flags 0x" << std::hex << row.flags);
        ArchiveDescription archive = WithSectionOf91Bytes();
        archive.sectionAtEnd = row.atEnd;
        archive.sectionPadded = row.padded;
        const BuiltArchive built = BuildArchive(archive);
        EXPECT_EQ(BigEndianBytes().U64(row.size).U32(91).Get(), built.bytes.substr(30, 12));
        EXPECT_EQ(BigEndianBytes().U32(row.flags).Get(), built.bytes.substr(46, 4));
        EXPECT_EQ(row.sectionOffset, built.sectionOffset);
        EXPECT_EQ(archive.entries[0].bytes, built.bytes.substr(row.dataOffset, archive.entries[0].bytes.size()));
        ExpectOutcome(0, Report(8, row.size), TreeOf(archive.entries), Extract(built.bytes));
    }
}

} // namespace
