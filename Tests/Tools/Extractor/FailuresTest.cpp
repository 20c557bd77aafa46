// Archives that can't be read, are cut, damaged or hostile: what is said, and what comes out all the same.
#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <sys/resource.h>

static const std::string kNoHeader = "noheader:a.zarvo unread";

TEST(Failures, HeadersAreRefusedAndDamageSpoilsTheReadsThatNeedIt) {
    const std::array<std::string, 3> rows[] = {
        // messages, output, archives
        {kNoHeader, "none", "version=9; old version=4; old version=6 end; uncompressedBlocksInfoSize=55"},
        {"unsupported " + kNoHeader, "none", "flags=0x44; end flags=0xC4"},
        {"toowide unread", "none", "end size=0; end size=55; end size=0xFFFFFFFFFFFFFFFF"},
        {"unread", "none", "end size=1000000; flags=0x42; flags=0x41 hash.high=0xFFFFFFFFFFFFFFFF"},
        {"unread", "none", "lz4 section uncompressedBlocksInfoSize=55; lz4 section uncompressedBlocksInfoSize=57"},
        {"unread", "none", "lzma section uncompressedBlocksInfoSize=57; lzma section uncompressedBlocksInfoSize=50"},
        {"unread", "none", "blockCount=0xFFFFFFFF; nodeCount=0xFFFFFFFF; raw levelBound=2; raw levelCount=0xFFFFFFFF"},
        {"unread", "none", "raw entryCount=0xFFFFFFFF; raw headerSize=1000000; old headerPosition=1000000"},
        {"unread", "none", "old directoryPosition=1000000; old nodeCount=0xFFFFFFFF; old blockCount=0xFFFFFFFF"},
        {"nodirectory", "none", "web levels=0; web level[0].compressedSize=0; web level[0].compressedSize=8"},
        {"nodirectory", "none", "web level[0].compressedSize=9; web level[0].compressedSize=12"},
        {"data:a", "a:", "raw levels=0; lz4 block[0].uncompressedSize=100001; lzma block[0].uncompressedSize=100001"},
        {"data:a", "a:", "lz4 block[0].uncompressedSize=99999 node[0].size=99999; lzma block[0].compressedSize=0"},
        {"data:a", "a:", "lzma streamed block[0].compressedSize=4; lzma streamed block[0].compressedSize=10"},
        {"toolarge data:a", "a:", "lz4 block[0].uncompressedSize=0x7FFFFFFF"},
        {"toolarge unread", "none", "lz4 section uncompressedBlocksInfoSize=0x7FFFFFFF"},
        {"unstarted data:a", "a:", "lz4 block[0].flags=0x42; old lz4hc running[0].streamed=3"},
        {"unsupported unsupported data:a", "a:", "block[0].flags=0x44"}, // asked for to start it, and to fill
        {"unknown unknown data:a", "a:", "block[0].flags=0x45; block[0].flags=0x7F"},
        // A whole block that fails spoils its read, a part of one only itself.
        {"unsupported data:a", "a:", "chunk=20000 block[1].flags=4"},
        {"unsupported unsupported data:a", "a:c50000", "chunk=50000 block[1].flags=4"},
        {"unsupported data:a", "a:c65536", "chunk=65536 block[1].flags=4"},
        // Reported, and read all the same.
        {"pastend ok", "a:c100000", "block[0].compressedSize=99900"},
        {"twosizes ; ok", "a:c100000", "uncompressedBlocksInfoSize=57"},
        {"toowide ; ok", "a:c100000", "old running[0].uncompressed=0 running[1].uncompressed=0x7000186A0"},
        {"toowide ; ok", "a:c100000", "old running[0].stored=0 running[1].stored=0x1000186A0"},
    };
    for (const auto& [messages, output, archives] : rows) {
        std::istringstream stream(archives);
        for (std::string words; std::getline(stream, words, ';');)
            Expect({words + " a:c100000", messages, output});
    }
    Expect({"chunk=1000 block[0].compressedSize=10 a:z1005 b:z1995"}); // the blocks behind it lie elsewhere
    for (const char* signature : {"ZarvoF", "ZarvoFSx", "zarvofs", "", "z64", "z100000"})
        Expect({"a:text", kNoHeader, "none", {.signature = Bytes(signature)}});
}

// Nothing in an archive tells these bytes from the right ones; the documents say so.
TEST(Failures, DamageThatStillDecodesGoesUnnoticed) {
    const std::string zs(60, 'z'), damaged = std::string(59, 'z') + "y";
    for (const char* kind : {"stored a:", "lz4 a:", "lz4hc a:"}) {
        Case run{kind + zs, "ok", "a:" + damaged};
        run.change = [](std::string& bytes) { bytes.back() = 'y'; };
        Expect(run);
    }
}

