// Archives that can't be read, are cut, damaged or hostile: what the command reports, and what it still extracts.
#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <set>
#include <sys/resource.h>

namespace {

const std::string kNoHeader = "noheader:a.zarvo unread";

struct Row {
    std::string messages;
    std::string output;
    std::vector<std::string> archives; // each of them also holds the file "a" with c100000
};

void ExpectRows(const std::vector<Row>& rows) {
    for (const auto& [messages, output, archives] : rows)
        for (const std::string& words : archives)
            Expect({.archive = words + " a:c100000", .messages = messages, .output = output});
}

TEST(Failures, UnknownSignaturesAreRefused) {
    for (const char* const signature : {"ZarvoF", "ZarvoFSx", "zarvofs", "", "z64", "z100000"})
        Expect({.archive = "a:text", .messages = kNoHeader, .output = "none", .form = {.signature = Bytes(signature)}});
}

TEST(Failures, BadHeadersAreRefused) {
    ExpectRows({
        {.messages = kNoHeader,
         .output = "none",
         .archives = {"version=9", "old version=4", "old version=6 end", "uncompressedBlocksInfoSize=55"}},
        {.messages = "unsupported " + kNoHeader, .output = "none", .archives = {"flags=0x44", "end flags=0xC4"}},
        {.messages = "toowide unread",
         .output = "none",
         .archives = {"end size=0", "end size=55", "end size=0xFFFFFFFFFFFFFFFF"}},
        {.messages = "unread", .output = "none", .archives = {"end size=1000000", "raw headerSize=1000000"}},
        {.messages = "unread", .output = "none", .archives = {"raw levelBound=2", "raw levelCount=0xFFFFFFFF"}},
    });
}

TEST(Failures, BadSectionsAreRefused) {
    ExpectRows({
        {.messages = "unread", .output = "none", .archives = {"flags=0x42", "flags=0x41 hash.high=0xFFFFFFFFFFFFFFFF"}},
        {.messages = "unread",
         .output = "none",
         .archives = {"lz4 section uncompressedBlocksInfoSize=55", "lz4 section uncompressedBlocksInfoSize=57",
                      "lzma section uncompressedBlocksInfoSize=57", "lzma section uncompressedBlocksInfoSize=50"}},
        {.messages = "toolarge unread",
         .output = "none",
         .archives = {"lz4 section uncompressedBlocksInfoSize=0x7FFFFFFF"}},
    });
}

TEST(Failures, BadDirectoriesAreRefused) {
    ExpectRows({
        {.messages = "unread", .output = "none", .archives = {"blockCount=0xFFFFFFFF", "nodeCount=0xFFFFFFFF"}},
        {.messages = "unread", .output = "none", .archives = {"raw entryCount=0xFFFFFFFF"}},
        {.messages = "unread",
         .output = "none",
         .archives = {"old headerPosition=1000000", "old directoryPosition=1000000", "old nodeCount=0xFFFFFFFF",
                      "old blockCount=0xFFFFFFFF"}},
        {.messages = "nodirectory",
         .output = "none",
         .archives = {"web levels=0", "web level[0].compressedSize=0", "web level[0].compressedSize=8",
                      "web level[0].compressedSize=9", "web level[0].compressedSize=12"}},
    });
}

TEST(Failures, BlocksOfWrongSizesFailTheirFile) {
    ExpectRows({
        {.messages = "data:a",
         .output = "a:",
         .archives = {"raw levels=0", "lz4 block[0].uncompressedSize=100001", "lzma block[0].uncompressedSize=100001",
                      "lz4 block[0].uncompressedSize=99999 node[0].size=99999", "lzma block[0].compressedSize=0",
                      "lzma streamed block[0].compressedSize=4", "lzma streamed block[0].compressedSize=10"}},
        {.messages = "toolarge data:a", .output = "a:", .archives = {"lz4 block[0].uncompressedSize=0x7FFFFFFF"}},
    });
}

TEST(Failures, BlocksOfUnknownKindsFailTheirFile) {
    ExpectRows({
        {.messages = "unstarted data:a",
         .output = "a:",
         .archives = {"lz4 block[0].flags=0x42", "old lz4hc running[0].streamed=3"}},
        // A streamed block asks for its decompressor twice: to start it, and to fill the cache.
        {.messages = "unsupported unsupported data:a", .output = "a:", .archives = {"block[0].flags=0x44"}},
        {.messages = "unknown unknown data:a",
         .output = "a:",
         .archives = {"block[0].flags=0x45", "block[0].flags=0x7F"}},
    });
}

// A read that ends in a broken block delivers what comes before, unless the read takes the whole block.
TEST(Failures, ABrokenBlockSpoilsTheReadsThatNeedIt) {
    ExpectRows({
        {.messages = "unsupported data:a", .output = "a:", .archives = {"chunk=20000 block[1].flags=4"}},
        {.messages = "unsupported unsupported data:a",
         .output = "a:c50000",
         .archives = {"chunk=50000 block[1].flags=4"}},
        {.messages = "unsupported data:a", .output = "a:c65536", .archives = {"chunk=65536 block[1].flags=4"}},
    });
}

TEST(Failures, ContradictionsMayBeReportedAndReadAllTheSame) {
    ExpectRows({
        {.messages = "pastend ok", .output = "a:c100000", .archives = {"block[0].compressedSize=99900"}},
        {.messages = "twosizes ; ok", .output = "a:c100000", .archives = {"uncompressedBlocksInfoSize=57"}},
        {.messages = "toowide ; ok",
         .output = "a:c100000",
         .archives = {"old running[0].uncompressed=0 running[1].uncompressed=0x7000186A0",
                      "old running[0].stored=0 running[1].stored=0x1000186A0"}},
    });
}

TEST(Failures, AWrongStoredSizeMovesTheBlocksAfterIt) {
    Expect({.archive = "chunk=1000 block[0].compressedSize=10 a:z1005 b:z1995"});
}

// Nothing in an archive tells these bytes from the right ones; the documents say so.
TEST(Failures, DamageThatStillDecodesGoesUnnoticed) {
    const std::string zs(60, 'z'), damaged = std::string(59, 'z') + "y";
    for (const char* const kind : {"stored a:", "lz4 a:", "lz4hc a:"})
        Expect(
            {.archive = kind + zs, .output = "a:" + damaged, .change = [](std::string& bytes) { bytes.back() = 'y'; }});
}

// Every cut of every layout: what is reported, and how much of the file is extracted.
TEST(Failures, EveryCutEndsInTheRightMessage) {
    constexpr size_t kSize = 20, kChunk = 7;
    for (const std::string form :
         {"fs chunk=7", "fs end", "lz4 section", "lzma section end", "web", "raw", "old", "old end"}) {
        const bool isWeb = form == "web";
        const std::string words = form + (isWeb ? " a:z65600" : " a:r20");
        const BuiltArchive built = BuildArchive(Archive(words));
        const size_t size = built.bytes.size(), dataStart = form == "raw" ? size - kSize : built.dataOffset;
        // Not missed: the NUL of the path that ends a stored section, and the last bytes of a ZarvoWeb stream.
        const size_t loadEnd = (form.ends_with("end") ? size : dataStart) - (form.starts_with("fs") ? 1 : 0);
        for (size_t cut = 0; cut < size - (isWeb ? 5 : 0); ++cut) {
            SCOPED_TRACE(testing::Message() << "cut at " << cut);
            size_t count = form == "lz4 section" ? 0 : std::clamp(cut, dataStart, dataStart + kSize) - dataStart;
            // A block after the first that is not whole spoils the whole read.
            if (form == "fs chunk=7" && count >= kChunk && count < kSize) count = 0;
            Case run = {
                .archive = words,
                .messages = count == kSize ? "ok" : "data:a",
                .output = count == 0 ? "a:" : "a:r" + std::to_string(count),
                .change = [cut](std::string& bytes) { bytes.resize(cut); },
            };
            if (isWeb) run.messages = "nodirectory";
            if (cut < loadEnd) run.messages = cut < strlen(built.bytes.c_str()) ? kNoHeader : "unread";
            Expect(run);
        }
    }
}

// A file that names a range of the stream, and how many bytes of it are extracted.
struct Range {
    UInt64 offset;
    UInt64 size;
    UInt64 delivered;
};

// Files that name the ranges of one stream, in this order. 300 bytes of the archive are damaged, from damagedAt on.
void ExpectRanges(const std::string& form, size_t damagedAt, const std::vector<Range>& ranges) {
    Case run = {
        .archive = form + " ?:r300000",
        .messages = "",
        .output = "",
        .change = [=](std::string& bytes) { bytes.replace(std::min(damagedAt, bytes.size()), 300, 300, '\xFF'); },
    };
    for (size_t index = 0; index < ranges.size(); ++index) {
        const auto& [offset, size, delivered] = ranges[index];
        const std::string name = std::to_string(index), node = " node[" + name + "].", start = std::to_string(offset);
        run.archive += " " + name + ":" + node + "offset=" + start + node + "size=" + std::to_string(size);
        run.output += name + ":";
        if (delivered != 0) run.output += "r300000@" + start + "@" + std::to_string(delivered);
        run.output += " ";
        if (delivered != size) run.messages += " data:" + name;
    }
    if (run.messages.empty()) run.messages = "ok";
    Expect(run);
}

constexpr size_t kUndamaged = ~size_t{0};

TEST(Ranges, AreReadInAnyOrder) {
    for (const char* const form :
         {"stored", "lzma", "lz4 chunk=30000", "stored streamed chunk=0", "lzma streamed chunk=0"})
        ExpectRanges(form, kUndamaged,
                     {{.offset = 65'535, .size = 1, .delivered = 1},
                      {.offset = 65'536, .size = 1, .delivered = 1},
                      {.offset = 131'071, .size = 2, .delivered = 2},
                      {.offset = 299'999, .size = 1, .delivered = 1},
                      {.offset = 196'608, .size = 70'000, .delivered = 70'000},
                      {.offset = 65'535, .size = 65'537, .delivered = 65'537},
                      {.offset = 1, .size = 1, .delivered = 1},
                      {.offset = 0, .size = 300'000, .delivered = 300'000},
                      {.offset = 200'000, .size = 100'000, .delivered = 100'000},
                      {.offset = 65'537, .size = 1'000, .delivered = 1'000},
                      {.offset = 66'538, .size = 1'000, .delivered = 1'000},
                      {.offset = 300'000, .size = 0, .delivered = 0}});
}

// The whole pieces of 65,536 bytes come out, whatever size is named.
TEST(Ranges, PastTheEndFailInTheirLastPiece) {
    constexpr UInt64 kPieces = 262'144, kLargestSigned = 0x7FFF'FFFF'FFFF'FFFF, kLargest = 0xFFFF'FFFF'FFFF'FFFF;
    for (const char* const form :
         {"stored", "lzma", "lz4 chunk=30000", "stored streamed chunk=0", "lzma streamed chunk=0"})
        ExpectRanges(form, kUndamaged,
                     {{.offset = 0, .size = 300'001, .delivered = kPieces},
                      {.offset = 299'999, .size = 2, .delivered = 0},
                      {.offset = 300'000, .size = 1, .delivered = 0},
                      {.offset = 0x8000'0000, .size = 1, .delivered = 0},
                      {.offset = 10, .size = 0xFFFF'FFFF, .delivered = kPieces},
                      {.offset = 10, .size = kLargestSigned, .delivered = kPieces},
                      {.offset = 10, .size = kLargest, .delivered = kPieces},
                      {.offset = kLargestSigned + 1, .size = kLargestSigned + 1, .delivered = 0},
                      {.offset = kLargest, .size = kLargest, .delivered = 0}});
}

TEST(Ranges, AfterTheDamageOfAStreamAreLost) {
    ExpectRanges("lzma streamed chunk=0 end", 64 + 140'000,
                 {{.offset = 0, .size = 1'000, .delivered = 1'000},
                  {.offset = 64'536, .size = 1'000, .delivered = 1'000},
                  {.offset = 150'000, .size = 1'000, .delivered = 0},
                  {.offset = 65'536, .size = 1'000, .delivered = 1'000},
                  {.offset = 151'000, .size = 1'000, .delivered = 0},
                  {.offset = 299'999, .size = 1, .delivered = 0},
                  {.offset = 1'000, .size = 64'536, .delivered = 64'536}});
}

// The second window takes its first bytes from an undamaged piece of input and fails in the next piece.
TEST(Ranges, InAWindowThatFailedStayLost) {
    ExpectRanges("lzma streamed chunk=0 end", 64 + 131'082,
                 {{.offset = 0, .size = 10, .delivered = 10},
                  {.offset = 70'000, .size = 10, .delivered = 0},
                  {.offset = 70'000, .size = 10, .delivered = 0},
                  {.offset = 70'010, .size = 10, .delivered = 0},
                  {.offset = 10, .size = 10, .delivered = 10}});
}

// Every field of every layout takes every value at which a sum, a sign or a width ends. Whatever the command makes of
// it, it ends by itself, without much memory, and makes nothing outside its output folder.
TEST(Failures, HostileValuesInAnyFieldAreSurvived) {
    constexpr long kMostMemory = 64 * 1'024;                                     // KiB
    std::vector<std::string> values = {"0xFFFFFFFF", "0x7FFFFFFFFFFFFFFF", "1"}; // few, as the sanitizers are slow
    if (!VARNEX_SANITIZED)
        values.insert(values.end(), {"0", "0x7FFFFFFF", "0x80000000", "0x8000000000000000", "0xFFFFFFFFFFFFFFFF"});
    for (const std::string form : {"fs lzma streamed", "web6 lzma section end", "web", "raw", "old lzma streamed end"})
        for (const auto& [name, field] : BuildArchive(Archive(form + " a:c70000 b:text")).fields)
            for (const std::string& value : values) {
                const std::string words = form + " chunk=70000 a:c70000 b:text " + name + "=" + value;
                SCOPED_TRACE(words);
                const TemporaryFolder folder;
                WriteFile(folder / "a.zarvo", BuildArchive(Archive(words)).bytes);
                const auto [status, said] = RunVarnex({"a.zarvo"}, folder.Path());
                EXPECT_EQ(said.ends_with(Say("ok")) ? 0 : 1, status) << said;
                std::set<std::string> made;
                for (const auto& entry : fs::directory_iterator(folder.Path()))
                    made.insert(entry.path().filename());
                made.erase("a.zarvo_data"); // not every archive gets one
                EXPECT_EQ(std::set<std::string>{"a.zarvo"}, made);
                if (VARNEX_SANITIZED) continue;
                rusage usage;
                ASSERT_EQ(0, getrusage(RUSAGE_CHILDREN, &usage));
                ASSERT_LE(usage.ru_maxrss, kMostMemory);
            }
}

} // namespace
