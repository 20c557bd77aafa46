#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ReportRecorder.h"

#include <map>

class LocalFileSystemPosixPathsTest : public LocalDiskTest {
protected:
    // What a listing of the folder holds, by the names below it.
    std::map<std::string, FileEntryInfo> List(bool isRecursive, UInt32 flags = 0, bool isListed = true) const {
        dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
        const std::string path = folder / ""; // whose "/" is not doubled
        EXPECT_EQ(isListed, local.Enumerate(path.c_str(), &list, isRecursive, nullptr, FileEnumerationFlag(flags)));
        std::map<std::string, FileEntryInfo> infos;
        for (size_t index = 0; index < list.size(); ++index)
            EXPECT_TRUE(infos.emplace(list[index].path + path.size(), list[index]).second) << list[index].path;
        return infos;
    }
};

TEST_F(LocalFileSystemPosixPathsTest, ParentAndFilenameTreatBackslashesDifferently) {
    const char* const kCases[][3] = {{"/a/b/", "/a", ""}, {"/a", "", "a"},          {"plain", "none", "plain"},
                                     {"/", "none", ""},   {"", "none", ""},         {"a\\b", "a", "b"},
                                     {"\\", "none", ""},  {"a/b\\c", "a/b", "b\\c"}};
    for (const auto& [path, parent, filename] : kCases) {
        FileEntryData entry; // an entry that is set has no backslashes
        core::string answer("none");
        strcpy_truncate(entry.path, path, sizeof(entry.path), strlen(path));
        EXPECT_TRUE(local.Parent(entry, answer) == (strcmp(parent, "none") != 0) && answer == parent) << path;
        EXPECT_STREQ(filename, local.Filename(entry)) << path;
    }
}

TEST_F(LocalFileSystemPosixPathsTest, UserFoldersAreMadeAndFailuresPrinted) {
    const std::string config = folder / ".config/zarvo3d", said = "Creating user config folder: " + config + "\n";
    const ConsoleCapture console;
    UInt64 bytes = 7;
    setenv("HOME", folder.Path().c_str(), 1);
    EXPECT_TRUE(LocalFileSystemPosix().ToAbsolute("~x") == (folder.Path() + "x").c_str());
    EXPECT_EQ(config, local.GetUserConfigFolder().c_str()); // can't be made without .config, which goes unsaid
    Run("mkdir .config");
    EXPECT_EQ(config + "/Caches", local.GetUserAppCacheFolder().c_str());
    EXPECT_TRUE(Mode(config) == 0700 && !local.GetAvailableDiskSpace("/missing", bytes) && bytes == 7);
    EXPECT_EQ(console.Text(), said + said + "statvfs failed with errno=2; path was /missing\n");
    setenv("HOME", "", 1);
    EXPECT_TRUE(local.GetUserAppCacheFolder().empty() && local.GetAvailableDiskSpace("/", bytes) && bytes > 7);
    EXPECT_TRUE(unsetenv("HOME") == 0 && !LocalFileSystemPosix().ToAbsolute("~").empty()); // of the real user
}

TEST_F(LocalFileSystemPosixPathsTest, FiltersLeaveOutByKindAndName) {
    Run("mkdir .git CVS b~ s x.tmp; touch .h f n.TMP .tmp cvs2");
    const std::pair<UInt32, const char*> kCases[] = {{0x02, ".git CVS b~ cvs2 f n.TMP s x.tmp "},
                                                     {0x04, ".h .tmp CVS b~ cvs2 f n.TMP s x.tmp "},
                                                     {0x08, ".git .h .tmp CVS b~ s x.tmp "},
                                                     {0x10, ".git .h .tmp cvs2 f n.TMP "},
                                                     {0x20, "cvs2 f n.TMP s x.tmp "},
                                                     {0x40, ".git .h CVS b~ cvs2 f s x.tmp "}};
    for (const auto& [flags, names] : kCases) {
        std::string listed;
        for (const auto& [name, info] : List(false, flags))
            listed += name + " ";
        EXPECT_EQ(names, listed) << std::hex << flags;
    }
    Run("chmod 0 s"); // what can't be opened ends a listing with what it has
    EXPECT_TRUE(IsTrueForAnybody([&] { return List(true, 0x2A, false).count("s") == 1 && !HasFailure(); }));
}

TEST_F(LocalFileSystemPosixPathsTest, AListingTellsTimesSizesAndKindsAndEndsInLoops) {
    Run("mkdir .sub; printf 12345 > .sub/file; chmod 444 .sub/file; printf 1 > $(printf '\\377x')");
    Run("ln -s nowhere dangling; ln -s self self; ln -s .sub sub; cd .sub; ln -s file link; ln -s . loop; ln -s .. up");
    // The flags, and the size of what is no folder.
    const std::map<std::string, std::pair<UInt8, UInt64>> expected = {
        {".sub", {5, 0}},     {".sub/file", {8, 5}}, {".sub/link", {10, 5}}, {".sub/loop", {3, 0}},
        {".sub/up", {3, 0}},  {"dangling", {2, 0}},  {"self", {2, 0}},       {"sub", {3, 0}},
        {"sub/file", {8, 5}}, {"sub/link", {10, 5}}, {"sub/loop", {3, 0}},   {"sub/up", {3, 0}},
        {"\xFFx", {0, 1}}};
    std::map<std::string, std::pair<UInt8, UInt64>> listed;
    for (const auto& [name, info] : List(true)) {
        listed[name] = {info.flags, (info.flags & kFileEntryIsDirectory) != 0 ? 0 : info.size};
        EXPECT_EQ(local.LastModified(Entry(name)), info.lastModified) << name; // 0 of what leads nowhere
    }
    EXPECT_EQ(expected, listed);
}

TEST_F(LocalFileSystemPosixPathsTest, SummingAddsFilesToTheCounterAndReports) {
    Run("mkdir sub; printf 12345 > sub/a; printf 1234567 > b; ln -s b link; ln -s nowhere dangling");
    ReportRecorder reports;
    UInt64 total = 0;
    void *counter = &total, *none = nullptr;
    for (void** data : {&counter, &none, static_cast<void**>(nullptr)})
        EXPECT_TRUE(local.Enumerate(folder.Path().c_str(), nullptr, true, data, kFileEnumerationSumSizes));
    // A report for each folder, and for each name that can't be added.
    EXPECT_TRUE(total == 19 && reports.Take().size() == 2 + 7 + 7) << total;
}

TEST_F(LocalFileSystemPosixPathsTest, LargeAndDeepTreesAreListedAndDeletedWhole) {
    Run("mkdir wide; touch wide/0; mkdir -p deep$(printf '/d%.0s' $(seq 199))");
    for (int i = 1; i < 10'000; ++i)
        ASSERT_EQ(link((folder / "wide/0").c_str(), (folder / "wide/" + std::to_string(i)).c_str()), 0);
    EXPECT_EQ(List(true).size(), 200u + 1 + 10'000);
    FileSystemEntry deep = Entry("deep"), wide = Entry("wide");
    EXPECT_TRUE(local.Delete(deep, true) && local.Delete(wide, true) && List(true).empty());
}
