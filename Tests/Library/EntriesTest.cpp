#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <functional>

namespace {

// The whole tree, a line an item: its path, "/" after a folder, "*" after an implied one.
std::string Tree(const zarvo::archive& archive) {
    std::string lines;
    const std::function<void(uint64_t)> addChildren = [&](uint64_t folder) {
        uint64_t child = archive.item(folder)->first_child;
        while (child != ZARVO_NO_ITEM) {
            const zarvo_item item = *archive.item(child);
            lines += *archive.item_path(child);
            if (item.kind == ZARVO_FOLDER) lines += "/";
            if (item.is_implied != 0) lines += "*";
            lines += "\n";
            addChildren(child);
            child = item.next_sibling;
        }
    };
    addChildren(ZARVO_ROOT);
    return lines;
}

} // namespace

TEST(Entries, PathHasOneNormalForm) {
    const struct {
        std::string_view path;
        std::string_view normal;
    } cases[] = {
        {"a/b", "a/b"},       {"a\\b", "a/b"},  {"/a//b/", "a/b"},
        {"./a/./b/.", "a/b"}, {".", ""},        {"", ""},
        {"\\", ""},           {"../a", "../a"}, {".a/..b", ".a/..b"},
        {"a", "a"},           {"...", "..."},   {"\\.\\a\\.\\.", "a"},
    };
    for (const auto& row : cases) {
        EXPECT_EQ(row.normal, zarvo::normalize_path(row.path)) << row.path;
        std::string inPlace(row.path);
        inPlace.resize(zarvo_normalize_path(inPlace.data(), inPlace.size(), inPlace.data()));
        EXPECT_EQ(row.normal, inPlace) << "in place: " << row.path;
    }
}

TEST(Entries, TellWhatIsWrongWithTheirPaths) {
    const struct {
        const char* path;
        UInt32 flags;
        int32_t problem;
    } cases[] = {
        {.path = "a/b", .flags = 0, .problem = ZARVO_PROBLEM_NONE},
        {.path = "/a", .flags = 0, .problem = ZARVO_PROBLEM_NONE},
        {.path = "a/", .flags = kFolderEntry, .problem = ZARVO_PROBLEM_NONE},
        {.path = "a/..b", .flags = 0, .problem = ZARVO_PROBLEM_NONE},
        {.path = "a/../b", .flags = 0, .problem = ZARVO_PROBLEM_PARENT},
        {.path = "a\\..\\b", .flags = 0, .problem = ZARVO_PROBLEM_PARENT},
        {.path = "..", .flags = kFolderEntry, .problem = ZARVO_PROBLEM_PARENT},
        {.path = "", .flags = 0, .problem = ZARVO_PROBLEM_EMPTY},
        {.path = "./.", .flags = kFolderEntry, .problem = ZARVO_PROBLEM_EMPTY},
        {.path = "a/", .flags = 0, .problem = ZARVO_PROBLEM_SEPARATOR},
        {.path = "a\\", .flags = 0, .problem = ZARVO_PROBLEM_SEPARATOR},
    };
    ArchiveDescription description;
    for (const auto& row : cases)
        description.entries.push_back({.path = row.path, .flags = row.flags});
    const std::string bytes = BuildArchive(description).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    for (const zarvo::entry entry : archive.entries())
        EXPECT_EQ(cases[entry.index()].problem, entry.problem()) << entry.path();
}

TEST(Entries, AreFoundInWhateverFormTheyAreNamed) {
    const std::string bytes = BuildArchive({.entries = {{.path = "road/of\\one.txt"},
                                                        {.path = "same", .bytes = "first"},
                                                        {.path = "/same", .bytes = "second"},
                                                        {.path = "folder", .flags = kFolderEntry},
                                                        {.path = "folder/x"},
                                                        {.path = "a/../b"}}})
                                  .bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    const uint64_t road = 6; // the first implied folder that is met from the end on
    const struct {
        std::string_view path;
        uint64_t item;
    } cases[] = {
        {"road/of/one.txt", 0}, {"\\road//of/./one.txt", 0}, {"same", 2},      {"folder/", 3},     {"folder/x", 4},
        {"road/of", road},      {"road", road + 1},          {"", ZARVO_ROOT}, {"./", ZARVO_ROOT},
    };
    for (const auto& row : cases) {
        zarvo::result<uint64_t> found = archive.find(row.path);
        EXPECT_EQ(row.item, found ? *found : ZARVO_NO_ITEM) << row.path;
    }
    for (std::string_view path : {"road/o", "road/of/one.txt/x", "b", "a/../b", "a", ".."})
        EXPECT_EQ(ZARVO_ERROR_NOT_FOUND, archive.find(path).error().code()) << path;
}

TEST(Entries, FormATreeInTheArchivesOrder) {
    const std::string bytes = BuildArchive({.entries = {{.path = "b/2"},
                                                        {.path = "a"},
                                                        {.path = "b/1"},
                                                        {.path = "c/d/e/f"},
                                                        {.path = "c", .flags = kFolderEntry},
                                                        {.path = "a"},
                                                        {.path = ".."},
                                                        {.path = "c/d/g"}}})
                                  .bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    EXPECT_EQ("b/*\n"
              "b/2\n"
              "b/1\n"
              "c/\n"
              "c/d/*\n"
              "c/d/e/*\n"
              "c/d/e/f\n"
              "c/d/g\n"
              "a\n",
              Tree(archive));
    EXPECT_EQ(8u + 3u, archive.item_count());
    EXPECT_EQ("", *archive.item_path(ZARVO_ROOT));
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, archive.item_path(ZARVO_NO_ITEM).error().code());
}

// A path of many components, and many paths that share them, cost their length and no more.
TEST(Entries, DeepAndManyPathsAreFound) {
    std::string deep = "x";
    for (int level = 0; level < 20'000; ++level)
        deep += "/x";
    ArchiveDescription description;
    description.entries = {{.path = deep}, {.path = deep + "y"}};
    for (int number = 0; number < 5'000; ++number)
        description.entries.push_back({.path = "f" + std::to_string(number % 700) + "/" + std::to_string(number)});
    const std::string bytes = BuildArchive(description).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    for (const zarvo::entry entry : archive.entries()) {
        zarvo::result<uint64_t> found = archive.find(entry.path());
        ASSERT_EQ(entry.index(), found ? *found : ZARVO_NO_ITEM) << entry.index();
    }
    EXPECT_EQ(5'002u + 20'000u + 700u, archive.item_count());
}

// Looking at each folder of a path with very many components costs no walk along the path.
TEST(Entries, FoldersOfDeepPathsKnowTheirLengths) {
    constexpr size_t kLevels = 300'000;
    std::string deep;
    for (size_t level = 0; level < kLevels; ++level)
        deep += "./x//";
    const std::string bytes = BuildArchive({.entries = {{.path = deep + "file"}}}).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    uint64_t item = archive.item(ZARVO_ROOT)->first_child;
    const clock_t start = clock();
    for (size_t level = 0; level < kLevels; ++level) {
        const zarvo_item folder = *archive.item(item);
        ASSERT_EQ(2 * level + 1, folder.path_length);
        item = folder.first_child;
    }
    EXPECT_EQ(2 * kLevels + 4, archive.item(item)->path_length);
    EXPECT_LE((clock() - start) / CLOCKS_PER_SEC, 10) << "seconds; walks take more than a minute";
}
