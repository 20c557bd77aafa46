#include "MacTest.h"

#include "Tests/Support/ConsoleCapture.h"

#include "Runtime/Utilities/FileUtilities.h"

#include <cerrno>
#include <unistd.h>

namespace {

using LocalFileSystemOSXTest = MacTest;

TEST_F(LocalFileSystemOSXTest, HiddenMarkIsAFileFlag) {
    WriteFile(".dot", "");
    FileSystemEntry entry = Entry(".dot");
    ASSERT_EQ(chflags(entry.path, 1), 0); // another flag stays
    // Steps that build on one another.
    const struct {
        UInt32 mask, flags;
        bool isHidden;
    } kSteps[] = {{0, 0, false}, {4, 4, true}, {0, 0, true},    {0x0B, 0x02, true},
                  {4, 0, false}, {0, 4, true}, {0xFF, 0, false}};
    EXPECT_FALSE(Mac().IsHidden(entry)) << "a leading dot does not count";
    for (const auto& [mask, flags, isHidden] : kSteps) {
        EXPECT_TRUE(Mac().SetFlags(entry, mask, flags)) << mask << " " << flags;
        EXPECT_EQ(Mac().IsHidden(entry), isHidden) << mask << " " << flags;
        PlatformStatus status;
        ASSERT_EQ(PlatformStat(entry.path, &status), 0);
        EXPECT_EQ(status.st_flags, isHidden ? UF_HIDDEN | 1 : 1) << mask << " " << flags;
    }
    FileSystemEntry missing = Entry("missing");
    EXPECT_FALSE(Mac().SetFlags(missing, 0, 0));
    EXPECT_FALSE(Mac().IsHidden(missing));
}

TEST_F(LocalFileSystemOSXTest, RefusedFlagsAreReported) {
    WriteFile("file", "");
    FileSystemEntry entry = Entry("file");
    gStandinFaults.chflagsError = EPERM;
    ConsoleCapture console;
    EXPECT_TRUE(Mac().SetFlags(entry, 4, 0)) << "unchanged flags are not set";
    EXPECT_FALSE(Mac().SetFlags(entry, 4, 4));
    EXPECT_NE(console.Text().find("Failed to change file flags for '" + Path("file") + "'. errno: 1"),
              std::string::npos);
}

TEST_F(LocalFileSystemOSXTest, CreateAsFileLeavesWhatThereIs) {
    WriteFile("file", "text");
    mkdir(Path("folder").c_str(), 0755);
    symlink("nowhere/x", Path("dangling").c_str());
    const size_t objects = CountStandinObjects();
    const struct {
        const char* name;
        bool created;
    } kCases[] = {{"new", true},       {"file", false},      {"folder", false},
                  {"dangling", false}, {"none/file", false}, {"\xFF", false}};
    for (const auto& [name, created] : kCases) {
        FileSystemEntry entry = Entry(name);
        EXPECT_EQ(Mac().CreateAsFile(entry), created) << name;
    }
    EXPECT_EQ(CountStandinObjects(), objects) << "the pool is the operation's own";
    EXPECT_EQ(Tree(""), (std::set<std::string>{"dangling", "file", "folder", "new"}));
    EXPECT_EQ(ReadFile("file"), "text");
}

TEST_F(LocalFileSystemOSXTest, TrashTakesFilesFoldersAndWhatLinksLeadTo) {
    WorkIn("");
    for (const char* name : {"a/name", "b/name", "folder/sub/file", "target", "relative"})
        WriteFile(name, name);
    symlink("target", Path("link").c_str());
    for (const char* name : {"a/name", "b/name", "folder"}) {
        FileSystemEntry entry = Entry(name);
        EXPECT_TRUE(Mac().MoveToTrash(entry)) << name;
    }
    FileSystemEntry link = Entry("link");
    EXPECT_TRUE(Mac().MoveToTrash(link));
    EXPECT_EQ(link.path, Path("target")) << "the entry is the resolved one from then on";
    FileSystemEntry relative("./relative");
    EXPECT_TRUE(Mac().MoveToTrash(relative));
    EXPECT_EQ(relative.path, Path("relative"));
    EXPECT_EQ(Tree(""),
              (std::set<std::string>{".Trash", ".Trash/name", ".Trash/name 2", ".Trash/folder", ".Trash/folder/sub",
                                     ".Trash/folder/sub/file", ".Trash/target", ".Trash/relative", "a", "b", "link"}));
    EXPECT_EQ(ReadFile(".Trash/name 2"), "b/name");
}

TEST_F(LocalFileSystemOSXTest, WhatTheTrashRefusesIsDeleted) {
    gStandinFaults.trashRefuses = true;
    WriteFile("folder/sub/file", "");
    WriteFile("kept", "");
    FileSystemEntry folder = Entry("folder");
    EXPECT_TRUE(Mac().MoveToTrash(folder));
    EXPECT_EQ(Tree(""), (std::set<std::string>{"kept"}));
}

TEST_F(LocalFileSystemOSXTest, WhatCannotBeNamedIsNotThrownAway) {
    WorkIn("");
    WriteFile("\xFF", "");
    WriteFile("kept", "");
    symlink("nowhere", Path("dangling").c_str());
    for (const char* name : {"missing", "dangling", "\xFF"}) {
        FileSystemEntry entry = Entry(name);
        EXPECT_FALSE(Mac().MoveToTrash(entry)) << name;
    }
    FileSystemEntry invalid("\xFF"); // relative: an empty path would be the working directory
    EXPECT_FALSE(Mac().MoveToTrash(invalid));
    gStandinFaults.nilStrings = true;
    FileSystemEntry nil = Entry("kept");
    EXPECT_FALSE(Mac().MoveToTrash(nil));
    EXPECT_EQ(Tree(""), (std::set<std::string>{"dangling", "kept", "\xFF"}));
}

TEST_F(LocalFileSystemOSXTest, TargetThatAnEntryWouldCutIsRefused) {
    std::string deep = "folder";
    while (Path(deep).size() <= kMaxPathLength)
        deep += "/" + std::string(100, 'x');
    std::filesystem::create_directories(Path(deep));
    symlink(Path(deep).c_str(), Path("way").c_str());
    const std::set<std::string> before = Tree("");
    FileSystemEntry way = Entry("way"), target = Entry("before");
    EXPECT_FALSE(Mac().Target(way, target));
    EXPECT_EQ(target.path, Path("before"));
    EXPECT_FALSE(Mac().MoveToTrash(way));
    EXPECT_EQ(way.path, Path("way"));
    EXPECT_EQ(Tree(""), before);
}

TEST_F(LocalFileSystemOSXTest, CopyTakesFoldersWholeAndReplacesNothing) {
    WriteFile("from/file", "text");
    WriteFile("from/\xFF", "not UTF-8 below the folder");
    symlink("file", Path("from/link").c_str());
    symlink("nowhere", Path("from/dangling").c_str());
    mkdir(Path("from/closed").c_str(), 0555);
    chmod(Path("from/file").c_str(), 0640);
    symlink("from", Path("way").c_str());
    WriteFile("there", "old");
    WorkIn("");
    const struct {
        std::string from, to;
        bool copied;
    } kCases[] = {
        {Path("way"), Path("to"), true}, // the source's links are resolved
        {"from/file", "~/home", true},
        {Path("from/file"), Path("there"), false},
        {Path("from/file"), Path("from/file"), false},
        {Path("from/file"), Path("from/dangling"), false},
        {Path("from/file"), Path("none/file"), false},
        {Path("missing"), Path("new"), false},
        {Path("from/\xFF"), Path("new"), false},
        {Path("from/file"), Path("new\xFF"), false},
    };
    const size_t objects = CountStandinObjects();
    for (const auto& [from, to, copied] : kCases) {
        FileSystemEntry source(from.c_str()), destination(to.c_str());
        EXPECT_EQ(LocalFileSystemOSX().Copy(source, destination), copied) << from << " to " << to;
    }
    EXPECT_EQ(CountStandinObjects(), objects) << "the pool is the operation's own";
    EXPECT_EQ(Tree("to"), Tree("from"));
    EXPECT_EQ(Tree(""), ([&] {
                  std::set<std::string> names = {"from", "home", "there", "to", "way"};
                  for (const std::string& name : Tree("from"))
                      for (const char* folder : {"from/", "to/"})
                          names.insert(folder + name);
                  return names;
              }()));
    EXPECT_EQ(ReadFile("to/file"), "text");
    EXPECT_EQ(ReadFile("home"), "text");
    EXPECT_EQ(ReadFile("there"), "old");
    EXPECT_EQ(std::filesystem::read_symlink(Path("to/link")), "file");
    EXPECT_EQ(std::filesystem::status(Path("to/file")).permissions(), static_cast<std::filesystem::perms>(0640));
    EXPECT_EQ(std::filesystem::status(Path("to/closed")).permissions(), static_cast<std::filesystem::perms>(0555));
}

TEST_F(LocalFileSystemOSXTest, UserFoldersLieInTheHomeFolderAndAreNotMade) {
    EXPECT_EQ(Mac().GetUserAppDataFolder().c_str(), Path("Library/Zarvo"));
    const core::string cache = Mac().GetUserAppCacheFolder();
    EXPECT_EQ(cache.c_str(), Path("Library/Caches/com.zarvo3d.ZarvoEditor"));
    EXPECT_EQ(cache.get_memory_label(), kMemLabelGeneral);
    EXPECT_EQ(Tree(""), std::set<std::string>());
    EXPECT_STREQ(Mac().GetSharedApplicationDataFolder().c_str(), "/Library/Application Support");
    EXPECT_EQ(Mac().GetUserConfigFolder().c_str(), Path(".config/zarvo3d")) << "as on every other system";
}

// In a process of its own, as the application path is kept until the process ends.
TEST_F(LocalFileSystemOSXTest, ApplicationPathIsAskedForUntilItIsKnown) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto run = [] {
        const std::string program = std::filesystem::read_symlink("/proc/self/exe");
        const std::string folder = std::filesystem::path(program).parent_path();
        const std::string above = std::filesystem::path(folder).parent_path();
        gStandinFaults.emptyBundlePath = true;
        EXPECT_EQ(Mac().GetApplicationPath(), "");
        EXPECT_EQ(Mac().GetApplicationContentsPath(), "Contents");
        gStandinFaults.emptyBundlePath = false;
        EXPECT_EQ(Mac().GetApplicationPath().c_str(), folder);
        gStandinFaults.emptyBundlePath = true;
        EXPECT_EQ(Mac().GetApplicationPath().c_str(), folder) << "kept";
        EXPECT_EQ(Mac().GetApplicationFolder().c_str(), above);
        EXPECT_EQ(Mac().GetApplicationFolder().get_memory_label(), kMemLabelGeneral);
        EXPECT_EQ(Mac().GetApplicationContentsPath().c_str(), folder + "/Contents");
        EXPECT_EQ(Mac().GetApplicationManagedPath().c_str(), folder + "/Contents/Managed");
        EXPECT_EQ(Mac().GetExecutablePath().c_str(), program);
        exit(testing::Test::HasFailure() ? 1 : 0);
    };
    EXPECT_EXIT(run(), testing::ExitedWithCode(0), "");
}

TEST_F(LocalFileSystemOSXTest, RefusedFolderIsExplained) {
    ConsoleCapture console;
    EXPECT_FALSE(CreateDirectory(core::string(Path("none/folder").c_str())));
    EXPECT_EQ(console.Text(),
              "CreateDirectory '" + Path("none/folder") + "' failed: No such file or directory (current dir: /)\n");
}

} // namespace
