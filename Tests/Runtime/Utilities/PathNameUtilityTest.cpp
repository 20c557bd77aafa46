#include "Runtime/Utilities/PathNameUtility.h"

#include <gtest/gtest.h>

#include <string>

using core::string_ref;

static std::string ToStd(string_ref text) { return std::string(text.begin(), text.end()); }

TEST(PathNameUtility, JoinedPathsHaveOneSeparatorAtTheSeam) {
    const char* const kCases[][3] = {{"a/", "/b", "a/b"}, {"a", "b", "a/b"},     {"a/", "b", "a/b"},
                                     {"a", "/b", "a/b"},  {"", "b", "b"},        {"a", "", "a"},
                                     {"a/", "/", "a/"},   {"a/", "//b", "a//b"}, {"a", "/", "a/"}};
    for (const auto& [base, tail, joined] : kCases) {
        core::string out(kMemLabelGeneral);
        AppendPathNameImpl(base, tail, '/', out);
        EXPECT_EQ(joined, ToStd(out)) << base << " and " << tail;
    }
    EXPECT_EQ("folder/name", ToStd(AppendPathName(core::string("folder"), "name\0rest")));
}

TEST(PathNameUtility, PathsAreTakenApartIntoParentLastComponentAndExtension) {
    const char* const kCases[][4] = {
        {"/a/b/", "/a", "", ""}, {"a//b", "a", "b", ""}, {"//a", "/", "a", ""},     {"a", "", "a", ""},
        {"//", "", "", ""},      {"", "", "", ""},       {"a.b/c", "a.b", "c", ""}, {"x/a.t.gz", "x", "a.t.gz", "gz"},
        {"n.", "", "n.", ""},    {".x", "", ".x", "x"}};
    for (const auto& [path, parent, last, extension] : kCases) {
        EXPECT_EQ(parent, ToStd(DeleteLastPathNameComponent(path))) << path;
        EXPECT_EQ(last, ToStd(GetLastPathNameComponent(path))) << path;
        EXPECT_EQ(extension, ToStd(GetPathNameExtension(path))) << path;
    }
    EXPECT_EQ("b", ToStd(GetPathNameExtension(string_ref("a.bc/d", 3)))); // a view need not end in a NUL
}

TEST(PathNameUtility, APrefixIsSkippedWithTheSeparatorsThatFollow) {
    const ComparisonType exact = kCaseSensitive, any = kCaseInsensitive;
    const std::tuple<const char*, const char*, bool, ComparisonType, const char*> kCases[] = {
        {"/root///x", "/root/", true, exact, "x"},    {"/root/x", "/ROOT", true, exact, "/root/x"},
        {"/Root/x", "/rOOT", true, any, "x"},         {"/rootless", "/root", true, exact, "less"},
        {"/a/root", "/root", true, exact, "/a/root"}, {"/a/root/x", "/root", false, exact, "x"},
        {"/a/R/x", "/r", false, exact, "a/R/x"},      {"/a/R/x", "/r", false, any, "x"}};
    for (const auto& [path, prefix, atStart, comparison, rest] : kCases)
        EXPECT_EQ(rest, ToStd(SkipPathPrefix(path, prefix, atStart, comparison))) << path << " less " << prefix;
}
