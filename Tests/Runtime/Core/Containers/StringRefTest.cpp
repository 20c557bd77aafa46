#include "Runtime/Core/Containers/StringRef.h"

#include <gtest/gtest.h>
#include <vector>

TEST(StringRef, BehavesAsItsTwinOnEveryShortText) {
    std::vector<std::string> texts{""};
    for (size_t i = 0; texts.size() < 156; ++i) // all of up to 3 characters
        for (const char character : {'\0', 'a', 'b', 'c', '\xC4'})
            texts.push_back(texts[i] + character);
    for (const std::string& a : texts)
        for (const std::string& b : texts) {
            SCOPED_TRACE(testing::PrintToString(a) + " and " + testing::PrintToString(b));
            const core::string_ref ours(a.empty() ? nullptr : a.data(), a.size()), other(b.data(), b.size());
            std::string upper = b;
            std::replace(upper.begin(), upper.end(), 'b', 'B');
            ASSERT_EQ(std::pair(ours == other, ours < other), std::pair(a == b, a < b));
            ASSERT_TRUE((ours.compare(b.c_str()) <=> 0) == (a.compare(b.c_str()) <=> 0));
            ASSERT_TRUE((ours.compare(upper.c_str(), kCaseInsensitive) <=> 0) == (a.compare(b.c_str()) <=> 0));
            ASSERT_TRUE(ours.starts_with(other) == a.starts_with(b) && ours.rfind(b[0]) == a.rfind(b[0]));
            ASSERT_EQ(ours.starts_with({upper.data(), upper.size()}, kCaseInsensitive), a.starts_with(b));
            for (const size_t pos : {size_t{0}, size_t{1}, size_t{3}, ~size_t{0}}) { // the last and a size wrap
                ASSERT_TRUE(ours.find(other, pos) == a.find(b, pos) && ours.find(b[0], pos) == a.find(b[0], pos));
                ASSERT_EQ(ours.find_case_insensitive(upper.data(), pos, b.size()), b.empty() ? pos : a.find(b, pos));
            }
        }
    EXPECT_LT(core::string_ref("").compare(core::string_ref("", size_t{1} << 32)), 0); // only the lengths are looked at
    char copy[] = "####";
    EXPECT_TRUE(strcpy_truncate(copy, "abc", 3, 3) == 2 && memcmp(copy, "ab\0#", 4) == 0);
}

TEST(StringRef, OnlyTheTypeOneIgnoresCase) {
    struct Case {
        int type;
        int difference;
        bool startsWith;
    };
    constexpr Case kCases[] = {
        {.type = 0, .difference = 'A' - 'a', .startsWith = false},
        {.type = 1, .difference = 0, .startsWith = true},
        {.type = 2, .difference = 'A' - 'a', .startsWith = false},
        {.type = -1, .difference = 'A' - 'a', .startsWith = false},
    };
    for (const Case& row : kCases) {
        SCOPED_TRACE(row.type);
        const auto type = static_cast<ComparisonType>(row.type);
        EXPECT_EQ(row.difference, core::string_ref("A").compare("a", type));
        EXPECT_EQ(row.startsWith, core::string_ref("A").starts_with("a", type));
    }
}
