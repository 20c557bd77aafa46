#include "Runtime/Core/Containers/String.h"

#include <csignal>
#include <gtest/gtest.h>
#include <random>

using core::string;

namespace {

constexpr size_t kRefused = size_t{1} << 60; // more characters than there is memory for

int ModeByte(const string& text) { return reinterpret_cast<const UInt8*>(&text)[31]; }

// The content, the NUL after it, and a mode byte that says where the characters are.
void ExpectHolds(const std::string& content, const string& text) {
    EXPECT_EQ(content, std::string(text.begin(), text.end()));
    EXPECT_EQ('\0', text.c_str()[text.size()]);
    const bool isInline = text.data() == reinterpret_cast<const char*>(&text);
    if (isInline)
        EXPECT_EQ(31 - text.size(), static_cast<size_t>(ModeByte(text)));
    else
        EXPECT_LE(64, ModeByte(text));
}

enum Mode { kInline, kHeap, kExternal };

// A string in that mode, on the heap without room left. An external one borrows content.
string MakeString(Mode mode, const std::string& content) {
    if (mode == kExternal) return string::wrap(content.c_str());
    string text;
    if (mode == kHeap && text.grow(content.size()) == nullptr) ADD_FAILURE() << "memory is refused";
    text = content.c_str();
    return text;
}

// A row of the growth rules: what a string of a size becomes when so many characters are added, or asked room for.
struct Growth {
    Mode mode;
    size_t size;
    size_t count;
    size_t capacity;
    int modeByte;

    friend void PrintTo(const Growth& row, std::ostream* out) {
        constexpr const char* kNames[] = {"inline", "heap", "external"};
        *out << kNames[row.mode] << " text of " << row.size << ", count " << row.count;
    }
};

} // namespace

TEST(String, AppendingMakesRoomByTheRule) {
    constexpr Growth kCases[] = {
        {.mode = kInline, .size = 0, .count = 31, .capacity = 31, .modeByte = 0},
        {.mode = kInline, .size = 31, .count = 1, .capacity = 62, .modeByte = 64},
        {.mode = kInline, .size = 10, .count = 53, .capacity = 63, .modeByte = 64 | 21},
        {.mode = kHeap, .size = 100, .count = 1, .capacity = 200, .modeByte = 64 | 31},
        {.mode = kHeap, .size = 100, .count = 150, .capacity = 250, .modeByte = 64 | 31},
        {.mode = kExternal, .size = 20, .count = 11, .capacity = 31, .modeByte = 0},
        {.mode = kExternal, .size = 20, .count = 12, .capacity = 32, .modeByte = 64 | 31},
        {.mode = kExternal, .size = 40, .count = 0, .capacity = 0, .modeByte = 128 | 31},
    };
    for (const Growth& row : kCases) {
        SCOPED_TRACE(testing::PrintToString(row));
        const std::string content(row.size, 'a');
        const std::string tail(row.count, '+');
        string text = MakeString(row.mode, content);
        text += tail.c_str();
        ExpectHolds(content + tail, text);
        EXPECT_EQ(row.capacity, text.capacity());
        EXPECT_EQ(row.modeByte, ModeByte(text));
    }
}

TEST(String, GrowingMakesTheRoomAskedFor) {
    constexpr Growth kCases[] = {
        {.mode = kInline, .size = 5, .count = 32, .capacity = 32, .modeByte = 64 | 26},
        {.mode = kHeap, .size = 40, .count = 41, .capacity = 41, .modeByte = 64 | 31},
        {.mode = kExternal, .size = 5, .count = 31, .capacity = 31, .modeByte = 26},
        {.mode = kExternal, .size = 40, .count = 33, .capacity = 40, .modeByte = 64 | 31},
    };
    for (const Growth& row : kCases) {
        SCOPED_TRACE(testing::PrintToString(row));
        const std::string content(row.size, 'a');
        string text = MakeString(row.mode, content);
        const char* const room = text.grow(row.count);
        EXPECT_EQ(text.data(), room);
        ExpectHolds(content, text);
        EXPECT_EQ(row.capacity, text.capacity());
        EXPECT_EQ(row.modeByte, ModeByte(text));
    }
}

