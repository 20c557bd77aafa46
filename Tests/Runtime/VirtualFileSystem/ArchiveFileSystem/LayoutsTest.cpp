// Whole archives of every form: the command extracts everything.
#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

const std::string kFiles = " one.assets:1 folder/large:c200000 folder/empty: a/b/c:r65536 ";

TEST(Layouts, HaveBlocksOfAnyKindAndSize) {
    for (const std::string layout : {"fs ", "web6 ", "old "})
        for (const std::string kind :
             {"stored", "lzma", "lz4", "lz4hc", "stored streamed", "lzma streamed", "lzma streamed endmark"})
            for (const char* const size : {"4099", "65535", "65536 end", "65537", "131072 end", "131073", "0 end"})
                Expect({.archive = layout + kind + kFiles + "chunk=" + size});
}

TEST(Layouts, HaveSectionsOfAnyKindAndPlace) {
    for (const std::string form : {"version=0 ", "version=6 ", "version=7 ", "version=8 ", "web6 "})
        for (const std::string kind : {"stored section", "lzma section", "lz4 section", "lz4hc section"})
            for (const char* const place : {"", "padded", "end", "end padded"})
                Expect({.archive = form + kind + " folder/a:c500 b:text empty| " + place});
}

TEST(Layouts, MayHaveASectionTooLargeForTheStack) {
    std::string many;
    for (int index = 0; index < 300; ++index)
        many += " folder/" + std::to_string(index) + ":text";
    Expect({.archive = "lz4 section chunk=70" + many});
}

TEST(LegacyLayouts, HaveAnyVersionAndNumberOfLevels) {
    for (const std::string form : {"web", "web endmark", "raw"})
        for (const std::string version : {"0", "1", "2", "3", "4", "0x7FFFFFFF"})
            for (const char* const levels : {" levels=1", " levels=2 levelBound=1", " levels=5 levelBound=0"})
                Expect({.archive = form + kFiles + "version=" + version + levels});
}

// Every read that looks for the directory asks for 65,536 bytes, and a stream that can't deliver all of them is
// refused.
TEST(LegacyLayouts, NeedAWholePieceForTheDirectory) {
    constexpr size_t kPiece = 65'536;
    for (const size_t size : {1'000u, 65'536u, 65'537u, 131'072u, 131'076u})
        for (const size_t rest : {1u, 64'535u, 64'536u, 64'537u, 65'534u, 65'535u, 65'536u}) {
            std::string words = "web"; // an entry takes its path and 9 bytes; the last one has the rest of the stream
            for (size_t left = size - 4; left >= 200; left -= 100)
                words += " " + std::string(91, 'p') + ":";
            words += " " + std::string(91 + (size - 4) % 100, 'q') + ":z" + std::to_string(rest);
            const size_t wholePieces = (size + rest) / kPiece, neededPieces = (size + kPiece - 1) / kPiece;
            Expect({.archive = words, .messages = wholePieces >= neededPieces ? "ok" : "nodirectory"});
        }
}

TEST(OddArchives, MayHoldNothing) {
    for (const char* const form : {"old", "old empty: folder|", "lzma section"})
        Expect({.archive = form});
}

TEST(OddArchives, MayHaveTextsOfAnyLength) {
    const ArchiveDescription texts = {.engineVersion = Bytes("z5000"), .engineRevision = ""};
    Expect({.archive = "a:text", .form = texts});
    Expect({.archive = "padded a/section:of-64-bytes"});
}

TEST(OddArchives, MaySetBitsWithoutAMeaning) {
    for (const char* const words :
         {"flags=0xFFFFFC40 a:text", "block[0].flags=0xFF80 a:text", "node[0].flags=0xFFFFFFFE a:text",
          "node[0].flags=0xFFFFFFFF folder|", "old lz4 running[0].type=0xFFFFFFC2 a:c1000",
          "old lz4 running[0].streamed=0xFFFFFFFE a:c1000"})
        Expect({.archive = words});
}

TEST(OddArchives, MayCountFromAnyStart) {
    Expect({.archive = "old running[0].uncompressed=0xFFFFFFFFFFFFFFFF running[1].uncompressed=3 a:text"});
}

TEST(OddArchives, MayMixKindsOfBlocks) {
    const std::vector<ArchiveBlock> blocks = {{.size = 1'000, .type = kCompressionLz4},
                                              {.size = 0},
                                              {.size = 130'000, .type = kCompressionLzma, .streamed = true},
                                              {.size = 0}};
    Expect({.archive = "stored" + kFiles, .form = {.blocks = blocks}});
}

TEST(OddArchives, MayStoreACompressedBlockAsItIs) {
    for (const std::string kind : {"lzma", "lz4"})
        Expect({.archive = kind + " a:r1000", .form = {.blocks = {{.size = 1'000, .stored = Bytes("r1000")}}}});
}

TEST(OddArchives, MayKeepTheDirectoryOutOfTheSection) {
    Expect({.archive = "a:text", .output = "", .form = {.directoryInSection = false}});
}

// Without its flag the longer signature is not counted: what follows starts with the last byte of the header's flags.
TEST(OddArchives, MayLackTheWebFlag) {
    const ArchiveDescription unflagged = {.webSignatureFlag = false};
    Expect({.archive = "web6 hash.high=0x4000000000000000 a:text", .form = unflagged});
    Expect({.archive = "web6 end a:\xC0text", .form = unflagged});
}

} // namespace
