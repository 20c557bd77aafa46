#include "Runtime/Utilities/FileUtilities.h"

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

TEST(FileUtilities, FoldersAreMadeOnceListedInThreeWaysOfWritingPathsAndDeleted) {
    const TemporaryFolder folder;
    GetFileSystem()->SetCurrentDirectory(folder.Path().c_str());
    WriteFile(folder / "file", "");
    const ConsoleCapture console;
    EXPECT_TRUE(CreateDirectory("") && CreateDirectory("t") && CreateDirectory("t") &&
                CreateDirectoryRecursive("t/b/c/"));
    EXPECT_FALSE(CreateDirectory("file") || CreateDirectoryRecursive("file/a/b") || CreateDirectory("x/y"));
    EXPECT_EQ(console.Text(), "CreateDirectory '" + folder / "x/y' failed:  (current dir: " + folder.Path() + ")\n");
    EXPECT_TRUE(IsDirectoryCreated("") && IsDirectoryCreated("t/b/c") && IsPathCreated("t") && IsFileCreated("file"));
    EXPECT_FALSE(IsDirectoryCreated("file") || IsFileCreated("t") || IsFileCreated("") || IsPathCreated(""));
    const std::string kFirst[] = {"t/b", "b", folder / "t/b"};
    for (int mode = 0; mode < 3; ++mode) {
        FolderContents contents;
        GetFolderContentsAtPath("t", contents, FolderContentsPathMode(mode), (folder / "t").c_str(), mode != 2);
        EXPECT_TRUE(*contents.begin() == kFirst[mode].c_str() && contents.size() == (mode == 2 ? 1 : 2)) << mode;
    }
    EXPECT_TRUE(DeleteFileOrDirectory("t") && !IsPathCreated("t") && !DeleteFileOrDirectory("t"));
    EXPECT_TRUE(!GetFileSystem()->SetCurrentDirectory("").empty() && CreateDirectoryRecursive("")); // nothing to make
}

TEST(FileUtilities, AFolderThatAHandlerMakesNothingOfIsThere) {
    struct Nowhere : LocalFileSystemPosix {
        Nowhere() { GetFileSystem()->RegisterHandler(this); }
        ~Nowhere() override { GetFileSystem()->UnregisterHandler(this); }
        bool CanConvertToAbsolutePath(core::string_ref path) const override { return path == "nowhere"; }
        core::string ToAbsolute(core::string_ref) const override { return core::string(); }
    } handler;
    const ConsoleCapture console;
    EXPECT_TRUE(CreateDirectory("nowhere"));
    EXPECT_EQ(console.Text(), "");
}