// Every cut of every layout: what is said, and how much of the file comes out.
TEST(Failures, EveryCutEndsInTheRightMessage) {
    for (const std::string form :
         {"fs chunk=7", "fs end", "lz4 section", "lzma section end", "web", "raw", "old", "old end"}) {
        const bool isWeb = form == "web";
        const std::string words = form + (isWeb ? " a:z65600" : " a:r20");
        const BuiltArchive built = BuildArchive(Archive(words));
        const size_t size = built.bytes.size(), dataStart = form == "raw" ? size - 20 : built.dataOffset;
        // The NUL of the path that ends a stored section is not missed, nor are the last bytes of a ZarvoWeb stream.
        const size_t loadEnd = (form.ends_with("end") ? size : dataStart) - (form.starts_with("fs") ? 1 : 0);
        for (size_t cut = 0; cut < size - (isWeb ? 5 : 0); ++cut) {
            size_t count = form == "lz4 section" ? 0 : std::clamp(cut, dataStart, dataStart + 20) - dataStart;
            if (form == "fs chunk=7" && count >= 7 && count < 20) count = 0; // a later block spoils the whole read
            Case run{words, count == 20 ? "ok" : "data:a", count == 0 ? "a:" : "a:r" + std::to_string(count)};
            if (isWeb) run.messages = "nodirectory";
            if (cut < loadEnd) run.messages = cut < strlen(built.bytes.c_str()) ? kNoHeader : "unread";
            run.change = [cut](std::string& bytes) { bytes.resize(cut); };
            Expect(run);
        }
    }
}

// Files that name ranges of one stream, as "offset size delivered", in this order; 300 bytes of the archive are
// damaged.
static void ExpectRanges(const std::string& form, size_t damagedAt, const std::string& ranges) {
    Case run{form + " ?:r300000", "", ""};
    std::istringstream numbers(ranges);
    int count = 0;
    for (std::string offset, size, delivered; numbers >> offset >> size >> delivered; ++count) {
        const std::string name = std::to_string(count), node = " node[" + name + "].";
        run.archive += " " + name + ":" + node + "offset=" + offset + node + "size=" + size;
        run.output += name + (delivered == "0" ? ": " : ":r300000@" + offset + "@" + delivered + " ");
        if (delivered != size) run.messages += " data:" + name;
    }
    run.change = [=](std::string& bytes) { bytes.replace(std::min(damagedAt, bytes.size()), 300, 300, '\xFF'); };
    Expect(run);
}

TEST(Failures, RangesAreReadInAnyOrderAndDamageSpoilsOnlyWhatLiesBehindIt) {
    for (const char* form : {"stored", "lzma", "lz4 chunk=30000", "stored streamed chunk=0", "lzma streamed chunk=0"})
        ExpectRanges(form, 1'000'000,
                     "65535 1 1  65536 1 1  131071 2 2  299999 1 1  196608 70000 70000  65535 65537 65537  1 1 1 "
                     "0 300000 300000  200000 100000 100000  65537 1000 1000  66538 1000 1000  300000 0 0 "
                     "0 300001 262144  299999 2 0  300000 1 0  2147483648 1 0  10 4294967295 262144 "
                     "10 9223372036854775807 262144  10 18446744073709551615 262144 "
                     "9223372036854775808 9223372036854775808 0  18446744073709551615 18446744073709551615 0");
    ExpectRanges(
        "lzma streamed chunk=0 end", 64 + 140'000,
        "0 1000 1000  64536 1000 1000  150000 1000 0  65536 1000 1000  151000 1000 0  299999 1 0  1000 64536 64536");
    // The second window gets its first bytes from a good input piece and fails in the next one: they stay lost.
    ExpectRanges("lzma streamed chunk=0 end", 64 + 131'082, "0 10 10  70000 10 0  70000 10 0  70010 10 0  10 10 10");
}

// Every field of every layout takes every value at which a sum, a sign or a width ends. Whatever the command makes of
// it, it ends by itself, without much memory, and makes nothing outside its output folder.
TEST(Failures, HostileValuesInAnyFieldAreSurvived) {
    std::vector<const char*> values = {"0xFFFFFFFF", "0x7FFFFFFFFFFFFFFF", "1"}; // the sanitizers take their time
    if (!VARNEX_SANITIZED)
        values.insert(values.end(), {"0", "0x7FFFFFFF", "0x80000000", "0x8000000000000000", "0xFFFFFFFFFFFFFFFF"});
    for (const std::string form : {"fs lzma streamed", "web6 lzma section end", "web", "raw", "old lzma streamed end"})
        for (const auto& [name, field] : BuildArchive(Archive(form + " a:c70000 b:text")).fields)
            for (const char* const value : values) {
                const std::string words = form + " chunk=70000 a:c70000 b:text " + name + "=" + value;
                const TemporaryFolder folder;
                WriteFile(folder / "a.zarvo", BuildArchive(Archive(words)).bytes);
                const auto [status, output] = RunVarnex({"a.zarvo"}, folder.Path());
                EXPECT_EQ(output.ends_with(Say("ok")) ? 0 : 1, status) << words << "\n" << output;
                for (const auto& entry : fs::directory_iterator(folder.Path()))
                    EXPECT_TRUE(entry.path().string().starts_with(folder / "a.zarvo")) << words << "\n" << entry.path();
                rusage usage;
                ASSERT_EQ(0, getrusage(RUSAGE_CHILDREN, &usage));
                ASSERT_LE(usage.ru_maxrss, VARNEX_SANITIZED ? usage.ru_maxrss : 64 * 1'024) << words;
            }
}
