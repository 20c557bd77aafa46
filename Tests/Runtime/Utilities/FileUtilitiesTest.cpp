#include "Runtime/Utilities/FileUtilities.h"

#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ConsoleCapture.h"

class FileUtilitiesTest : public LocalDiskTest {};

TEST_F(FileUtilitiesTest, AFolderIsMadeOnceAndAFailureIsPrinted) {
    Run("touch file; ln -s nowhere dangling"); // the link is there for mkdir, but not for the question
    const std::tuple<const char*, bool, bool, bool> kCases[] = {
        {"one", false, true, false},     {"one", false, true, false},   {"", false, true, false},
        {"file", false, false, false},   {"x/y", false, false, true},   {"x/y/z", true, true, false},
        {"x/y/z", true, true, false},    {"x/y/w/", true, true, false}, {"file/a/b", true, false, false},
        {"dangling", false, false, true}};
    const std::string rest = "' failed:  (current dir: " + folder.Path() + ")\n";
    for (const auto& [path, isRecursive, isMade, isFailurePrinted] : kCases) {
        const ConsoleCapture console;
        EXPECT_EQ(isMade, isRecursive ? CreateDirectoryRecursive(path) : CreateDirectory(path)) << path;
        EXPECT_EQ(isFailurePrinted ? "CreateDirectory '" + folder / path + rest : "", console.Text()) << path;
        EXPECT_EQ(isMade, IsDirectoryCreated(path)) << path;
    }
    EXPECT_TRUE(IsFileCreated("file") && IsPathCreated("file") && IsPathCreated("x"));
    EXPECT_FALSE(IsFileCreated("x") || IsFileCreated("") || IsPathCreated("") || IsPathCreated("dangling"));
    // In no current directory there is nothing to make.
    EXPECT_TRUE(!GetFileSystem()->SetCurrentDirectory("").empty() && CreateDirectoryRecursive(""));
}

TEST_F(FileUtilitiesTest, ContentsAreListedInThreeWaysOfWritingPaths) {
    Run("mkdir -p top/b/c; touch top/a.tmp");
    const std::tuple<const char*, int, bool, std::string> kCases[] = {
        {"top", 0, true, "top/a.tmp top/b top/b/c "},
        {"top", 1, true, "a.tmp b b/c "},
        {"top", 2, false, folder / "top/a.tmp " + folder / "top/b "},
        {"missing", 2, true, ""}};
    for (const auto& [path, mode, isRecursive, names] : kCases) {
        FolderContents contents;
        std::string listed;
        EXPECT_TRUE(GetFolderContentsAtPath(path, contents, FolderContentsPathMode(mode),
                                            core::string((folder / "top").c_str()), isRecursive));
        for (const core::string& name : contents)
            listed += std::string(name.c_str()) + " ";
        EXPECT_EQ(names, listed) << path << ", mode " << mode;
    }
    EXPECT_TRUE(DeleteFileOrDirectory("top") && !IsPathCreated("top") && !DeleteFileOrDirectory("top"));
}
