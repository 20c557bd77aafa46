#include "Tests/Tools/Zarvo/ZarvoTest.h"

namespace {

class ZarvoCreate : public ZarvoTest {
protected:
    ZarvoCreate() {
        fs::create_directories("in/d/empty");
        WriteFile("in/a", "text");
        WriteFile("in/d/b", Bytes("c70000"));
    }

    static Heard Create(std::vector<std::string> arguments) {
        arguments.insert(arguments.begin(), {"create", "-q"});
        return Zarvo(arguments);
    }
    static std::string Info(const std::string& path, const std::string& name) {
        const std::string text = Zarvo({"info", "--json", path}).output;
        const size_t begin = text.find('"' + name + "\":") + name.size() + 3;
        return text.substr(begin, text.find_first_of(",}", begin) - begin);
    }
};

TEST_F(ZarvoCreate, MakesWhatExtractTakesApart) {
    EXPECT_EQ((Heard{0, "", ""}), Create({"a.zarvo", "in"}));
    EXPECT_EQ((Heard{0, "", ""}), Zarvo({"extract", "-q", "a.zarvo"}));
    EXPECT_EQ(ReadFolderTree("in"), ReadFolderTree("a.zarvo_data"));
}

TEST_F(ZarvoCreate, FollowsItsOptions) {
    const struct {
        std::vector<std::string> options;
        const char* name;
        const char* value;
    } kCases[] = {
        {{}, "layout", "\"ZarvoFS\""},
        {{}, "engineVersion", "\"5.x.x\""},
        {{}, "engineRevision", "\"7041.3.0b12\""},
        {{}, "lz4hc", "1"},
        {{"-c", "lz4"}, "lz4", "1"},
        {{"-c", "none"}, "none", "1"},
        {{"-clzma", "-l0"}, "lzma", "1"},
        {{"--streamed"}, "streamed", "1"},
        {{"-b", "64K"}, "largest", "65536"},
        {{"--layout", "web", "-l", "9"}, "layout", "\"ZarvoWeb\""},
        {{"--layout=raw"}, "layout", "\"ZarvoRaw\""},
        {{"--layout=archive"}, "layout", "\"ZarvoArchive\""},
        {{"--engine-version=6", "--engine-revision", ""}, "engineVersion", "\"6\""},
        {{"-x", "d"}, "entries", "1"},
    };
    for (const auto& [options, name, value] : kCases) {
        std::vector<std::string> arguments = options;
        arguments.insert(arguments.end(), {"--force", "a.zarvo", "in"});
        (void)Create(arguments);
        EXPECT_EQ(value, Info("a.zarvo", name)) << testing::PrintToString(options);
    }
}

TEST_F(ZarvoCreate, RefusesOptionsThatDoNotGoTogether) {
    const std::pair<std::vector<std::string>, const char*> kCases[] = {
        {{"a"}, "no folder is named"},
        {{"a", "in", "in"}, "'in' is one argument too many"},
        {{"--layout=zip", "a", "in"}, "--layout=NAME: 'zip' is none of fs|web|raw|archive"},
        {{"-c", "zstd", "a", "in"}, "-c KIND: 'zstd' is none of none|lz4|lz4hc|lzma"},
        {{"-l", "0", "a", "in"}, "lz4hc has the levels 1 to 12"},
        {{"-l", "13", "a", "in"}, "lz4hc has the levels 1 to 12"},
        {{"-c", "lzma", "-l", "10", "a", "in"}, "lzma has the levels 0 to 9"},
        {{"--layout=web", "-l", "10", "a", "in"}, "lzma has the levels 0 to 9"},
        {{"-c", "lz4", "-l", "1", "a", "in"}, "lz4 has no levels"},
        {{"-c", "none", "-l", "1", "a", "in"}, "none has no levels"},
        {{"--streamed", "-c", "lz4hc", "a", "in"}, "blocks of lz4hc can't be streamed"},
        {{"-b", "4095", "a", "in"}, "a block has 4096 to 1073741824 bytes"},
        {{"-b", "2G", "a", "in"}, "a block has 4096 to 1073741824 bytes"},
        {{"--layout=web", "-c", "lzma", "a", "in"}, "the layout web gives no choice of -c KIND"},
        {{"--layout=web", "-b", "1M", "a", "in"}, "the layout web gives no choice of -b SIZE"},
        {{"--layout=raw", "--streamed", "a", "in"}, "the layout raw gives no choice of --streamed"},
        {{"--layout=raw", "-l", "1", "a", "in"}, "the layout raw gives no choice of -l LEVEL"},
    };
    for (const auto& [arguments, complaint] : kCases) {
        EXPECT_EQ((Heard{2, "", std::string("zarvo: ") + complaint + "; see 'zarvo create --help'\n"}),
                  Create(arguments));
        EXPECT_FALSE(fs::exists("a"));
    }
}

TEST_F(ZarvoCreate, ListsWhatItWouldPack) {
    fs::create_symlink("a", "in/l");
    EXPECT_EQ((Heard{1, "a\nd/\nd/b\n", "zarvo: in/l: left out: a link\n"}),
              Create({"--dry-run", "-x", "d/empty", "a.zarvo", "in/"}));
    EXPECT_FALSE(fs::exists("a.zarvo"));
    WriteFile("there", "old");
    EXPECT_EQ((Heard{1, "", "zarvo: there: File exists\n"}), Create({"--dry-run", "there", "in"}));
}

TEST_F(ZarvoCreate, NamesWhatGoesWrong) {
    WriteFile("there", "old");
    EXPECT_EQ((Heard{1, "", "zarvo: there: File exists\n"}), Create({"there", "in"}));
    EXPECT_EQ((Heard{2, "", "zarvo: none: No such file or directory\n"}), Create({"a.zarvo", "none"}));
    EXPECT_EQ((Heard{2, "", "zarvo: none: No such file or directory\n"}), Create({"there", "none"}));
    EXPECT_EQ((Heard{2, "", "zarvo: there: Not a directory\n"}), Create({"a.zarvo", "there"}));
    EXPECT_EQ((Heard{1, "", "zarvo: none/a.zarvo: No such file or directory\n"}), Create({"none/a.zarvo", "in"}));
    EXPECT_EQ(2, Create({"-", "in"}).status);
    WriteFile("in/\x1b\\", "");
    EXPECT_EQ((Heard{1, "", "zarvo: in/\\x1b\\: the name holds \"\\\", which separates folders in archives\n"}),
              Create({"a.zarvo", "in"}));
    EXPECT_EQ("old", ReadFile("there"));
    EXPECT_FALSE(fs::exists("a.zarvo"));
}

TEST_F(ZarvoCreate, EndsWithASummary) {
    const Heard heard = Zarvo({"create", "a.zarvo", "in"});
    EXPECT_EQ(0, heard.status);
    EXPECT_THAT(heard.error,
                testing::MatchesRegex("zarvo: a.zarvo: 2 files, 70004 bytes, 0 left out, made " +
                                      std::to_string(fs::file_size("a.zarvo")) + " bytes in [0-9.]+ seconds\n"));
}

TEST_F(ZarvoCreate, LeavesNothingAfterASignal) {
    WriteFile("in/large", Bytes("r40000000"));
    const Heard heard = Zarvo({"create", "-l12", "-b64K", "a.zarvo", "in"}, {.signal = SIGINT});
    EXPECT_EQ(1, heard.status);
    EXPECT_THAT(heard.error, testing::MatchesRegex("zarvo: ended by SIGINT after [0-9]+ bytes; no archive is made\n"));
    EXPECT_EQ(1, std::distance(fs::directory_iterator("."), {})); // the input
}

TEST_F(ZarvoCreate, SaysThatItReplacesThePartOfAKilledRun) {
    WriteFile(".a.zarvo.zarvo-part", "part");
    EXPECT_EQ((Heard{0, "", "zarvo: a.zarvo: a part that an earlier run has left is replaced\n"}),
              Create({"a.zarvo", "in"}));
}

} // namespace
