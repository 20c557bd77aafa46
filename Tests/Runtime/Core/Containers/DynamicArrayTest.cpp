#include "Runtime/Core/Containers/DynamicBlockArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Tests/Support/ConsoleCapture.h"

#include <csignal>
#include <gtest/gtest.h>
#include <random>
#include <vector>

using Strings = dynamic_array<core::string>;
constexpr const char* kLong = "a text that does not fit into the string itself";

// Whether an array stands so: size, capacity, and whether it owns its buffer.
static bool Is(const auto& array, size_t size, size_t capacity, bool isOwner) {
    return array.size() == size && array.capacity() == capacity && array.owns_data() == isOwner;
}

TEST(DynamicArray, ForeignMemoryIsUsedInPlaceThenCopiedByThePolicyAndLeftAlone) {
    for (const auto& [policy, capacity] : {std::pair(kResizeDouble, 10u), {kResizeExact, 6u}}) {
        UInt16 foreign[] = {1, 2, 3, 4, 5};
        dynamic_array<UInt16> array(kMemLabelFileSystem);
        array.resize_initialized(7);
        array = dynamic_array<UInt16>::wrap(foreign, 5, 9, kMemLabelGeneral);
        EXPECT_TRUE(array.data() == foreign && Is(array, 5, 5, false));
        array.resize_buffer_nocheck(6, policy);
        EXPECT_TRUE(Is(array, 5, capacity, true) && array.get_memory_label() == kMemLabelFileSystem);
        array[0] = 0;
        EXPECT_TRUE(foreign[0] == 1 && memcmp(&array[1], foreign + 1, sizeof(foreign) - 2) == 0);
    }
}

TEST(DynamicArray, ImpossibleSizesAreReportedAndRefused) {
    const ConsoleCapture console;
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    numbers.push_back(1);
    for (const size_t size : {size_t{1} << 61, size_t{1} << 63}) // 2^61 numbers are 2^64 bytes, which wrap to 0
        EXPECT_FALSE(numbers.resize_initialized(size, kResizeExact) || numbers.resize_uninitialized(size_t{1} << 62));
    EXPECT_TRUE(Is(numbers, 1, 1, true) && numbers[0] == 1 && numbers.resize_uninitialized(2)); // which can be served
    EXPECT_EQ(console.Text(), "Dynamic array capacity overflow: 0x8000000000000000\n");
}

TEST(DynamicArray, BehavesAsItsTwinUnderRandomEdits) {
    for (unsigned seed = 0; seed < 100; ++seed) {
        std::mt19937 random(seed);
        Strings ours(kMemLabelFileSystem);
        std::vector<std::string> twin;
        for (int step = 0; step < 100; ++step) {
            const size_t count = random() % 20, edit = random() % (twin.empty() ? 5 : 7);
            size_t capacity = ours.capacity();
            switch (edit) {
            case 0: ours.resize_initialized(count), twin.resize(count); break;
            case 1: ours.reserve(count), capacity = std::max(capacity, count); break;
            case 2: ours = Strings(static_cast<Strings&&>(Strings(ours))), capacity = twin.size(); break;
            case 3: ours.emplace_back(kLong + 2 * count), twin.emplace_back(kLong + 2 * count); break;
            case 4: count < 2 ? (ours.clear(), twin.clear()) : void(ours = static_cast<Strings&&>(ours)); break;
            case 5: ours.pop_back(), twin.pop_back(); break;
            default: ours.push_back(ours.back()), twin.push_back(std::string(twin.back())); break;
            }
            if (twin.size() > capacity) capacity = std::max(twin.size(), 2 * capacity);
            ASSERT_TRUE(Is(ours, twin.size(), capacity, capacity != 0)) << seed << ", " << edit;
            for (size_t i = 0; i < twin.size(); ++i)
                ASSERT_TRUE(ours[i] == twin[i].c_str() && ours[i].get_memory_label() == kMemLabelFileSystem) << seed;
        }
    }
}

TEST(DynamicArray, PushedElementGetsTheLabelOfTheArray) {
    Strings array(kMemLabelFileSystem);
    array.push_back(core::string(kLong, kMemLabelGeneral));
    EXPECT_EQ(kMemLabelFileSystem, array[0].get_memory_label().identifier);
    EXPECT_EQ(std::string(kLong), array[0].c_str());
}

TEST(DynamicArray, ElementsAreDestroyedInTheirOrder) {
    static std::string destroyed;
    struct Element {
        explicit Element(char elementName = '-') : name(elementName) {}
        ~Element() { destroyed += name; }
        char name;
    };
    {
        dynamic_array<Element> array(kMemLabelGeneral);
        for (const char name : {'a', 'b', 'c', 'd', 'e'})
            array.emplace_back(name);
        array.resize_initialized(3);
        EXPECT_EQ("de", destroyed);
        destroyed.clear();
    }
    EXPECT_EQ("abc", destroyed);
}

TEST(DynamicArray, TakingOverTheLargestForeignSizeIsReported) {
    struct Case {
        size_t size;
        const char* report;
    };
    constexpr size_t kLargest = (size_t{1} << 63) - 1;
    constexpr Case kCases[] = {
        {.size = kLargest - 1, .report = ""},
        {.size = kLargest, .report = "Assertion failed on expression: 'm_size < max_size()'\n"},
    };
    for (const Case& row : kCases) {
        const ConsoleCapture console;
        UInt8 byte = 0;
        dynamic_array<UInt8> array(kMemLabelGeneral);
        array = dynamic_array<UInt8>::wrap(&byte, row.size, row.size, kMemLabelGeneral);
        EXPECT_EQ(row.report, console.Text());
        EXPECT_EQ(row.size, array.size());
    }
}

TEST(DynamicArray, ForeignMemoryResizedToNothingIsLetGo) {
    UInt8 byte = 0;
    auto array = dynamic_array<UInt8>::wrap(&byte, 0, 1, kMemLabelGeneral);
    array.resize_buffer_nocheck(0, kResizeExact);
    EXPECT_TRUE(array.owns_data());
    EXPECT_EQ(0, array.capacity());
    EXPECT_EQ(nullptr, array.data());
}

TEST(DynamicBlockArray, ElementsStayWhereTheyWerePlaced) {
    dynamic_block_array<core::string, 32> texts(kMemLabelFileList);
    core::string* places[65];
    for (core::string*& place : places)
        place = &(texts.emplace_back() = kLong); // the leak checker sees one that stays
    texts.grow(100);                             // a fourth block, which holds no element yet
    for (size_t i = 0; i < 65; ++i)
        EXPECT_TRUE(texts.size() == 65 && places[i] == &texts[i]) << i;
    EXPECT_EQ(texts[64].get_memory_label(), kMemLabelFileList);
}

TEST(DynamicBlockArray, RefusedBlockEndsTheProcess) {
    dynamic_block_array<UInt64, size_t{1} << 60> numbers(kMemLabelFileList); // in blocks of 2^63 bytes
    EXPECT_EXIT(numbers.emplace_back(), testing::KilledBySignal(SIGABRT), "");
}