TEST(String, RefusedGrowthChangesNothing) {
    for (const Mode mode : {kInline, kHeap, kExternal})
        for (const size_t count : {kRefused, string::npos}) { // npos and the NUL after it wrap to 0
            SCOPED_TRACE(testing::Message() << "mode " << mode << ", count " << count);
            const std::string content("text");
            string text = MakeString(mode, content);
            const int modeByte = ModeByte(text);
            EXPECT_EQ(nullptr, text.grow(count));
            ExpectHolds(content, text);
            EXPECT_EQ(modeByte, ModeByte(text));
        }
}

TEST(String, RefusedTextEndsTheProcess) {
    const core::string_ref text("", kRefused); // never read
    string target("text");
    EXPECT_EXIT(target += text, testing::KilledBySignal(SIGABRT), "");
    EXPECT_EXIT(target = text, testing::KilledBySignal(SIGABRT), "");
    EXPECT_EXIT(string{text}, testing::KilledBySignal(SIGABRT), "");
}

TEST(String, BehavesAsItsTwinUnderRandomEdits) {
    const std::string lent = "a text whose parts are not alike, with 0123456789 and 9876543210, and still some more";
    for (unsigned seed = 0; seed < 200; ++seed) {
        std::mt19937 random(seed);
        string ours(kMemLabelFileSystem);
        std::string twin;
        for (int step = 0; step < 100; ++step) {
            const size_t edit = random() % 9;
            SCOPED_TRACE(testing::Message() << "seed " << seed << ", step " << step << ", edit " << edit);
            const size_t from = random() % (twin.size() + 1);
            const size_t count = random() % (twin.size() - from + 1);
            const std::string other = lent.substr(random() % 50, 1 + random() % 44);
            switch (edit) {
            case 0:
                ours = string(other.c_str(), kMemLabelFileSystem);
                twin = other;
                break;
            case 1:
                ours = string(other.c_str(), kMemLabelGeneral);
                twin = other;
                break;
            case 2:
                ours = string::wrap(lent.c_str() + count % 50);
                twin = lent.substr(count % 50);
                break;
            case 3:
                ours.append(ours.data() + from, count);
                twin += twin.substr(from, count);
                break;
            case 4:
                ours.assign(ours.data() + from, count);
                twin = twin.substr(from, count);
                break;
            case 5:
                ours = ours + other.c_str();
                twin += other;
                break;
            case 6:
                ours.truncate(from);
                ours += 'c';
                twin.resize(from);
                twin += 'c';
                break;
            case 7:
                ours = string(static_cast<const string&>(ours));
                ours = static_cast<string&&>(ours);
                break;
            default:
                ours.clear();
                ours += other.c_str();
                ours[0] = 'X';
                twin = other;
                twin[0] = 'X';
                break;
            }
            ExpectHolds(twin, ours);
            ASSERT_EQ(kMemLabelFileSystem, ours.get_memory_label().identifier);
            if (HasFailure()) return;
        }
    }
}

TEST(String, MoveHandsOverTheBufferBetweenEqualLabels) {
    const std::string lent(40, 'x');
    struct Case {
        const char* name;
        string source;
        bool isHandedOver;
    };
    Case cases[] = {
        {.name = "inline", .source = string("short", kMemLabelFileSystem), .isHandedOver = false},
        {.name = "heap", .source = string(lent.c_str(), kMemLabelFileSystem), .isHandedOver = true},
        {.name = "heap of another label", .source = string(lent.c_str(), kMemLabelGeneral), .isHandedOver = false},
        {.name = "external", .source = string::wrap(lent.c_str(), kMemLabelGeneral), .isHandedOver = true},
    };
    for (Case& row : cases) {
        SCOPED_TRACE(row.name);
        const std::string content(row.source.c_str());
        const char* const buffer = row.source.data();
        string target("a text that does not fit into the string itself", kMemLabelFileSystem);
        target = std::move(row.source);
        ExpectHolds(content, target);
        EXPECT_EQ(row.isHandedOver, target.data() == buffer);
        ExpectHolds("", row.source);
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
