#include "Runtime/Core/Containers/DynamicBlockArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Tests/Support/ConsoleCapture.h"

#include <csignal>
#include <gtest/gtest.h>
#include <random>
#include <vector>

namespace {

using Strings = dynamic_array<core::string>;
constexpr const char* kLong = "a text that does not fit into the string itself";

// What an array says of its buffer.
struct Shape {
    size_t size;
    size_t capacity;
    bool isOwner;

    friend bool operator==(const Shape&, const Shape&) = default;
    friend void PrintTo(const Shape& shape, std::ostream* out) {
        *out << "size " << shape.size << ", capacity " << shape.capacity << (shape.isOwner ? ", owned" : ", not owned");
    }
};

Shape ShapeOf(const auto& array) {
    return {.size = array.size(), .capacity = array.capacity(), .isOwner = array.owns_data()};
}

std::vector<std::string> TextsOf(const Strings& strings) {
    std::vector<std::string> texts;
    for (const core::string& text : strings)
        texts.push_back(text.c_str());
    return texts;
}

constexpr Shape kWithoutBuffer = {.size = 0, .capacity = 0, .isOwner = false};

} // namespace

TEST(DynamicArray, MovedForeignMemoryIsUsedInPlace) {
    UInt16 foreign[] = {1, 2, 3, 4, 5};
    dynamic_array<UInt16> array(kMemLabelFileSystem);
    ASSERT_TRUE(array.resize_initialized(7)); // a buffer that is freed
    auto source = dynamic_array<UInt16>::wrap(foreign, 5, 9, kMemLabelGeneral);
    array = std::move(source);
    EXPECT_EQ(foreign, array.data());
    EXPECT_EQ((Shape{.size = 5, .capacity = 5, .isOwner = false}), ShapeOf(array));
    EXPECT_EQ(kMemLabelFileSystem, array.get_memory_label().identifier);
    EXPECT_EQ(kWithoutBuffer, ShapeOf(source));
}

TEST(DynamicArray, FirstGrowthCopiesForeignMemory) {
    struct Case {
        ResizePolicy policy;
        size_t capacity;
    };
    for (const Case& row :
         {Case{.policy = kResizeDouble, .capacity = 10}, Case{.policy = kResizeExact, .capacity = 6}}) {
        UInt16 foreign[] = {1, 2, 3, 4, 5};
        auto array = dynamic_array<UInt16>::wrap(foreign, 5, 5, kMemLabelGeneral);
        ASSERT_TRUE(array.resize_buffer_nocheck(6, row.policy));
        EXPECT_EQ((Shape{.size = 5, .capacity = row.capacity, .isOwner = true}), ShapeOf(array));
        EXPECT_EQ((std::vector<UInt16>{1, 2, 3, 4, 5}), std::vector<UInt16>(array.begin(), array.end()));
        array[0] = 0;
        EXPECT_EQ(1, foreign[0]);
    }
}

TEST(DynamicArray, DoublingGivesTheRequestWhenThatIsMore) {
    dynamic_array<UInt8> array(kMemLabelGeneral);
    ASSERT_TRUE(array.resize_uninitialized(5));
    ASSERT_TRUE(array.resize_buffer_nocheck(11, kResizeDouble));
    EXPECT_EQ(11, array.capacity());
}

TEST(DynamicArray, RefusedSizeChangesNothing) {
    const ConsoleCapture console;
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    numbers.push_back(1);
    // 2^61 numbers are 2^64 bytes, which wrap to 0.
    for (const size_t size : {size_t{1} << 61, size_t{1} << 62, size_t{1} << 63}) {
        SCOPED_TRACE(size);
        EXPECT_FALSE(numbers.resize_initialized(size, kResizeExact));
        EXPECT_FALSE(numbers.resize_uninitialized(size, kResizeExact));
        EXPECT_FALSE(numbers.reserve(size));
        EXPECT_EQ((Shape{.size = 1, .capacity = 1, .isOwner = true}), ShapeOf(numbers));
        EXPECT_EQ(1, numbers[0]);
    }
    EXPECT_TRUE(numbers.resize_uninitialized(2));
}

TEST(DynamicArray, CapacityBeyondSignedCountsIsReported) {
    const ConsoleCapture console;
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    numbers.push_back(1);
    EXPECT_FALSE(numbers.reserve((size_t{1} << 63) - 1));
    EXPECT_EQ("", console.Text());
    EXPECT_FALSE(numbers.reserve(size_t{1} << 63));
    EXPECT_EQ("Dynamic array capacity overflow: 0x8000000000000000\n", console.Text());
}

TEST(DynamicArray, RefusedCopyEndsTheProcess) {
    constexpr size_t kRefused = size_t{1} << 60;
    UInt8 byte = 0;
    const auto array = dynamic_array<UInt8>::wrap(&byte, kRefused, kRefused, kMemLabelGeneral);
    EXPECT_EXIT(dynamic_array<UInt8>{array}, testing::KilledBySignal(SIGABRT), "");
}

