#include "Runtime/Core/Containers/DynamicBlockArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Tests/Support/ConsoleCapture.h"

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

TEST(DynamicArray, ForeignMemoryIsUsedInPlaceThenCopiedByThePolicyAndLeftAlone) {
    for (const auto& [policy, capacity] : {std::pair(kResizeDouble, 10), {kResizeExact, 6}}) {
        UInt16 foreign[] = {1, 2, 3, 4, 5};
        dynamic_array<UInt16> array(kMemLabelFileSystem);
        array.resize_initialized(7);
        array = dynamic_array<UInt16>::wrap(foreign, 5, 9, kMemLabelGeneral);
        EXPECT_TRUE(array.data() == foreign && StateOf(array) == State(5, 5, false));
        array.resize_buffer_nocheck(6, policy);
        EXPECT_TRUE(array.get_memory_label() == kMemLabelFileSystem && StateOf(array) == State(5, capacity, true));
        EXPECT_EQ(memcmp(array.data(), foreign, sizeof(foreign)), 0);
        array[0] = 0;
        EXPECT_EQ(foreign[0], 1);
    }
}

TEST(DynamicArray, ImpossibleSizesAreReportedAndRefused) {
    const ConsoleCapture console;
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    numbers.push_back(1);
    for (const size_t size : {size_t{1} << 61, size_t{1} << 63}) // 2^61 numbers are 2^64 bytes, which wrap to 0
        EXPECT_FALSE(numbers.resize_initialized(size, kResizeExact) || numbers.resize_uninitialized(size));
    EXPECT_TRUE(StateOf(numbers) == State(1, 1, true) && numbers[0] == 1);
    EXPECT_TRUE(numbers.resize_initialized(2) && numbers[1] == 0); // a later, possible request is served
    const std::string overflow = "Dynamic array capacity overflow: 0x8000000000000000\n";
    EXPECT_EQ(overflow + overflow, console.Text());
}

TEST(DynamicArray, BehavesAsItsTwinUnderRandomEdits) {
    for (unsigned seed = 0; seed < 100; ++seed) {
        std::mt19937 random(seed);
        dynamic_array<core::string> ours(kMemLabelFileSystem), copy(kMemLabelGeneral);
        std::vector<std::string> twin;
        for (int step = 0; step < 100; ++step) {
            const size_t count = random() % 20, edit = random() % (twin.empty() ? 5 : 7);
            size_t capacity = ours.capacity();
            switch (edit) {
            case 0: ours.resize_initialized(count), twin.resize(count); break;
            case 1: ours.reserve(count), capacity = std::max(capacity, count); break;
            case 2: copy = dynamic_array<core::string>(ours), ours = std::move(copy), capacity = twin.size(); break;
            case 3: ours.emplace_back(kLong + 2 * count), twin.emplace_back(kLong + 2 * count); break;
            case 4: ours = static_cast<dynamic_array<core::string>&&>(ours); break;
            case 5: ours.pop_back(), twin.pop_back(); break;
            default: ours.push_back(ours[0]), twin.push_back(std::string(twin[0])); break;
            }
            if (twin.size() > capacity) capacity = std::max(twin.size(), 2 * capacity);
            ASSERT_EQ(State(twin.size(), capacity, capacity != 0), StateOf(ours)) << seed << " " << edit;
            ASSERT_EQ(State(0, 0, false), StateOf(copy));
            for (size_t i = 0; i < twin.size(); ++i)
                ASSERT_TRUE(ours[i] == twin[i].c_str() && ours[i].get_memory_label() == kMemLabelFileSystem) << seed;
        }
    }
}

TEST(DynamicBlockArray, ElementsStayWhereTheyWerePlaced) {
    dynamic_block_array<core::string, 32> texts(kMemLabelFileList);
    std::vector<core::string*> places;
    for (int i = 0; i < 65; ++i)
        places.push_back(&(texts.emplace_back() = kLong)); // the leak checker sees one that stays
    texts.grow(100);                                       // a fourth block, which holds no element yet
    for (size_t i = 0; i < texts.size(); ++i)
        EXPECT_TRUE(places[i] == &texts[i] && texts[i].get_memory_label() == kMemLabelFileList) << i;
    EXPECT_EQ(texts.size(), 65u);
}
