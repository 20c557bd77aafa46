#include "Runtime/Core/Containers/StringRef.h"

#include <gtest/gtest.h>
#include <string>

using core::string_ref;
constexpr size_t npos = string_ref::npos;

TEST(StringRef, ComparisonGivesTheDifferenceOfTheFirstDifferingBytesThenOfTheLengths) {
    using Row = std::tuple<const char*, size_t, const char*, int, int>;
    for (const auto& [view, size, text, exact, anyCase] :
         {Row(nullptr, 0, "", 0, 0), Row("", 0, "a", -97, -97), Row("", 0, "A", -65, -97), Row("ab", 2, "a", 98, 98),
          Row("aB", 2, "a", 66, 98), Row("a", 1, "aB", -66, -98), Row("Abc", 3, "aBC", -32, 0),
          Row("ab\0c", 4, "ab", 1, 1), Row("a\0", 2, "ab", -98, -98), Row("\xC4", 1, "\xE4", -32, -32),
          Row("\xFF", 1, "", 255, 255), Row("[", 1, "a", -6, -6)}) {
        EXPECT_EQ(exact, string_ref(view, size).compare(text)) << view << " and " << text;
        EXPECT_EQ(anyCase, string_ref(view, size).compare(text, kCaseInsensitive)) << view << " and " << text;
    }
    const string_ref kAscending[] = {{}, {"\0", 1}, "A", "a", {"a\0", 2}, "ab", "a\x80", "b", "\xFF"};
    for (const string_ref& a : kAscending)
        for (const string_ref& b : kAscending)
            EXPECT_TRUE((&a < &b) == (a < b) && (&a == &b) == (a == b)) << &a - kAscending << ", " << &b - kAscending;
    // Only lengths are looked at here: the difference must not be cut to 32 bits.
    EXPECT_LT(string_ref("").compare(string_ref("", size_t{1} << 32)), 0);
}

// In the row before the last pos + count wraps.
TEST(StringRef, SearchesGiveTheFirstMatchOrNpos) {
    const string_ref view("xAbaB");
    using Row = std::tuple<const char*, size_t, size_t, size_t, size_t>;
    for (const auto& [text, pos, count, anyCase, exact] :
         {Row("ab", 0, 2, 1, npos), Row("ab", 2, 2, 3, npos), Row("aB", 0, 2, 1, 3), Row("b", 5, 1, npos, npos),
          Row("", 5, 0, 5, 5), Row("xabab", 0, 5, 0, npos), Row("xababx", 0, 6, npos, npos),
          Row("xababx", npos, 6, npos, npos), Row("", 6, 0, 6, npos)}) {
        EXPECT_EQ(anyCase, view.find_case_insensitive(text, pos, count)) << text << " from " << pos;
        EXPECT_EQ(exact, view.find(string_ref(text, count), pos)) << text << " from " << pos;
        EXPECT_EQ(anyCase == 0 || count == 0, view.starts_with({text, count}, kCaseInsensitive)) << text;
    }
    EXPECT_TRUE(view.starts_with("xA") && view.starts_with({}) && !view.starts_with("xa"));
    EXPECT_TRUE(view.find('a', 1) == 3 && view.find('a', 4) == npos && view.find('a', npos) == npos);
    EXPECT_TRUE(view.rfind('B') == 4 && view.rfind('x') == 0 && view.rfind('c') == npos);
    EXPECT_TRUE(view.substr(2, 2) == "ba" && view.substr(6, 1).empty());
}

TEST(StringRef, TruncatingCopyTerminatesWithinTheDestination) {
    using Row = std::tuple<size_t, size_t, size_t, std::string>;
    for (const auto& [dstSize, srcLen, copied, result] :
         {Row(4, 1, 1, {"a\0##", 4}), Row(3, 9, 2, {"ab\0#", 4}), Row(1, 9, 0, {"\0###", 4}), Row(0, 9, 0, "####")}) {
        std::string dst = "####";
        EXPECT_EQ(copied, strcpy_truncate(dst.data(), "abcdefghi", dstSize, srcLen));
        EXPECT_EQ(result, dst) << dstSize << ", " << srcLen;
    }
}