TEST(DynamicArray, RefusedElementEndsTheProcess) {
    constexpr size_t kRefused = size_t{1} << 60;
    UInt8 byte = 0;
    auto array = dynamic_array<UInt8>::wrap(&byte, kRefused, kRefused, kMemLabelGeneral);
    EXPECT_EXIT(array.push_back(1), testing::KilledBySignal(SIGABRT), "");
}

TEST(DynamicArray, TriedElementIsAddedOrRefused) {
    dynamic_array<UInt64> numbers(kMemLabelGeneral);
    for (UInt64 number = 0; number < 3; ++number)
        EXPECT_TRUE(numbers.try_push_back(number));
    EXPECT_EQ((Shape{.size = 3, .capacity = 4, .isOwner = true}), ShapeOf(numbers));
    EXPECT_EQ(2, numbers[2]);

    constexpr size_t kRefused = size_t{1} << 60;
    UInt8 byte = 0;
    auto array = dynamic_array<UInt8>::wrap(&byte, kRefused, kRefused, kMemLabelGeneral);
    EXPECT_FALSE(array.try_push_back(1));
    EXPECT_EQ((Shape{.size = kRefused, .capacity = kRefused, .isOwner = false}), ShapeOf(array));
}

TEST(DynamicArray, BehavesAsItsTwinUnderRandomEdits) {
    for (unsigned seed = 0; seed < 100; ++seed) {
        std::mt19937 random(seed);
        Strings ours(kMemLabelFileSystem);
        std::vector<std::string> twin;
        size_t capacity = 0; // that the growth rules give
        for (int step = 0; step < 100; ++step) {
            const size_t count = random() % 20;
            const std::string text(kLong + 2 * count);
            const size_t edit = random() % (twin.empty() ? 6 : 9);
            SCOPED_TRACE(testing::Message() << "seed " << seed << ", step " << step << ", edit " << edit);
            switch (edit) {
            case 0:
                ASSERT_TRUE(ours.resize_initialized(count));
                twin.resize(count);
                break;
            case 1:
                ASSERT_TRUE(ours.reserve(count));
                capacity = std::max(capacity, count);
                break;
            case 2: {
                Strings copy(ours);
                Strings moved(std::move(copy));
                ours = std::move(moved);
                capacity = twin.size();
                break;
            }
            case 3:
                ours.emplace_back(text.c_str());
                twin.push_back(text);
                break;
            case 4: ours = static_cast<Strings&&>(ours); break;
            case 5:
                if (count >= 2) break; // not too often
                ours.clear();
                twin.clear();
                break;
            case 6:
                ours.pop_back();
                twin.pop_back();
                break;
            case 7:
                ours.push_back(ours.back());
                twin.push_back(std::string(twin.back()));
                break;
            default:
                ours.truncate(twin.size() / 2);
                twin.resize(twin.size() / 2);
                break;
            }
            if (twin.size() > capacity) capacity = std::max(twin.size(), 2 * capacity);
            ASSERT_EQ((Shape{.size = twin.size(), .capacity = capacity, .isOwner = capacity != 0}), ShapeOf(ours));
            ASSERT_EQ(twin, TextsOf(ours));
            for (const core::string& element : ours)
                ASSERT_EQ(kMemLabelFileSystem, element.get_memory_label().identifier);
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
        array.truncate(3);
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
    ASSERT_TRUE(array.resize_buffer_nocheck(0, kResizeExact));
    EXPECT_EQ((Shape{.size = 0, .capacity = 0, .isOwner = true}), ShapeOf(array));
    EXPECT_EQ(nullptr, array.data());
}

TEST(DynamicBlockArray, ElementsStayWhereTheyWerePlaced) {
    dynamic_block_array<core::string, 32> texts(kMemLabelFileList);
    const core::string* places[65];
    for (const core::string*& place : places) {
        core::string& element = texts.emplace_back();
        element = kLong; // the leak checker sees one that is not destroyed
        place = &element;
    }
    texts.grow(100); // a fourth block, which holds no element yet
    EXPECT_EQ(65, texts.size());
    for (size_t i = 0; i < 65; ++i)
        EXPECT_EQ(places[i], &texts[i]) << i;
}

TEST(DynamicBlockArray, ElementsGetTheLabelOfTheArray) {
    dynamic_block_array<core::string, 32> texts(kMemLabelFileList);
    EXPECT_EQ(kMemLabelFileList, texts.emplace_back().get_memory_label().identifier);
}

TEST(DynamicBlockArray, RefusedBlockEndsTheProcess) {
    dynamic_block_array<UInt64, size_t{1} << 60> numbers(kMemLabelFileList); // in blocks of 2^63 bytes
    EXPECT_EXIT(numbers.emplace_back(), testing::KilledBySignal(SIGABRT), "");
}
