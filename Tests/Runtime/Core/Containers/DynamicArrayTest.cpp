#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/DynamicBlockArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Tests/Support/ConsoleCapture.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <random>
#include <vector>

constexpr const char* kLong = "a text that does not fit into the string itself";

// Where an array stands: size, capacity, and whether it owns its buffer.
using State = std::tuple<size_t, size_t, bool>;
template <typename T>
static State StateOf(const dynamic_array<T>& array) {
    return {array.size(), array.capacity(), array.owns_data()};
}

TEST(DynamicArray, BufferIsResizedByThePolicyAndForeignMemoryLeftAlone) {
    using Row = std::tuple<size_t, size_t, ResizePolicy, size_t>;
    for (const auto& [capacity, request, policy, result] :
         {Row(5, 6, kResizeDouble, 10), Row(5, 11, kResizeDouble, 11), Row(5, 6, kResizeExact, 6),
          Row(5, 2, kResizeDouble, 10), Row(0, 1, kResizeDouble, 1), Row(5, 0, kResizeExact, 0),
          Row(5, 1, kResizeExact, 1)}) {
        UInt16 foreign[5] = {10, 11, 12, 13, 14};
        const size_t size = std::min<size_t>(capacity, 2);
        auto wrapped = dynamic_array<UInt16>::wrap(foreign, size, capacity, kMemLabelGeneral);
        dynamic_array<UInt16> owned(wrapped);
        EXPECT_EQ(State(size, size, size != 0), StateOf(owned));
        owned.reserve(capacity);
        for (dynamic_array<UInt16>* array : {&wrapped, &owned}) {
            array->resize_buffer_nocheck(request, policy);
            EXPECT_EQ(State(size, result, true), StateOf(*array)) << capacity << " to " << request << ", " << policy;
            for (size_t i = 0; i < std::min(result, size); ++i)
                EXPECT_EQ(10 + i, std::exchange((*array)[i], UInt16{0}));
        }
        EXPECT_EQ(10, foreign[0]);
    }
}

TEST(DynamicArray, MoveTakesTheBufferAndKeepsTheLabel) {
    for (const bool isOwned : {true, false}) {
        UInt8 foreign[4] = {1, 2, 3, 4};
        auto source = dynamic_array<UInt8>::wrap(foreign, 3, 4, kMemLabelGeneral);
        if (isOwned) source.resize_buffer_nocheck(10, kResizeExact);
        UInt8* const buffer = source.data();
        dynamic_array<UInt8> target(kMemLabelFileSystem);
        target.resize_initialized(7);
        target = std::move(source);
        target = static_cast<dynamic_array<UInt8>&&>(target);
        EXPECT_EQ(State(3, isOwned ? 10 : 3, isOwned), StateOf(target));
        EXPECT_EQ(State(0, 0, false), StateOf(source));
        EXPECT_TRUE(target.data() == buffer && !source.data() && target.get_memory_label() == kMemLabelFileSystem);
    }
}

TEST(DynamicArray, BytesAreClearedWhenThatIsAskedForAndImpossibleSizesReportedAndRefused) {
    ConsoleCapture console;
    dynamic_array<UInt8> bytes(kMemLabelGeneral);
    bytes.reserve(4);
    memset(bytes.data(), 0xAA, 4);
    bytes.resize_uninitialized(2);
    bytes.resize_initialized(4);
    EXPECT_EQ(0, memcmp(bytes.data(), "\xAA\xAA\0", 4));
    EXPECT_FALSE(bytes.resize_uninitialized(size_t{1} << 63, kResizeExact));
    EXPECT_EQ(State(4, 4, true), StateOf(bytes));
    EXPECT_EQ(0, memcmp(bytes.data(), "\xAA\xAA\0", 4));

    // 2^61 x 8 bytes wraps to 0, which must not free the buffer and promise room.
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    numbers.push_back(1);
    EXPECT_FALSE(numbers.resize_initialized(size_t{1} << 61, kResizeExact));
    EXPECT_EQ(State(1, 1, true), StateOf(numbers));
    EXPECT_TRUE(numbers.resize_uninitialized(3)); // a later, possible request is served
    EXPECT_EQ(State(3, 3, true), StateOf(numbers));

    UInt8 foreign = 0;
    for (const size_t size : {(size_t{1} << 63) - 2, (size_t{1} << 63) - 1})
        bytes = dynamic_array<UInt8>::wrap(&foreign, size, 1, kMemLabelGeneral);
    dynamic_array_detail::dynamic_array_data full{.label = kMemLabelGeneral, .size = ~size_t{0}};
    full.make_room_for_one(1, 1);
    EXPECT_EQ("Dynamic array capacity overflow: 0x8000000000000000\n"
              "Assertion failed on expression: 'm_size < max_size()'\n"
              "Assertion failed on expression: 'newSize > m_size'\n",
              console.Text());
}

TEST(DynamicArray, BehavesAsItsTwinUnderRandomEdits) {
    for (unsigned seed = 0; seed < 100; ++seed) {
        std::mt19937 random(seed);
        dynamic_array<core::string> ours(kMemLabelFileSystem);
        std::vector<std::string> twin;
        size_t capacity = 0;
        const auto room = [&](size_t count, size_t wanted) { capacity = count > capacity ? wanted : capacity; };
        for (int step = 0; step < 100; ++step) {
            const size_t count = random() % 20, edit = random() % (twin.empty() ? 4 : 6), doubled = 2 * capacity;
            switch (edit) {
            case 0: ours.resize_initialized(count), twin.resize(count), room(count, std::max(count, doubled)); break;
            case 1: ours.reserve(count), room(count, count); break;
            case 2: ours = dynamic_array<core::string>(ours), capacity = twin.size(); break; // a copy, moved back
            case 3: ours.emplace_back(kLong + 2 * count), twin.emplace_back(kLong + 2 * count); break;
            case 4: ours.pop_back(), twin.pop_back(); break;
            default: ours.push_back(core::string(twin[0].c_str())), twin.push_back(std::string(twin[0])); break;
            }
            room(twin.size(), std::max<size_t>(1, doubled));
            ASSERT_EQ(State(twin.size(), capacity, capacity != 0), StateOf(ours)) << seed << " " << edit;
            for (size_t i = 0; i < twin.size(); ++i)
                ASSERT_TRUE(ours[i] == twin[i].c_str() && ours[i].get_memory_label() == ours.get_memory_label())
                    << seed;
        }
    }
}

TEST(DynamicBlockArray, ElementsStayWhereTheyWerePlaced) {
    dynamic_block_array<core::string, 32> texts(kMemLabelFileList);
    std::vector<core::string*> places;
    for (size_t i = 0; i < 65; ++i) {
        places.push_back(&texts.emplace_back());
        EXPECT_EQ(MemLabelId(kMemLabelFileList), places[i]->get_memory_label());
        *places[i] = kLong; // the leak checker sees one that stays
    }
    texts.grow(100); // a fourth block, which holds no element yet
    ASSERT_EQ(65u, texts.size());
    for (size_t i = 0; i < 65; ++i) // blocks of 32 lie in one piece
        EXPECT_TRUE(places[i] == &texts[i] && places[i] == places[i / 32 * 32] + i % 32) << i;
}
