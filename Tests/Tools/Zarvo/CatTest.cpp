#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include "Tools/Zarvo/Progress.h"

namespace {

class ZarvoCat : public ZarvoTest {};

TEST_F(ZarvoCat, PrintsFilesInTheOrderOfTheArguments) {
    MakeArchive("a.zarvo", Archive("a/one:1 b:2 a/two:3 d| c*:4 cc:5"));
    const struct {
        std::vector<std::string> patterns;
        Heard heard;
    } kCases[] = {
        {{"b", "a"}, {0, "213", ""}}, {{"a/*", "b"}, {0, "132", ""}},
        {{"/"}, {0, "12345", ""}},    {{""}, {0, "12345", ""}},
        {{"b", "b"}, {0, "22", ""}},  {{"c*"}, {0, "45", ""}},
        {{"c\\*"}, {0, "4", ""}},     {{"d"}, {0, "", ""}},
        {{"a//one"}, {0, "1", ""}},   {{"x", "b"}, {1, "2", "zarvo: a.zarvo: x: matches nothing\n"}},
    };
    for (const auto& [patterns, heard] : kCases) {
        std::vector<std::string> arguments = {"cat", "a.zarvo"};
        arguments.insert(arguments.end(), patterns.begin(), patterns.end());
        EXPECT_EQ(heard, Zarvo(arguments)) << patterns[0];
    }
}

TEST_F(ZarvoCat, TakesTheLastOfEqualNames) {
    MakeArchive("a.zarvo", Archive("a/x:1 b:2 .\\a//x:3 c:4"));
    EXPECT_EQ((Heard{0, "234", ""}), Zarvo({"cat", "a.zarvo", "**"}));
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "a/x"}));
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "a/[x]"})) << "matched twice";
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "?\\\\a//*"})) << "matched as it is stored";
}

TEST_F(ZarvoCat, TakesPatternsFromStandardInput) {
    MakeArchive("a.zarvo", Archive("a:1 b:2 c:3"));
    EXPECT_EQ((Heard{0, "132", ""}), Zarvo({"cat", "--files-from=-", "a.zarvo", "a"}, {.input = "c\nb\n"}));
}

// A walk over all entries for each of them takes more than a minute.
TEST_F(ZarvoCat, LooksUpManyPathsAsFindPrintsThem) {
    ArchiveDescription archive = {.entries = {{.path = "file", .bytes = "x"}}};
    std::string names = "./file\n";
    for (int index = 0; index < 20'000; ++index) {
        archive.entries.push_back({.path = "d" + std::to_string(index), .flags = kFolderEntry});
        names += "./" + archive.entries.back().path + "\n";
    }
    MakeArchive("a.zarvo", archive);
    const clock_t start = clock();
    EXPECT_EQ((Heard{0, "x", ""}), Zarvo({"cat", "--files-from=-", "a.zarvo"}, {.input = names}));
    EXPECT_LE((clock() - start) / CLOCKS_PER_SEC, 10);
}

TEST_F(ZarvoCat, PrintsFilesLargerThanItsBuffers) {
    const std::string bytes = Bytes("c3000000");
    for (const char* const form : {"lz4 chunk=131072", "lzma streamed chunk=2000000", "stored chunk=0"}) {
        MakeArchive("a.zarvo", Archive(std::string(form) + " a:c3000000 b:x"));
        const Heard heard = Zarvo({"cat", "a.zarvo", "a", "b"});
        EXPECT_EQ(0, heard.status) << heard.error;
        EXPECT_TRUE(heard.output == bytes + "x") << heard.output.size() << " bytes from " << form;
    }
}

