#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

// Files of every size that matters, a folder with nothing in it, and one file deep in folders that no entry lists.
std::vector<ArchiveEntry> SampleEntries() {
    return {
        {.path = "empty folder", .flags = kFolderEntry},
        {.path = "one.bin", .bytes = "1"},
        {.path = "folder/large.bin", .bytes = Compressible(200'000)},
        {.path = "folder/empty.bin"},
        {.path = "a/b/c.bin", .bytes = Compressible(65'536, 2)},
        {.path = "last.bin", .bytes = Compressible(70'001, 3)},
    };
}

void ExpectWholeExtraction(const ArchiveDescription& archive, UInt32 version) {
    const BuiltArchive built = BuildArchive(archive);
    ExpectOutcome(0, Report(version, built.bytes.size()), TreeOf(archive.entries), Extract(built.bytes));
}

TEST(BlockBasedArchive, EveryKindOfBlockAtEverySizeAroundTheTransferSize) {
    struct {
        CompressionType type;
        bool streamed;
    } const kinds[] = {
        {kCompressionNone, false}, {kCompressionNone, true}, {kCompressionLzma, false},
        {kCompressionLzma, true},  {kCompressionLz4, false}, {kCompressionLz4HC, false},
    };
    for (const auto& kind : kinds) {
        for (const UInt64 chunkSize :
             std::vector<UInt64>{4'099, 65'535, 65'536, 65'537, 131'071, 131'072, 131'073, 0}) {
            SCOPED_TRACE(testing::Message()
                         << "kind " << kind.type << (kind.streamed ? " streamed" : "") << ", blocks of " << chunkSize);
            ArchiveDescription archive;
            archive.entries = SampleEntries();
            archive.type = kind.type;
            archive.streamed = kind.streamed;
            archive.chunkSize = chunkSize;
            ExpectWholeExtraction(archive, 7);
        }
    }
}

TEST(BlockBasedArchive, BlocksOfDifferentKindsAndOfNoSize) {
    ArchiveDescription archive;
    archive.entries = SampleEntries();
    archive.blocks = {
        {.size = 1'000, .type = kCompressionLz4},
        {.size = 0, .type = kCompressionNone},
        {.size = 30'000, .type = kCompressionLzma, .streamed = true},
        {.size = 0, .type = kCompressionLz4, .stored = ""},
        {.size = 100'000, .type = kCompressionLzma, .streamed = true},
        {.size = 50'000, .type = kCompressionNone, .streamed = true},
        {.size = 70'000, .type = kCompressionLz4HC},
    };
    ExpectWholeExtraction(archive, 7);
}

TEST(BlockBasedArchive, ChunkStoredInAsManyBytesAsItHoldsIsTakenAsItIs) {
    for (const CompressionType type : {kCompressionLzma, kCompressionLz4, kCompressionLz4HC}) {
        SCOPED_TRACE(type);
        ArchiveDescription archive;
        archive.entries = {{.path = "a.bin", .bytes = Incompressible(100'000)}};
        archive.blocks = {{.size = 100'000, .type = type, .stored = archive.entries[0].bytes}};
        ExpectWholeExtraction(archive, 7);
    }
}

TEST(BlockBasedArchive, EverySectionInEveryVersion) {
    struct {
        ArchiveLayout layout;
        UInt32 version;
    } const forms[] = {
        {ArchiveLayout::kBlockBased, 0}, {ArchiveLayout::kBlockBased, 6},  {ArchiveLayout::kBlockBased, 7},
        {ArchiveLayout::kBlockBased, 8}, {ArchiveLayout::kWebVersion6, 6},
    };
    for (const auto& form : forms) {
        for (const CompressionType type : {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC}) {
            for (const int place : {0, 1, 2, 3}) {
                SCOPED_TRACE(testing::Message() << "layout " << static_cast<int>(form.layout) << ", version "
                                                << form.version << ", section of kind " << type << ", place " << place);
                ArchiveDescription archive;
                archive.entries = {{.path = "folder/a.bin", .bytes = Compressible(500)}, {.path = "b", .bytes = "b"}};
                archive.layout = form.layout;
                archive.version = form.version;
                archive.sectionType = type;
                archive.sectionAtEnd = (place & 1) != 0;
                archive.sectionPadded = (place & 2) != 0;
                ExpectWholeExtraction(archive, form.version);
            }
        }
    }
}

// The section, or the data when the section is at the end, then starts with the last byte of the header's flags.
TEST(BlockBasedArchive, LongerSignatureIsNotCountedWithoutItsFlag) {
    for (const bool atEnd : {false, true}) {
        SCOPED_TRACE(atEnd ? "section at the end" : "section in front");
        ArchiveDescription archive;
        archive.layout = ArchiveLayout::kWebVersion6;
        archive.webSignatureFlag = false;
        archive.sectionAtEnd = atEnd;
        archive.entries = {{.path = "a.txt", .bytes = "\xC0text"}};
        archive.fields = {{"hash.high", UInt64{0x40} << 56}};
        EXPECT_EQ(50u, BuildArchive(archive).headerSize);
        ExpectWholeExtraction(archive, 6);
    }
}

TEST(BlockBasedArchive, SectionLargerThanAnyBufferOnTheStack) {
    for (const CompressionType type : {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC}) {
        SCOPED_TRACE(type);
        ArchiveDescription archive;
        for (int index = 0; index < 300; ++index)
            archive.entries.push_back({.path = "folder/" + std::to_string(index), .bytes = std::to_string(index)});
        archive.sectionType = type;
        archive.chunkSize = 7;
        ExpectWholeExtraction(archive, 7);
    }
}

TEST(BlockBasedArchive, WithoutNodesOnlyTheOutputFolderIsMade) {
    for (const bool hasDirectory : {true, false}) {
        for (const CompressionType type : {kCompressionNone, kCompressionLzma}) {
            SCOPED_TRACE(testing::Message() << "directory " << hasDirectory << ", section of kind " << type);
            ArchiveDescription archive;
            if (!hasDirectory) archive.entries = {{.path = "a.txt", .bytes = "text"}};
            archive.directoryInSection = hasDirectory;
            archive.sectionType = type;
            const BuiltArchive built = BuildArchive(archive);
            ExpectOutcome(0, Report(7, built.bytes.size()), OutputTree({}), Extract(built.bytes));
        }
    }
}

TEST(BlockBasedArchive, HeaderStringsAndNodePathsOfAnyLength) {
    for (const size_t length : std::vector<size_t>{0, 1, 31, 32, 63, 64, 65, 128, 5'000}) {
        SCOPED_TRACE(length);
        ArchiveDescription archive;
        archive.engineVersion = std::string(length, 'v');
        archive.engineRevision = std::string(length, 'r');
        const std::string path = std::string(length % 200 + 1, 'p');
        archive.entries = {{.path = path, .bytes = "text"}};
        const BuiltArchive built = BuildArchive(archive);
        ExpectOutcome(0,
                      kStarting + "  stream version: 7\n  zarvo version: " + archive.engineVersion +
                          "\n  zarvo revision: " + archive.engineRevision + "\n  data size: " +
                          std::to_string(built.bytes.size()) + " bytes\n  creating folder 'a.zarvo_data'\nAll ok!\n",
                      TreeOf(archive.entries), Extract(built.bytes));
    }
}

TEST(BlockBasedArchive, BitsWithoutMeaningAreLeftAlone) {
    ArchiveDescription archive;
    archive.entries = {{.path = "a.txt", .bytes = "text"}, {.path = "folder", .flags = 0xFFFFFFFF}};
    archive.fields = {{"flags", 0xFFFFFC40}, {"block[0].flags", 0xFF80}, {"node[0].flags", 0xFFFFFFFE}};
    archive.fields["hash.high"] = archive.fields["hash.low"] = ~UInt64{0};
    ExpectWholeExtraction(archive, 7);
}

} // namespace
