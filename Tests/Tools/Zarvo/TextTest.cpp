#include "Tools/Zarvo/Text.h"

#include "Tools/Zarvo/Arguments.h"
#include "Tools/Zarvo/Progress.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

namespace {

// How many of a text's bytes are broken, as they are replaced.
size_t CountReplaced(const std::string& text) {
    const std::string replaced = ReplaceBrokenUtf8(text);
    size_t count = 0;
    for (size_t at = replaced.find("\xEF\xBF\xBD"); at != std::string::npos; at = replaced.find("\xEF\xBF\xBD", at + 1))
        ++count;
    return count;
}

TEST(ZarvoText, ReplacesEachByteOfBrokenUtf8) {
    const std::pair<std::string, size_t> kCases[] = {
        {"", 0},
        {"a\x7F\xC2\x80\xDF\xBF", 0},
        {"\xE0\xA0\x80\xED\x9F\xBF\xEE\x80\x80\xF0\x90\x80\x80\xF4\x8F\xBF\xBF", 0},
        {"\x80", 1},
        {"\xC1\x80", 2},         // longer than it needs to be
        {"\xE0\x9F\xBF", 3},     // the same
        {"\xF0\x8F\xBF\xBF", 4}, // the same
        {"\xED\xA0\x80", 3},     // a surrogate
        {"\xF4\x90\x80\x80", 4}, // past the last character
        {"\xF5\x80\x80\x80", 4},
        {"\xE2\x82", 2}, // cut short
        {"\xE2\x82"
         "a",
         2},
        {"\xF0\x90\x80\xC3\xA4", 3},
    };
    for (const auto& [text, count] : kCases) {
        EXPECT_EQ(count, CountReplaced(text)) << text;
        EXPECT_EQ(count == 0, IsUtf8(text)) << text;
    }
}

// nlohmann-json throws on the first byte that it can't take.
TEST(ZarvoText, IsTakenByTheJsonWriterAfterwards) {
    for (unsigned first = 0; first < 0x10000; ++first) {
        const std::string text = {static_cast<char>(first >> 8), static_cast<char>(first), '\x80', '\xBF'};
        EXPECT_NO_THROW((void)nlohmann::json(ReplaceBrokenUtf8(text)).dump()) << first;
        if (IsUtf8(text)) continue;
        EXPECT_ANY_THROW((void)nlohmann::json(text).dump()) << first;
    }
}

TEST(ZarvoText, Base64FillsUpTheLastGroup) {
    const std::pair<const char*, const char*> kCases[] = {
        {"", ""}, {"f", "Zg=="}, {"fo", "Zm8="}, {"foo", "Zm9v"}, {"\xFF\xFE\xFD\xFC", "//79/A=="}};
    for (const auto& [bytes, encoded] : kCases)
        EXPECT_EQ(encoded, EncodeBase64(bytes));
}

TEST(ZarvoText, SizesHaveUnitsOf1024) {
    EXPECT_EQ(1u, ParseSize("1"));
    EXPECT_EQ(3u << 20, ParseSize("3M"));
    EXPECT_EQ(17'179'869'183ull << 30, ParseSize("17179869183G"));
    for (const char* const text :
         {"", "0", "K", "1KB", "1k", "-1", "+1", " 1", "1.5M", "17179869184G", "18446744073709551616"})
        EXPECT_EQ(std::nullopt, ParseSize(text)) << text;
}

TEST(ZarvoText, DescribesAnyProgress) {
    const struct {
        const char* what;
        Amount done = {}, total = {};
        double seconds;
        Prelude prelude = {};
        const char* text;
    } kCases[] = {
        {.what = "in the middle",
         .done = {.bytes = 512, .files = 1},
         .total = {.bytes = 2'048, .files = 4},
         .seconds = 2,
         .text = " 25%  512 bytes of 2.0 KiB, 1 of 4 files, 256 bytes/s, 0:06 left"},
        {.what = "at the start",
         .total = {.files = 1},
         .seconds = 0,
         .text = "  0%  0 bytes of 0 bytes, 0 of 1 files, 0 bytes/s, ? left"},
        {.what = "hardly begun",
         .done = {.bytes = 1},
         .total = {.bytes = UINT64_MAX, .files = 1},
         .seconds = 10,
         .text = "  0%  1 bytes of 16.0 EiB, 0 of 1 files, 0 bytes/s, ? left"},
        {.what = "of a run that counts no files",
         .done = {.bytes = 1 << 20},
         .total = {.bytes = 2 << 20},
         .seconds = 1,
         .text = " 50%  1.0 MiB of 2.0 MiB, 1.0 MiB/s, 0:01 left"},
        {.what = "of empty files",
         .done = {.files = 1'000},
         .total = {.files = 4'000},
         .seconds = 10,
         .text = " 25%  0 bytes of 0 bytes, 1000 of 4000 files, 0 bytes/s, 0:30 left"},
        {.what = "of files that cost more than their bytes",
         .done = {.bytes = 9, .files = 1},
         .total = {.bytes = 9, .files = 11},
         .seconds = 9,
         .text = "100%  9 bytes of 9 bytes, 1 of 11 files, 1 bytes/s, 1:30 left"},
        {.what = "after many empty files",
         .done = {.bytes = 1 << 20, .files = 50'000},
         .total = {.bytes = 4 << 20, .files = 50'003},
         .seconds = 12,
         .prelude = {.files = 50'000, .seconds = 2},
         .text = " 25%  1.0 MiB of 4.0 MiB, 50000 of 50003 files, 85.3 KiB/s, 0:30 left"},
        {.what = "among empty files",
         .done = {.files = 1'000},
         .total = {.bytes = 1, .files = 1'001},
         .seconds = 1,
         .prelude = {.files = 1'000, .seconds = 1},
         .text = "  0%  0 bytes of 1 bytes, 1000 of 1001 files, 0 bytes/s, ? left"},
    };
    for (const auto& row : kCases)
        EXPECT_EQ(row.text, DescribeProgress(row.done, row.total, row.seconds, row.prelude)) << row.what;
}

} // namespace
