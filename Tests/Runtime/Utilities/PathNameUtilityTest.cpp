#include "Runtime/Utilities/PathNameUtility.h"

#include <gtest/gtest.h>

#include <string>

static std::string Text(core::string_ref view) { return std::string(view.data(), view.size()); }

TEST(PathNameUtility, JoinsWithOneSeparator) {
    struct {
        const char *base, *tail, *joined;
    } const kCases[] = {
        {.base = "a/", .tail = "/b", .joined = "a/b"}, {.base = "a", .tail = "b", .joined = "a/b"},
        {.base = "a/", .tail = "b", .joined = "a/b"},  {.base = "a", .tail = "/b", .joined = "a/b"},
        {.base = "", .tail = "b", .joined = "b"},      {.base = "a", .tail = "", .joined = "a"},
        {.base = "a/", .tail = "/", .joined = "a/"},   {.base = "a/", .tail = "//b", .joined = "a//b"},
    };
    for (const auto& c : kCases) {
        core::string out;
        AppendPathNameImpl(c.base, c.tail, '/', out);
        EXPECT_STREQ(c.joined, out.c_str()) << c.base << " and " << c.tail;
    }
}

TEST(PathNameUtility, JoinsAConstantUpToItsNul) {
    EXPECT_STREQ("a/b", AppendPathName(core::string("a"), "b\0rest").c_str());
}

TEST(PathNameUtility, TakesPathsApart) {
    struct {
        const char *path, *parent, *last, *extension;
    } const kCases[] = {
        {.path = "/a/b/", .parent = "/a", .last = "", .extension = ""},
        {.path = "a//b", .parent = "a", .last = "b", .extension = ""},
        {.path = "//a", .parent = "/", .last = "a", .extension = ""},
        {.path = "a", .parent = "", .last = "a", .extension = ""},
        {.path = "//", .parent = "", .last = "", .extension = ""},
        {.path = ".x", .parent = "", .last = ".x", .extension = "x"},
        {.path = "a.b/c", .parent = "a.b", .last = "c", .extension = ""},
        {.path = "x/a.t.gz", .parent = "x", .last = "a.t.gz", .extension = "gz"},
    };
    for (const auto& c : kCases) {
        EXPECT_EQ(c.parent, Text(DeleteLastPathNameComponent(c.path))) << c.path;
        EXPECT_EQ(c.last, Text(GetLastPathNameComponent(c.path))) << c.path;
        EXPECT_EQ(c.extension, Text(GetPathNameExtension(c.path))) << c.path;
    }
}

TEST(PathNameUtility, SkipsAPrefixAndItsSeparators) {
    struct {
        const char *path, *prefix;
        bool atStart;
        ComparisonType comparison;
        const char* rest;
    } const kCases[] = {
        {.path = "/r///x", .prefix = "/r/", .atStart = true, .comparison = kCaseSensitive, .rest = "x"},
        {.path = "/r/x", .prefix = "/R", .atStart = true, .comparison = kCaseSensitive, .rest = "/r/x"},
        {.path = "/R/x", .prefix = "/r", .atStart = true, .comparison = kCaseInsensitive, .rest = "x"},
        {.path = "/a/r", .prefix = "/r", .atStart = true, .comparison = kCaseSensitive, .rest = "/a/r"},
        {.path = "/a/R/x", .prefix = "/r", .atStart = false, .comparison = kCaseSensitive, .rest = "a/R/x"},
        {.path = "/a/R/x", .prefix = "/r", .atStart = false, .comparison = kCaseInsensitive, .rest = "x"},
    };
    for (const auto& c : kCases)
        EXPECT_EQ(c.rest, Text(SkipPathPrefix(c.path, c.prefix, c.atStart, c.comparison))) << c.path << " " << c.prefix;
}
