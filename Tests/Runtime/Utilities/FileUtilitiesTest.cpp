#include "Runtime/Utilities/FileUtilities.h"

#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

TEST(FileUtilities, FoldersAreMadeOnceListedInThreeWaysOfWritingPathsAndDeleted) {
    const TemporaryFolder folder;
    GetFileSystem()->SetCurrentDirectory(folder.Path().c_str());
    WriteFile(folder / "file", "");
    using Row = std::tuple<const char*, bool, bool, bool>;
    for (const auto& [path, isRecursive, isMade, isFailurePrinted] :
         {Row("top", false, true, false), Row("top", false, true, false), Row("", false, true, false),
          Row("file", false, false, false), Row("x/y", false, false, true), Row("top/b/c/", true, true, false),
          Row("file/a/b", true, false, false)}) {
        const ConsoleCapture console;
        const std::string text =
            "CreateDirectory '" + folder / path + "' failed:  (current dir: " + folder.Path() + ")\n";
        EXPECT_EQ(isMade, isRecursive ? CreateDirectoryRecursive(path) : CreateDirectory(path)) << path;
        EXPECT_TRUE(console.Text() == (isFailurePrinted ? text : "") && IsDirectoryCreated(path) == isMade) << path;
    }
    EXPECT_TRUE(IsFileCreated("file") && IsPathCreated("top"));
    EXPECT_FALSE(IsFileCreated("top") || IsFileCreated("") || IsPathCreated("") || IsPathCreated("x"));
    const std::string kFirst[] = {"top/b", "b", folder / "top/b"};
    for (int mode = 0; mode < 3; ++mode) {
        FolderContents contents;
        GetFolderContentsAtPath("top", contents, FolderContentsPathMode(mode), (folder / "top").c_str(), mode != 2);
        EXPECT_TRUE(*contents.begin() == kFirst[mode].c_str() && contents.size() == (mode == 2 ? 1 : 2)) << mode;
    }
    EXPECT_TRUE(DeleteFileOrDirectory("top") && !IsPathCreated("top") && !DeleteFileOrDirectory("top"));
    EXPECT_TRUE(!GetFileSystem()->SetCurrentDirectory("").empty() && CreateDirectoryRecursive("")); // nothing to make
}
