#include "Runtime/Core/Containers/String.h"

#include <gtest/gtest.h>
#include <random>

using core::string;

enum Mode { kInline, kHeap, kExternal };

static UInt8 ModeByte(const string& text) { return reinterpret_cast<const UInt8*>(&text)[31]; }
static Mode GetMode(const string& it) { return ModeByte(it) < 64 ? kInline : ModeByte(it) < 128 ? kHeap : kExternal; }

// content, and what must hold of any string, read from its bytes where they say it.
static void ExpectText(const std::string& content, const string& text, MemLabelId label = kMemLabelGeneral) {
    EXPECT_EQ(content, std::string(text.begin(), text.end()));
    EXPECT_EQ('\0', text.c_str()[text.size()]);
    EXPECT_EQ(0, memcmp(reinterpret_cast<const char*>(&text) + 32, &label, sizeof(label)));
    EXPECT_EQ(GetMode(text) == kInline, text.data() == reinterpret_cast<const char*>(&text));
    EXPECT_EQ(GetMode(text) == kInline ? 31 - text.size() : ModeByte(text), ModeByte(text));
}

// content in the mode asked for. A heap text has no room left; borrowed content must outlive the string.
static string Make(Mode mode, const std::string& content, MemLabelId label = kMemLabelGeneral) {
    if (mode == kExternal) return string::wrap(content.c_str(), label);
    string text(label);
    if (mode == kHeap) text.grow(32), text.grow(content.size());
    text.assign(content.data(), content.size());
    return text;
}

// How: '+' appends a number of characters, '>' grows to that room. Afterwards: capacity and mode byte.
TEST(String, AppendingAndGrowingMakeTheRoomThatTheRuleGives) {
    using Row = std::tuple<Mode, size_t, char, size_t, size_t, int>;
    for (const auto& [from, size, how, added, capacity, modeByte] :
         {Row(kInline, 0, '+', 31, 31, 0), Row(kInline, 5, '+', 3, 31, 23), Row(kInline, 31, '+', 1, 62, 64),
          Row(kInline, 10, '+', 52, 62, 64 | 21), Row(kInline, 10, '+', 53, 63, 64 | 21),
          Row(kHeap, 100, '+', 1, 200, 95), Row(kHeap, 100, '+', 150, 250, 95), Row(kExternal, 20, '+', 11, 31, 0),
          Row(kExternal, 20, '+', 12, 32, 95), Row(kExternal, 40, '+', 0, 0, 159), Row(kExternal, 0, '+', 0, 31, 31),
          Row(kInline, 5, '>', 31, 31, 26), Row(kInline, 5, '>', 32, 32, 64 | 26), Row(kHeap, 40, '>', 1, 40, 95),
          Row(kHeap, 40, '>', 41, 41, 95), Row(kExternal, 40, '>', 0, 0, 159), Row(kExternal, 5, '>', 31, 31, 26),
          Row(kExternal, 5, '>', 32, 32, 95), Row(kExternal, 40, '>', 33, 40, 95)}) {
        SCOPED_TRACE(testing::Message() << "mode " << from << ", " << size << how << added);
        const std::string content(size, 'a'), tail(how == '+' ? added : 0, '+');
        string text = Make(from, content);
        EXPECT_TRUE(how == '+' || text.grow(added) == text.data());
        ExpectText(content + tail, text.append(tail.data(), tail.size()));
        EXPECT_EQ(std::pair(capacity, modeByte), std::pair(text.capacity(), int{ModeByte(text)}));
    }
    const string ten("0123456789", kMemLabelGeneral); // a sum is allocated once, under the left side's label
    for (const auto& [right, capacity] : {std::pair(1u, 31u), {21u, 31u}, {22u, 32u}, {90u, 100u}})
        EXPECT_EQ(capacity, (ten + std::string(right, 'b').c_str()).capacity()) << right;
    EXPECT_EQ(ten.get_memory_label(), (ten + "").get_memory_label());
}

TEST(String, MovingHandsTheBufferOverBetweenEqualLabelsOnly) {
    for (const Mode from : {kInline, kHeap, kExternal})
        for (const Mode to : {kInline, kHeap, kExternal})
            for (const MemLabelId label : {kMemLabelGeneral, kMemLabelFileSystem}) {
                SCOPED_TRACE(testing::Message() << "mode " << from << " to " << to << ", label " << label.identifier);
                const std::string content(from == kInline ? 31 : 50, 'a'), old(20, 'b');
                string source = Make(from, content), target = Make(to, old, label);
                const char* const buffer = source.data();
                target = std::move(source);
                const bool isHandedOver = from == kExternal || (from == kHeap && label == kMemLabelGeneral);
                EXPECT_EQ(isHandedOver, target.data() == buffer);
                EXPECT_TRUE(!isHandedOver || ModeByte(target) == (from == kHeap ? 95 : 159));
                EXPECT_TRUE(GetMode(target) == from && GetMode(source) == kInline);
                ExpectText(content, target, label);
                ExpectText("", source);
            }
}

TEST(String, BehavesAsItsTwinUnderRandomEdits) {
    const char* const text = "a text whose parts are not alike, with 0123456789 and 9876543210, and still some more";
    const std::string lent = text;
    for (unsigned seed = 0; seed < 200; ++seed) {
        std::mt19937 random(seed);
        const auto below = [&](size_t limit) { return static_cast<size_t>(random() % limit); };
        string ours(kMemLabelFileSystem);
        std::string twin;
        for (int step = 0; step < 100; ++step) {
            const size_t from = below(twin.size() + 1), count = below(twin.size() - from + 1), edit = below(12);
            const std::string other = lent.substr(below(lent.size()), 1 + below(44));
            SCOPED_TRACE(testing::Message() << "seed " << seed << ", step " << step << ", edit " << edit);
            switch (edit) {
            case 0: ours.append(ours.data() + from, count), twin += twin.substr(from, count); break;
            case 1: ours.assign(ours.data() + from, count), twin = twin.substr(from, count); break;
            case 2:
                ours = string::wrap(lent.c_str() + from % lent.size()), twin = lent.substr(from % lent.size());
                break;
            case 3: ours = string(other.c_str(), kMemLabelFileSystem), twin = other; break; // moved, equal labels
            case 4: ours = string(other.c_str(), kMemLabelGeneral), twin = other; break;    // and not
            case 5: ours = ours + other.c_str(), twin += other; break;
            case 6: ours.resize(from), ours += 'c', twin.resize(from), twin += 'c'; break;
            case 7: ours.reserve(from), ours += core::string_ref(other.c_str()), twin += other; break;
            case 8: ours.resize(twin.size() + 5), twin.resize(twin.size() + 5); break;
            case 9: ours = string(ours); break; // a copy, moved back
            case 10: ours = static_cast<const string&>(ours), ours = static_cast<string&&>(ours); break;
            default: ours = other.c_str(), ours[0] = 'X', twin = other, twin[0] = 'X'; break;
            }
            ExpectText(twin, ours, kMemLabelFileSystem);
            if (HasFailure()) return;
            if (twin.size() > 400) ours.clear(), twin.clear();
        }
    }
    EXPECT_EQ(text, lent);
}
