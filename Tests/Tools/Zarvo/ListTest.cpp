#include "Tests/Tools/Zarvo/ZarvoTest.h"

namespace {

class ZarvoList : public ZarvoTest {};

TEST_F(ZarvoList, PrintsEveryEntryInTheArchivesOrder) {
    MakeArchive("a.zarvo", Archive("b:x a| a/c:yy b:zz end/|"));
    EXPECT_EQ((Heard{0, "b\na/\na/c\nb\nend/\n", ""}), Zarvo({"list", "a.zarvo"}));
}

TEST_F(ZarvoList, AlignsTheColumnsOfLong) {
    MakeArchive("a.zarvo", Archive("a:r1200 d| d/b:x"));
    EXPECT_EQ((Heard{0, "f 1200    0 a\nd    0 1200 d/\nf    1 1200 d/b\n", ""}), Zarvo({"list", "-l", "a.zarvo"}));
}

TEST_F(ZarvoList, PrintsAnObjectALineAsJson) {
    MakeArchive("a.zarvo", Archive("a:xyz d|"));
    EXPECT_EQ((Heard{0,
                     "{\"path\":\"a\",\"kind\":\"file\",\"size\":3,\"offset\":0,\"flags\":0}\n"
                     "{\"path\":\"d\",\"kind\":\"folder\",\"size\":0,\"offset\":3,\"flags\":1}\n",
                     ""}),
              Zarvo({"list", "--json", "a.zarvo"}));
}

TEST_F(ZarvoList, KeepsAllBytesOfBrokenUtf8InJson) {
    MakeArchive("a.zarvo", {.entries = {{.path = "\xC3\xA4\n\xE2\x82\xFF"}}});
    EXPECT_EQ((Heard{0,
                     "{\"path\":\"\xC3\xA4\\n\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD\",\"pathBytes\":\"w6QK4oL/\","
                     "\"kind\":\"file\",\"size\":0,\"offset\":0,\"flags\":0}\n",
                     ""}),
              Zarvo({"list", "--json", "a.zarvo"}));
}

TEST_F(ZarvoList, EscapesNamesOnTerminalsOnly) {
    MakeArchive("a.zarvo", {.entries = {{.path = "a\n\x1b[31m\xFF\\\xC3\xA4\xC2\x9B"}}});
    EXPECT_EQ((Heard{0, "a\\n\\x1b[31m\\xff\\\xC3\xA4\\xc2\\x9b\n", ""}),
              Zarvo({"list", "a.zarvo"}, {.isOutputTerminal = true}));
    EXPECT_EQ((Heard{0, "a\n\x1b[31m\xFF\\\xC3\xA4\xC2\x9B\n", ""}), Zarvo({"list", "a.zarvo"}));
}

TEST_F(ZarvoList, StaysJsonOnTerminals) {
    MakeArchive("a.zarvo", {.entries = {{.path = "\x7F\xC2\x9B\xC3\xA4"}}});
    EXPECT_EQ(
        (Heard{0, "{\"path\":\"\\u007f\\u009b\xC3\xA4\",\"kind\":\"file\",\"size\":0,\"offset\":0,\"flags\":0}\n", ""}),
        Zarvo({"list", "--json", "a.zarvo"}, {.isOutputTerminal = true}));
}

TEST_F(ZarvoList, PrintsWhatPatternsMatch) {
    MakeArchive("a.zarvo", Archive("road/of/one.txt:x road/two:x d| d/e:x d/[x]:x top:x"));
    const struct {
        std::vector<std::string> patterns;
        Heard heard;
    } kCases[] = {
        {{"top"}, {0, "top\n", ""}},
        {{"road"}, {0, "road/of/one.txt\nroad/two\n", ""}},
        {{"**/*e"}, {0, "d/e\n", ""}},
        {{"top", "d/e"}, {0, "d/e\ntop\n", ""}},
        {{"top", "t?p", "t*"}, {0, "top\n", ""}}, // each has matched
        {{""}, {0, "road/of/one.txt\nroad/two\nd/\nd/e\nd/[x]\ntop\n", ""}},
        {{"no\n", "top", "top"}, {1, "top\n", "zarvo: a.zarvo: no\\n: matches nothing\n"}},
    };
    for (const auto& [patterns, heard] : kCases) {
        std::vector<std::string> arguments = {"list", "a.zarvo"};
        arguments.insert(arguments.end(), patterns.begin(), patterns.end());
        EXPECT_EQ(heard, Zarvo(arguments)) << patterns[0];
    }
}

TEST_F(ZarvoList, TakesPatternsFromFilesToo) {
    MakeArchive("a.zarvo", {.entries = {{.path = "a"}, {.path = "b"}, {.path = "c\nd"}}});
    WriteFile("names", "a\nb");
    WriteFile("nothing", "");
    const struct {
        std::vector<std::string> arguments;
        std::string input;
        Heard heard;
    } kCases[] = {
        {{"list", "--files-from", "names", "a.zarvo"}, "", {0, "a\nb\n", ""}},
        {{"list", "--files-from=-", "a.zarvo"}, "b\n", {0, "b\n", ""}},
        {{"list", "-0", "--files-from=-", "a.zarvo"}, std::string("c\nd\0", 4), {0, std::string("c\nd\0", 4), ""}},
        {{"list", "--files-from=nothing", "a.zarvo"}, "", {0, "", ""}},
        {{"list", "--files-from=none", "a.zarvo", "a"}, "", {1, "a\n", "zarvo: none: No such file or directory\n"}},
    };
    for (const auto& [arguments, input, heard] : kCases)
        EXPECT_EQ(heard, Zarvo(arguments, {.input = input})) << arguments[1];
}

TEST_F(ZarvoList, SaysWhyAnArchiveCannotBeOpened) {
    WriteFile("text", "no archive");
    const struct {
        const char* archive;
        const char* error;
    } kCases[] = {
        {"missing\x1b", "zarvo: missing\\x1b: No such file or directory\n"},
        {"", "zarvo: '': No such file or directory\n"},
        {"text", "zarvo: text: not a Zarvo archive\n"},
        {"-", "zarvo: -: an archive must be a file that can be read at any place (a file of this name is ./-)\n"},
    };
    for (const auto& [archive, error] : kCases)
        EXPECT_EQ((Heard{2, "", error}), Zarvo({"list", archive})) << archive;
}

} // namespace
