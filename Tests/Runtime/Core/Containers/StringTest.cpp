#include "Runtime/Core/Containers/String.h"

#include <gtest/gtest.h>
#include <random>

using core::string;

static int ModeByte(const string& text) { return reinterpret_cast<const UInt8*>(&text)[31]; }

// Whether a string has the content, a NUL behind it, and a mode byte that says truly where it lies.
static bool Is(const std::string& content, const string& text) {
    const bool isInline = text.data() == reinterpret_cast<const char*>(&text);
    return content == std::string(text.begin(), text.end()) && text.c_str()[text.size()] == '\0' &&
           (isInline ? static_cast<size_t>(ModeByte(text)) == 31 - text.size() : ModeByte(text) >= 64);
}

// Inline, on the heap (without room left) or external; '+' appends a number of characters, '>' grows to that room.
TEST(String, AppendingAndGrowingMakeTheRoomThatTheRuleGives) {
    using Row = std::tuple<char, size_t, char, size_t, size_t, int>;
    for (const auto& [from, size, how, added, capacity, modeByte] :
         {Row('i', 0, '+', 31, 31, 0), Row('i', 31, '+', 1, 62, 64), Row('i', 10, '+', 53, 63, 64 | 21),
          Row('h', 100, '+', 1, 200, 95), Row('h', 100, '+', 150, 250, 95), Row('e', 20, '+', 11, 31, 0),
          Row('e', 20, '+', 12, 32, 95), Row('e', 40, '+', 0, 0, 159), Row('i', 5, '>', 32, 32, 64 | 26),
          Row('h', 40, '>', 41, 41, 95), Row('e', 5, '>', 31, 31, 26), Row('e', 40, '>', 33, 40, 95)}) {
        const std::string content(size, 'a'), tail(how == '+' ? added : 0, '+');
        string text = from == 'e' ? string::wrap(content.c_str()) : string();
        if (from != 'e') text.grow(size), text = content.c_str();
        for (const size_t tooMany : {size_t{1} << 60, string::npos})
            EXPECT_EQ(nullptr, text.grow(tooMany)); // refused, and nothing has changed
        EXPECT_TRUE(how == '+' || text.grow(added) == text.data());
        EXPECT_TRUE(Is(content + tail, text += tail.c_str())) << from << size << how << added;
        EXPECT_EQ(std::pair(capacity, modeByte), std::pair(text.capacity(), ModeByte(text))) << from << size << how;
    }
}

TEST(String, BehavesAsItsTwinUnderRandomEdits) {
    const std::string lent = "a text whose parts are not alike, with 0123456789 and 9876543210, and still some more";
    for (unsigned seed = 0; seed < 200; ++seed) {
        std::mt19937 random(seed);
        string ours(kMemLabelFileSystem);
        std::string twin;
        const auto take = [&](string source, bool isHandedOver) { // which depends on the labels
            const char* const buffer = source.data();
            ours = std::move(source);
            EXPECT_TRUE(Is("", source) && (ours.data() == buffer) == isHandedOver) << seed;
        };
        for (int step = 0; step < 100; ++step) {
            const size_t from = random() % (twin.size() + 1), count = random() % (twin.size() - from + 1);
            const std::string other = lent.substr(random() % 50, 1 + random() % 44);
            switch (random() % 11) {
            case 0: take(string(other.c_str(), kMemLabelFileSystem), other.size() > 31), twin = other; break;
            case 1: take(string(other.c_str(), kMemLabelGeneral), false), twin = other; break;
            case 2: take(string::wrap(lent.c_str() + count % 50), true), twin = lent.substr(count % 50); break;
            case 3: ours.append(ours.data() + from, count), twin += twin.substr(from, count); break;
            case 4: ours.assign(ours.data() + from, count), twin = twin.substr(from, count); break;
            case 5: ours = ours + other.c_str(), twin += other; break;
            case 6: ours.resize(from), ours += 'c', twin.resize(from), twin += 'c'; break;
            case 7: ours.reserve(from), ours += core::string_ref(other.c_str()), twin += other; break;
            case 8: ours.resize(twin.size() + 5), twin.resize(twin.size() + 5); break;
            case 9: ours = string(static_cast<const string&>(ours)), ours = static_cast<string&&>(ours); break;
            default: ours.clear(), ours += other.c_str(), ours[0] = 'X', twin = other, twin[0] = 'X'; break;
            }
            ASSERT_TRUE(Is(twin, ours) && ours.get_memory_label() == kMemLabelFileSystem) << seed << ", " << step;
        }
    }
}

TEST(String, CopiesAndSumsHaveTheLabelOfTheirSource) {
    const string source("text", kMemLabelFileSystem);
    EXPECT_EQ(kMemLabelFileSystem, string(source).get_memory_label().identifier);
    EXPECT_EQ(kMemLabelFileSystem, (source + "tail").get_memory_label().identifier);
}

TEST(String, SumAllocatesOnceExactlyWhatItNeeds) {
    struct Case {
        size_t left, right, capacity;
    };
    constexpr Case kCases[] = {
        {.left = 1, .right = 30, .capacity = 31}, // inline
        {.left = 1, .right = 31, .capacity = 32},
        {.left = 20, .right = 20, .capacity = 40},
        {.left = 40, .right = 1, .capacity = 41},
    };
    for (const Case& row : kCases) {
        const std::string left(row.left, 'l'), right(row.right, 'r');
        const string sum = string(left.c_str()) + right.c_str();
        EXPECT_EQ(left + right, sum.c_str());
        EXPECT_EQ(row.capacity, sum.capacity()) << row.left << " and " << row.right;
    }
}

TEST(String, WrappedEmptyTextIsInline) {
    const char text[] = "";
    const string wrapped = string::wrap(text);
    EXPECT_EQ(31, ModeByte(wrapped));
    EXPECT_NE(text, wrapped.data());
}
