#include "Tests/Tools/Zarvo/ZarvoTest.h"

namespace {

class ZarvoCat : public ZarvoTest {};

TEST_F(ZarvoCat, PrintsFilesInTheOrderOfTheArguments) {
    MakeArchive("a.zarvo", Archive("a/one:1 b:2 a/two:3 d| c*:4 cc:5"));
    const struct {
        std::vector<std::string> patterns;
        Heard heard;
        const char* input = "";
    } kCases[] = {
        {.patterns = {"b", "a"}, .heard = {0, "213", ""}},
        {.patterns = {"a/*", "b"}, .heard = {0, "132", ""}},
        {.patterns = {"/"}, .heard = {0, "12345", ""}},
        {.patterns = {""}, .heard = {0, "12345", ""}},
        {.patterns = {"b", "b"}, .heard = {0, "22", ""}},
        {.patterns = {"c*"}, .heard = {0, "45", ""}},
        {.patterns = {"c\\*"}, .heard = {0, "4", ""}},
        {.patterns = {"d"}, .heard = {0, "", ""}},
        {.patterns = {"a//one"}, .heard = {0, "1", ""}},
        {.patterns = {"x", "b"}, .heard = {1, "2", "zarvo: a.zarvo: x: matches nothing\n"}},
        {.patterns = {"--files-from=-", "b"}, .heard = {0, "251", ""}, .input = "cc\na/one\n"},
    };
    for (const auto& [patterns, heard, input] : kCases) {
        std::vector<std::string> arguments = {"cat", "a.zarvo"};
        arguments.insert(arguments.end(), patterns.begin(), patterns.end());
        EXPECT_EQ(heard, Zarvo(arguments, {.input = input})) << patterns[0];
    }
}

TEST_F(ZarvoCat, TakesTheLastOfEqualNames) {
    MakeArchive("a.zarvo", Archive("a/x:1 b:2 .\\a//x:3 c:4"));
    EXPECT_EQ((Heard{0, "234", ""}), Zarvo({"cat", "a.zarvo", "**"}));
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "a/x"}));
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "a/[x]"})) << "matched twice";
    EXPECT_EQ((Heard{0, "3", ""}), Zarvo({"cat", "a.zarvo", "?\\\\a//*"})) << "matched as it is stored";
}

// Whichever comes first: only files can be printed.
TEST_F(ZarvoCat, TakesTheFileWhereAFolderHasItsName) {
    MakeArchive("a.zarvo", Archive("h:1 h|"));
    MakeArchive("b.zarvo", Archive("h| h:1"));
    for (const char* const archive : {"a.zarvo", "b.zarvo"})
        for (const char* const pattern : {"h", "?"})
            EXPECT_EQ((Heard{0, "1", ""}), Zarvo({"cat", archive, pattern})) << archive << pattern;
}

// Each is looked up: a walk over all entries for each of them takes minutes.
TEST_F(ZarvoCat, LooksUpManyPaths) {
    const struct {
        const char* what;
        const char* before; // the entries' numbers
        const char* asked;  // before the entries' paths
        UInt32 flags;
    } kCases[] = {
        {.what = "folders, as find prints them", .before = "d", .asked = "./", .flags = kFolderEntry},
        {.what = "files that extraction refuses", .before = "d/../", .asked = "", .flags = 0},
    };
    for (const auto& [what, before, asked, flags] : kCases) {
        ArchiveDescription archive;
        std::string names;
        for (int index = 0; index < 20'000; ++index) {
            const std::string path = before + std::to_string(index);
            archive.entries.push_back({.path = path, .bytes = flags == kFolderEntry ? "" : "x", .flags = flags});
            names += asked + path + "\n";
        }
        MakeArchive("a.zarvo", archive);
        const clock_t start = clock();
        const Heard heard = Zarvo({"cat", "--files-from=-", "a.zarvo"}, {.input = names});
        EXPECT_LE((clock() - start) / CLOCKS_PER_SEC, 10) << what;
        EXPECT_EQ(0, heard.status) << what << heard.error.substr(0, 200);
        EXPECT_EQ(Brief(flags == kFolderEntry ? "" : std::string(20'000, 'x')), Brief(heard.output)) << what;
    }
}

TEST_F(ZarvoCat, PrintsFilesLargerThanItsBuffers) {
    MakeArchive("a.zarvo", Archive("lz4 a:c3000000 b:x"));
    const Heard heard = Zarvo({"cat", "a.zarvo", "a", "b"});
    EXPECT_EQ(0, heard.status) << heard.error;
    EXPECT_EQ(Brief(Bytes("c3000000") + "x"), Brief(heard.output));
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

TEST_F(ZarvoCat, PrintsFilesThatExtractionWouldPutElsewhere) {
    MakeArchive("a.zarvo", Archive("d/../a:1 d/../a:2 d/x:3"));
    EXPECT_EQ((Heard{0, "23", ""}), Zarvo({"cat", "a.zarvo", "d"}));
    EXPECT_EQ((Heard{0, "2", ""}), Zarvo({"cat", "a.zarvo", "d/../a"}));
    EXPECT_EQ((Heard{0, "2", ""}), Zarvo({"cat", "a.zarvo", "d/.."}));
}

TEST_F(ZarvoCat, SaysWhatTheRuntimeReportsOnce) {
    MakeArchive("a.zarvo", Archive("block[0].flags=4 block[1].flags=4 chunk=2 a:1234"));
    EXPECT_EQ((Heard{1, "",
                     "zarvo: a.zarvo: Decompressing this format (4) is not supported on this platform.\n"
                     "zarvo: a.zarvo: a: block 0 has compression kind 4, which is not supported\n"
                     "zarvo: a.zarvo: a: block 0 has compression kind 4, which is not supported\n"}),
              Zarvo({"cat", "a.zarvo", "a", "a"}));
}

} // namespace
