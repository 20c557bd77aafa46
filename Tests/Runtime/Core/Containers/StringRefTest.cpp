#include "Runtime/Core/Containers/StringRef.h"

#include <gtest/gtest.h>
#include <vector>

// All texts of up to 3 characters, of which one is a NUL and one is negative where char is signed.
static std::vector<std::string> MakeShortTexts() {
    std::vector<std::string> texts{""};
    for (size_t i = 0; texts.size() < 156; ++i)
        for (const char character : {'\0', 'a', 'b', 'c', '\xC4'})
            texts.push_back(texts[i] + character);
    return texts;
}

static int Sign(int difference) { return (difference > 0) - (difference < 0); }

TEST(StringRef, BehavesAsItsTwinOnEveryShortText) {
    const std::vector<std::string> texts = MakeShortTexts();
    for (const std::string& a : texts)
        for (const std::string& b : texts) {
            SCOPED_TRACE(testing::PrintToString(a) + " and " + testing::PrintToString(b));
            const core::string_ref ours(a.empty() ? nullptr : a.data(), a.size());
            const core::string_ref other(b.data(), b.size());
            ASSERT_EQ(a == b, ours == other);
            ASSERT_EQ(a < b, ours < other);
            ASSERT_EQ(Sign(a.compare(b.c_str())), Sign(ours.compare(b.c_str())));
            ASSERT_EQ(a.starts_with(b), ours.starts_with(other));
            ASSERT_EQ(a.rfind(b[0]), ours.rfind(b[0]));
            for (const size_t pos : {size_t{0}, size_t{1}, size_t{3}, ~size_t{0}}) { // the last and a size wrap
                ASSERT_EQ(a.find(b, pos), ours.find(other, pos));
                ASSERT_EQ(a.find(b[0], pos), ours.find(b[0], pos));
            }
        }
}

TEST(StringRef, CaseIsIgnoredOnRequest) {
    const std::vector<std::string> texts = MakeShortTexts();
    for (const std::string& a : texts)
        for (const std::string& b : texts) {
            SCOPED_TRACE(testing::PrintToString(a) + " and " + testing::PrintToString(b));
            const core::string_ref ours(a.data(), a.size());
            std::string upper = b;
            std::replace(upper.begin(), upper.end(), 'b', 'B');
            ASSERT_EQ(Sign(a.compare(b.c_str())), Sign(ours.compare(upper.c_str(), kCaseInsensitive)));
            ASSERT_EQ(a.starts_with(b), ours.starts_with({upper.data(), upper.size()}, kCaseInsensitive));
            for (const size_t pos : {size_t{0}, size_t{1}, size_t{3}, ~size_t{0}}) {
                const size_t found = b.empty() ? pos : a.find(b, pos);
                ASSERT_EQ(found, ours.find_case_insensitive(upper.data(), pos, b.size()));
            }
        }
}

TEST(StringRef, LongerTextComesAfterByAnyDifference) {
    // Cut to 32 bits, the difference of the sizes would be 0. An empty common part is not read.
    EXPECT_LT(core::string_ref("").compare(core::string_ref("", size_t{1} << 32)), 0);
}

TEST(StringRef, TruncatedCopyEndsInANul) {
    char copy[] = "####";
    EXPECT_EQ(2, strcpy_truncate(copy, "abc", 3, 3));
    EXPECT_EQ(std::string("ab\0#", 4), std::string(copy, 4));
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
