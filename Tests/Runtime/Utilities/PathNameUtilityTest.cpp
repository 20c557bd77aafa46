#include "Runtime/Utilities/PathNameUtility.h"

#include <gtest/gtest.h>

TEST(PathNameUtility, PathsAreJoinedTakenApartAndRidOfPrefixes) {
    const char* const kJoins[][3] = {{"a/", "/b", "a/b"}, {"a", "b", "a/b"}, {"a/", "b", "a/b"}, {"a", "/b", "a/b"},
                                     {"", "b", "b"},      {"a", "", "a"},    {"a/", "/", "a/"},  {"a/", "//b", "a//b"}};
    for (const auto& [base, tail, joined] : kJoins) {
        core::string out;
        AppendPathNameImpl(base, tail, '/', out);
        EXPECT_TRUE(out == joined) << base << " and " << tail;
    }
    EXPECT_TRUE(AppendPathName(core::string("a"), "b\0rest") == "a/b");
    const char* const kPaths[][4] = {
        {"/a/b/", "/a", "", ""}, {"a//b", "a", "b", ""}, {"//a", "/", "a", ""},     {"a", "", "a", ""},
        {"//", "", "", ""},      {".x", "", ".x", "x"},  {"a.b/c", "a.b", "c", ""}, {"x/a.t.gz", "x", "a.t.gz", "gz"}};
    for (const auto& [path, parent, last, extension] : kPaths) {
        EXPECT_TRUE(DeleteLastPathNameComponent(path) == parent && GetLastPathNameComponent(path) == last) << path;
        EXPECT_TRUE(GetPathNameExtension(path) == extension) << path;
    }
    // At the start only (s), in any case (i).
    const char* const kPrefixes[][4] = {{"/r///x", "/r/", "s-", "x"},    {"/r/x", "/R", "s-", "/r/x"},
                                        {"/R/x", "/r", "si", "x"},       {"/a/r", "/r", "s-", "/a/r"},
                                        {"/a/R/x", "/r", "--", "a/R/x"}, {"/a/R/x", "/r", "-i", "x"}};
    for (const auto& [path, prefix, how, rest] : kPrefixes)
        EXPECT_TRUE(SkipPathPrefix(path, prefix, *how == 's', ComparisonType(how[1] == 'i')) == rest) << path;
}