TEST_F(ZarvoCat, PrintsWhatLiesBeforeDamage) {
    ArchiveDescription archive = Archive("a:abcdefgh b:9");
    archive.blocks = {{.size = 4}, {.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')}};
    MakeArchive("a.zarvo", archive);
    EXPECT_EQ((Heard{1, "abcd9", "zarvo: a.zarvo: a: block 1 is damaged\n"}), Zarvo({"cat", "a.zarvo", "*"}));
}

TEST_F(ZarvoCat, RefusesNamesThatNoFileCanHave) {
    MakeArchive("a.zarvo",
                {.entries = {{.path = "./"}, {.path = "d/a/", .bytes = "1"}, {.path = "d/b", .bytes = "2"}}});
    EXPECT_EQ((Heard{1, "2",
                     "zarvo: a.zarvo: ./: the path is empty\n"
                     "zarvo: a.zarvo: d/a/: the path of a file ends with a separator\n"}),
              Zarvo({"cat", "a.zarvo", "**"}));
    EXPECT_EQ((Heard{1, "2", "zarvo: a.zarvo: d/a/: the path of a file ends with a separator\n"}),
              Zarvo({"cat", "a.zarvo", "d"}));
}

// A walk over all of them for each pattern takes minutes.
TEST_F(ZarvoCat, LooksUpManyEntriesWithProblems) {
    ArchiveDescription archive;
    std::string names;
    for (int index = 0; index < 20'000; ++index) {
        archive.entries.push_back({.path = "d/../" + std::to_string(index), .bytes = "x"});
        names += archive.entries.back().path + "\n";
    }
    MakeArchive("a.zarvo", archive);
    const clock_t start = clock();
    EXPECT_EQ((Heard{0, std::string(20'000, 'x'), ""}), Zarvo({"cat", "--files-from=-", "a.zarvo"}, {.input = names}));
    EXPECT_LE((clock() - start) / CLOCKS_PER_SEC, 10);
}

TEST_F(ZarvoCat, PrintsFilesThatExtractionWouldPutElsewhere) {
    MakeArchive("a.zarvo", Archive("d/../a:1 d/../a:2 d/x:3"));
    EXPECT_EQ((Heard{0, "23", ""}), Zarvo({"cat", "a.zarvo", "d"}));
    EXPECT_EQ((Heard{0, "2", ""}), Zarvo({"cat", "a.zarvo", "d/../a"}));
    EXPECT_EQ((Heard{0, "2", ""}), Zarvo({"cat", "a.zarvo", "d/.."}));
}

TEST_F(ZarvoCat, NamesTheSizeOfABlockOverTheBudget) {
    MakeArchive("a.zarvo", Archive("lz4 chunk=4096 a:c4096 b:x"));
    EXPECT_EQ((Heard{1, "x", "zarvo: a.zarvo: a: block 0 of 4096 bytes is too large to be held in memory\n"}),
              Zarvo({"cat", "--memory=2K", "a.zarvo", "a", "b"}));
}

TEST_F(ZarvoCat, SaysWhatTheRuntimeReportsOnce) {
    MakeArchive("a.zarvo", Archive("block[0].flags=4 block[1].flags=4 chunk=2 a:1234"));
    EXPECT_EQ((Heard{1, "",
                     "zarvo: a.zarvo: Decompressing this format (4) is not supported on this platform.\n"
                     "zarvo: a.zarvo: a: block 0 has compression kind 4, which is not supported\n"
                     "zarvo: a.zarvo: a: block 0 has compression kind 4, which is not supported\n"}),
              Zarvo({"cat", "a.zarvo", "a", "a"}));
}

TEST(ZarvoProgress, DescribesAnyAmount) {
    EXPECT_EQ(" 25%  512 bytes of 2.0 KiB, 1 of 4 files, 256 bytes/s, 0:06 left",
              DescribeProgress({.bytes = 512, .files = 1}, {.bytes = 2'048, .files = 4}, 2));
    EXPECT_EQ("  0%  0 bytes of 0 bytes, 0 of 1 files, 0 bytes/s, ? left", DescribeProgress({}, {.files = 1}, 0));
    EXPECT_EQ("  0%  1 bytes of 16.0 EiB, 0 of 1 files, 0 bytes/s, ? left",
              DescribeProgress({.bytes = 1}, {.bytes = UINT64_MAX, .files = 1}, 10));
    EXPECT_EQ(" 50%  1.0 MiB of 2.0 MiB, 1.0 MiB/s, 0:01 left",
              DescribeProgress({.bytes = 1 << 20}, {.bytes = 2 << 20}, 1))
        << "of a run that counts no files";
    EXPECT_EQ(" 25%  0 bytes of 0 bytes, 1000 of 4000 files, 0 bytes/s, 0:30 left",
              DescribeProgress({.files = 1'000}, {.files = 4'000}, 10))
        << "of empty files";
    EXPECT_EQ("100%  9 bytes of 9 bytes, 1 of 11 files, 1 bytes/s, 1:30 left",
              DescribeProgress({.bytes = 9, .files = 1}, {.bytes = 9, .files = 11}, 9))
        << "of files that cost more than their bytes";
}

} // namespace
