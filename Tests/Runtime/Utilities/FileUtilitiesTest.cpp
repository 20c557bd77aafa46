#include "Runtime/Utilities/FileUtilities.h"

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

class FileUtilitiesTest : public testing::Test {
protected:
    FileUtilitiesTest() { GetFileSystem()->SetCurrentDirectory(folder.Path().c_str()); }
    ~FileUtilitiesTest() override { GetFileSystem()->SetCurrentDirectory(""); }

    const TemporaryFolder folder;
    const ConsoleCapture console;
};

TEST_F(FileUtilitiesTest, AFolderThatExistsCountsAsCreated) {
    EXPECT_TRUE(CreateDirectory("t"));
    EXPECT_TRUE(IsDirectoryCreated("t"));
    EXPECT_TRUE(CreateDirectory("t"));
    EXPECT_EQ("", console.Text());
}

TEST_F(FileUtilitiesTest, MissingParentsAreCreated) {
    EXPECT_TRUE(CreateDirectoryRecursive("t/b/c/"));
    EXPECT_TRUE(IsDirectoryCreated("t/b/c"));
    EXPECT_EQ("", console.Text());
}

TEST_F(FileUtilitiesTest, AFailedCreationIsPrinted) {
    EXPECT_FALSE(CreateDirectory("x/y"));
    EXPECT_EQ("CreateDirectory '" + folder / "x/y' failed:  (current dir: " + folder.Path() + ")\n", console.Text());
}

TEST_F(FileUtilitiesTest, AFileInTheWayIsNotPrinted) {
    WriteFile(folder / "file", "");
    EXPECT_FALSE(CreateDirectory("file"));
    EXPECT_FALSE(CreateDirectoryRecursive("file/a/b"));
    EXPECT_EQ("", console.Text());
}

TEST_F(FileUtilitiesTest, AnEmptyAbsolutePathNeedsNoFolder) {
    GetFileSystem()->SetCurrentDirectory("");
    EXPECT_TRUE(CreateDirectory(""));
    EXPECT_TRUE(CreateDirectoryRecursive(""));
}

TEST_F(FileUtilitiesTest, AHandlerCanLeaveNothingOfAPath) {
    struct Nowhere : LocalFileSystemPosix {
        Nowhere() { GetFileSystem()->RegisterHandler(this); }
        ~Nowhere() override { GetFileSystem()->UnregisterHandler(this); }
        bool CanConvertToAbsolutePath(core::string_ref path) const override { return path == "nowhere"; }
        core::string ToAbsolute(core::string_ref) const override { return core::string(); }
    } handler;
    EXPECT_TRUE(CreateDirectory("nowhere"));
    EXPECT_EQ("", console.Text());
}

TEST_F(FileUtilitiesTest, FilesAndFoldersAreToldApart) {
    ASSERT_TRUE(CreateDirectory("t"));
    WriteFile(folder / "file", "");
    struct {
        const char* path;
        bool isDirectory = false, isFile = false, isPath = false;
    } const kCases[] = {
        {.path = "", .isDirectory = true}, // the current directory
        {.path = "t", .isDirectory = true, .isPath = true},
        {.path = "file", .isFile = true, .isPath = true},
        {.path = "none"},
    };
    for (const auto& c : kCases) {
        EXPECT_EQ(c.isDirectory, IsDirectoryCreated(c.path)) << c.path;
        EXPECT_EQ(c.isFile, IsFileCreated(c.path)) << c.path;
        EXPECT_EQ(c.isPath, IsPathCreated(c.path)) << c.path;
    }
}

TEST_F(FileUtilitiesTest, ContentsAreRelativeToWhatIsAsked) {
    ASSERT_TRUE(CreateDirectoryRecursive("t/b/c"));
    struct {
        FolderContentsPathMode mode;
        bool recursive;
        std::vector<std::string> paths;
    } const kCases[] = {
        {.mode = kFolderContentsRelativeToCurrentDirectory, .recursive = true, .paths = {"t/b", "t/b/c"}},
        {.mode = kFolderContentsRelativeToBase, .recursive = true, .paths = {"b", "b/c"}},
        {.mode = kFolderContentsAbsolute, .recursive = false, .paths = {folder / "t/b"}},
    };
    for (const auto& c : kCases) {
        FolderContents contents;
        EXPECT_TRUE(GetFolderContentsAtPath("t", contents, c.mode, (folder / "t").c_str(), c.recursive));
        std::vector<std::string> paths;
        for (const core::string& path : contents)
            paths.push_back(path.c_str());
        EXPECT_EQ(c.paths, paths) << "mode " << c.mode;
    }
}

TEST_F(FileUtilitiesTest, AMissingFolderHasNoContents) {
    FolderContents contents;
    EXPECT_TRUE(GetFolderContentsAtPath("none", contents, kFolderContentsAbsolute, "", true));
    EXPECT_EQ(0u, contents.size());
}

TEST_F(FileUtilitiesTest, AFolderIsDeletedWithItsContents) {
    ASSERT_TRUE(CreateDirectoryRecursive("t/b/c"));
    EXPECT_TRUE(DeleteFileOrDirectory("t"));
    EXPECT_FALSE(IsPathCreated("t"));
    EXPECT_FALSE(DeleteFileOrDirectory("t"));
}
