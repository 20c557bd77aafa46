#include "Library/include/zarvo.hpp"

#include <gtest/gtest.h>

#include <ctime>

namespace {

bool Matches(std::string_view pattern, std::string_view path) {
    zarvo::patterns patterns;
    EXPECT_EQ(std::string_view(""), patterns.add(pattern).text());
    return patterns.match(path);
}

struct PatternCase {
    std::string_view pattern;
    std::vector<std::string_view> matched = {};
    std::vector<std::string_view> notMatched = {};
};

void ExpectMatches(const std::vector<PatternCase>& cases) {
    for (const PatternCase& row : cases) {
        for (std::string_view path : row.matched)
            EXPECT_EQ(true, Matches(row.pattern, path)) << "'" << row.pattern << "' and '" << path << "'";
        for (std::string_view path : row.notMatched)
            EXPECT_EQ(false, Matches(row.pattern, path)) << "'" << row.pattern << "' and '" << path << "'";
    }
}

} // namespace

TEST(Patterns, LiteralPathTakesItselfAndAllBelow) {
    ExpectMatches({
        {.pattern = "a/b", .matched = {"a/b", "a/b/c", "/a/b", "a\\b", "./a//b"}, .notMatched = {"a", "a/bc", "x/a/b"}},
        {.pattern = "/a/b/", .matched = {"a/b", "a/b/c"}, .notMatched = {"a/bc"}},
        {.pattern = "./a", .matched = {"a", "a/b"}, .notMatched = {"ab"}},
        {.pattern = "a\\b", .matched = {"a\\b", "a/b", "ab"}, .notMatched = {"a"}},
        {.pattern = "a[1]", .matched = {"a[1]", "a1", "a[1]/x"}, .notMatched = {"a[", "a"}},
        {.pattern = "..", .matched = {"..", "../x"}, .notMatched = {"a"}},
    });
}

TEST(Patterns, EmptyPatternTakesEverything) {
    ExpectMatches({
        {.pattern = "", .matched = {"a", "a/b", "", "/", ".hidden"}},
        {.pattern = "/", .matched = {"a", "a/b", ""}},
        {.pattern = "./", .matched = {"a"}},
    });
}

TEST(Patterns, StarAndQuestionMarkStopAtSlashes) {
    ExpectMatches({
        {.pattern = "*", .matched = {"a", ".a", "a/b"}},
        {.pattern = "*.txt", .matched = {"a.txt", ".txt", "a.txt/b"}, .notMatched = {"a/b.txt", "a.txt2"}},
        {.pattern = "a/*/c", .matched = {"a/b/c", "a/.b/c", "a/b/c/d"}, .notMatched = {"a/c", "a/b/b/c"}},
        {.pattern = "*a*b*", .matched = {"ab", "xaxbx", "aab/x"}, .notMatched = {"ba", "a/b"}},
        {.pattern = "a*a*b", .matched = {"aab", "aaaab", "acaab"}, .notMatched = {"ab", "aa/b"}},
        {.pattern = "?", .matched = {"a", "\xC3\xA4", "\xFF", "a/b"}, .notMatched = {"ab", ""}},
        {.pattern = "a?b",
         .matched = {"axb", "a\xE2\x82\xAC"
                            "b"},
         .notMatched = {"a/b", "ab"}},
    });
}

TEST(Patterns, DoubleStarTakesSlashesToo) {
    ExpectMatches({
        {.pattern = "**", .matched = {"a", "a/b"}},
        {.pattern = "**/x", .matched = {"x", "a/x", "a/b/x", "a/x/y"}, .notMatched = {"ax", "a/ax"}},
        {.pattern = "a/**/x", .matched = {"a/x", "a/b/x", "a/b/c/x"}, .notMatched = {"x", "ax", "a/bx"}},
        {.pattern = "a/**", .matched = {"a/b", "a/b/c"}, .notMatched = {"a", "b/a"}},
        {.pattern = "a**z", .matched = {"az", "a/b/z", "a1z"}, .notMatched = {"a/b/y"}},
        {.pattern = "**/*.c", .matched = {"a.c", "a/b.c", "a/b.c/d"}, .notMatched = {"a.cc"}},
        {.pattern = "**a*b", .matched = {"x/ab", "a/acb"}, .notMatched = {"x/a/b"}},
    });
}

TEST(Patterns, SetTakesOneOfItsCharacters) {
    ExpectMatches({
        {.pattern = "[abc]", .matched = {"a", "c"}, .notMatched = {"d", "ab"}},
        {.pattern = "[a-c]x", .matched = {"bx"}, .notMatched = {"dx"}},
        {.pattern = "[!a-c]", .matched = {"d"}, .notMatched = {"a", "/"}},
        {.pattern = "[^a]", .matched = {"b"}, .notMatched = {"a"}},
        {.pattern = "[]a]", .matched = {"]", "a"}, .notMatched = {"b"}},
        {.pattern = "[a-]", .matched = {"a", "-"}, .notMatched = {"b"}},
        {.pattern = "[\\]]", .matched = {"]"}, .notMatched = {"\\"}},
        {.pattern = "a[/]b", .notMatched = {"a/b"}},
        {.pattern = "a[!x]b", .matched = {"ayb"}, .notMatched = {"a/b"}},
        {.pattern = "[\xC3\xA0-\xC3\xBC]", .matched = {"\xC3\xA4"}, .notMatched = {"\xC3\xA0\xC3\xA0", "z"}},
        {.pattern = "[", .matched = {"["}, .notMatched = {"a"}},
    });
}

TEST(Patterns, BackslashTakesTheNextCharacterAsItIs) {
    ExpectMatches({
        {.pattern = "\\*", .matched = {"*"}, .notMatched = {"a"}},
        {.pattern = "a\\?", .matched = {"a?", "a/?"}, .notMatched = {"ab"}},
        {.pattern = "\\a*", .matched = {"ab"}, .notMatched = {"b"}},
    });
}

TEST(Patterns, GlobMatchesTheStoredTextToo) {
    ExpectMatches({
        {.pattern = "a\\\\*", .matched = {"a\\b"}, .notMatched = {"a/b"}},
        {.pattern = "a//?", .matched = {"a//b"}, .notMatched = {"a/b"}},
    });
}

// Ten thousand patterns share one table, which grows as they are added.
TEST(Patterns, FindEachOfManyLiterals) {
    zarvo::patterns patterns;
    for (int number = 0; number < 10'000; ++number)
        EXPECT_EQ(std::string_view(""), patterns.add("folder/" + std::to_string(number)).text());
    for (int number = 0; number < 20'000; ++number)
        EXPECT_EQ(number < 10'000, patterns.match("folder/" + std::to_string(number) + "/x")) << number;
}

// A path of many components costs its length, not its length for each folder above it.
TEST(Patterns, DeepPathIsMatchedInOneGo) {
    std::string deep = "x";
    for (int level = 0; level < 300'000; ++level)
        deep += "/x";
    const clock_t start = clock();
    EXPECT_EQ(false, Matches("**/y", deep));
    EXPECT_EQ(true, Matches("**/y", deep + "/y/z"));
    EXPECT_LE((clock() - start) / CLOCKS_PER_SEC, 20);
}
