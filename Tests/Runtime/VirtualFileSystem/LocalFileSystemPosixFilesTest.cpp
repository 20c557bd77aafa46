#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"

#include <sys/socket.h>

class LocalFileSystemPosixFilesTest : public LocalDiskTest {
protected:
    // A folder under "deep" whose path is of that length, with all above it.
    std::string MakeDeepFolder(size_t length) const {
        std::string path = folder / "deep/";
        path.resize(length, 'd');
        for (size_t at = length - 2; at > folder.Path().size() + 110; at -= 100)
            path[at] = '/';
        Run("mkdir -p " + path);
        return path;
    }
    bool DeleteTree(const char* name, bool isRecursive = true) {
        FileSystemEntry entry = Entry(name);
        return local.Delete(entry, isRecursive);
    }
};

TEST_F(LocalFileSystemPosixFilesTest, RightsToWriteAndTimesAreSet) {
    Run("touch file; ln -s file link");
    FileSystemEntry file = Entry("file"), link = Entry("link"), missing = Entry("missing");
    EXPECT_TRUE(chmod(file.path, 04766) == 0 && local.SetReadOnly(file, true) && Mode("file") == 04544);
    EXPECT_TRUE(local.SetReadOnly(file, false) && Mode("file") == 04744);
    EXPECT_TRUE(local.SetReadOnly(link, true) && Mode("file") == 0555); // the link's own mode without the rights
    const DateTime time{kUnixEpochTicks - 50'000'000}, finer{time.ticks - 9'999'999}; // cut off towards 1970
    EXPECT_TRUE(local.SetFileTimeStamp(file, finer) && local.LastModified(file) == time);
    EXPECT_TRUE(local.Touch(file) && local.LastModified(file).ticks > time.ticks);
    EXPECT_FALSE(local.SetReadOnly(missing, true) || local.Touch(missing) || local.SetFileTimeStamp(missing, time));
}

TEST_F(LocalFileSystemPosixFilesTest, InfoAnswersTellWhatWasFilled) {
    Run("printf 12345 > file; chmod 444 file; ln -s file link; ln -s nowhere dangling");
    constexpr UInt8 kOldFlags = 0xF4; // hidden, and bits that are not the operation's
    const std::tuple<const char*, UInt32, UInt32, UInt8> kCases[] = {
        {".", 0x90, 0x1D4, 0xF1},      {".", 0x10, 0x154, 0xF1},       {".", 0x80, 0xC0, 0xF0},
        {".", 0, 0x40, 0xF0},          {"file", 0x04, 0x154, 0xF0},    {"file", 0x20, 0x174, 0xF0},
        {"file", 0x200, 0x354, 0xF8},  {"link", 0x220, 0x374, 0xFA},   {"missing", 0x90, 0, kOldFlags},
        {"missing", 0x10, 0x40, 0xF0}, {"dangling", 0x220, 0x40, 0xF0}};
    for (const auto& [name, query, answer, flags] : kCases) {
        SCOPED_TRACE(testing::Message() << name << ", query " << query);
        const FileSystemEntry entry = (answer & 0x114) != 0 ? Entry(name) : Entry("missing");
        FileEntryInfo info;
        info.flags = kOldFlags;
        EXPECT_EQ(answer, local.GetFileEntryInfo(Entry(name), info, static_cast<FileEntryInfoQueryFlags>(query)));
        EXPECT_TRUE(info.lastModified == local.LastModified(entry) && info.size == local.Size(entry));
        EXPECT_EQ(flags, info.flags);
    }
}

TEST_F(LocalFileSystemPosixFilesTest, DeletingTakesATreeButNothingOutsideIt) {
    Run("mkdir -p kept tree/.sub/$(printf '\\377') odd; touch kept/file 'odd/..\\kept' tree/.sub/$(printf %0255d 0)");
    Run("ln -s kept link; ln -s ../kept tree/link; ln -s . tree/loop; ln -s nowhere tree/dangling");
    EXPECT_FALSE(DeleteTree("tree", false) || DeleteTree("odd"));
    EXPECT_TRUE(DeleteTree("tree") && DeleteTree("link") && Mode("tree") + Mode("link") == -2);
    EXPECT_NE(Mode("kept/file"), -1);
    Run("mkdir -p theirs/sub; touch theirs/file theirs/sub/file; chmod 777 theirs; chmod 555 theirs/sub");
    EXPECT_TRUE(IsTrueForAnybody([&] { return !DeleteTree("theirs") && Mode("theirs/file") == -1; }));

    // Folders whose paths leave room for 8 characters, for the separator alone, and for nothing.
    for (const size_t room : {9u, 1u, 0u}) {
        const std::string path = MakeDeepFolder(kMaxPathLength - room), cut = path + "/12345678", whole = cut + "9";
        Run("touch " + cut + " " + whole);
        EXPECT_TRUE(!DeleteTree("deep") && (access(cut.c_str(), F_OK) == 0) == (room < 9)) << room;
        EXPECT_TRUE(unlink(whole.c_str()) == 0 && (unlink(cut.c_str()), DeleteTree("deep"))) << room;
    }
}

TEST_F(LocalFileSystemPosixFilesTest, ATargetIsResolvedToItsEnd) {
    Run("mkdir sub; ln -s sub/../second first; ln -s sub second; ln -s nowhere dangling");
    Run("ln -s " + MakeDeepFolder(1024) + " 'too long'; ln -s " + MakeDeepFolder(1023) + " longest");
    FileSystemEntry target;
    EXPECT_FALSE(local.Target(Entry("dangling"), target) || local.Target(Entry("too long"), target));
    EXPECT_TRUE(local.Target(Entry("longest"), target) && target.Path() == MakeDeepFolder(1023));
    EXPECT_TRUE(local.Target(Entry("first/./"), target) && target.Path() == folder / "sub");
}

TEST_F(LocalFileSystemPosixFilesTest, ALockKeepsOthersOutUntilItIsGivenBack) {
    FileSystemEntry first = Entry("file"), second = Entry("file"), unopenable = Entry("no/file");
    EXPECT_FALSE(local.IsLocked(first) || local.Lock(first, kFileLockUnlock)); // not there
    EXPECT_TRUE(local.Lock(first, kFileLockExclusive) && local.IsLocked(second));
    ASSERT_TRUE(Open(second, kFilePermissionRead)); // and closed all the same
    EXPECT_FALSE(local.Lock(second, kFileLockShared) || second.handlerState != nullptr);
    EXPECT_TRUE(local.Lock(first, kFileLockShared)); // the lock is changed for another
    EXPECT_TRUE(local.Lock(second, kFileLockShared) && local.Lock(second, kFileLockUnlock));
    EXPECT_TRUE(local.IsLocked(second) && local.Lock(first, kFileLockUnlock) && !local.IsLocked(second)); // shared too
    EXPECT_FALSE(local.Lock(unopenable, kFileLockShared) || unopenable.handlerState != nullptr);
    Run("chmod 0 file"); // so that it can't be opened
    EXPECT_TRUE(IsTrueForAnybody([&] { return local.IsLocked(second); }));
}

TEST_F(LocalFileSystemPosixFilesTest, AFolderIsLockedWhenAFileInItIsLockedByAnotherProcess) {
    Run("mkdir -p sub/deeper; touch sub/a sub/deeper/b");
    int ends[2];
    char byte = '?';
    // The paths that are asked of are relative to the current directory.
    ASSERT_TRUE(chdir(folder.Path().c_str()) == 0 && socketpair(AF_UNIX, SOCK_STREAM, 0, ends) == 0);
    FileSystemEntry entry = Entry("sub/a");
    const pid_t child = fork();
    if (child == 0) {
        byte = local.Lock(entry, kFileLockExclusive) ? 'l' : '-';
        _exit(write(ends[1], &byte, 1) == 1 && read(ends[1], &byte, 1) == 1 ? 0 : 1); // which gives the lock back
    }
    EXPECT_TRUE(read(ends[0], &byte, 1) == 1 && byte == 'l' && local.IsLocked(Entry("sub")) &&
                !local.IsLocked(Entry("sub/deeper")));
    int status = -1;
    EXPECT_TRUE(write(ends[0], &byte, 1) == 1 && waitpid(child, &status, 0) == child && status == 0);
    EXPECT_FALSE(local.IsLocked(Entry("sub")) || close(ends[0]) + close(ends[1]) + chdir("/") != 0);
}

TEST_F(LocalFileSystemPosixFilesTest, CopiesAreWholeAndMovesAreRenames) {
    for (const size_t size : {200'001u, 65'536u, 0u, 65'535u, 1u}) {
        std::string contents;
        while (contents.size() < size)
            contents += static_cast<char>(contents.size() * 31 >> 8 ^ contents.size());
        WriteFile(folder / "from", contents);
        FileSystemEntry from = Entry("from"), to = Entry("to");
        EXPECT_TRUE(chmod(from.path, size % 2 == 0 ? 0640 : 0711) == 0 && local.Copy(from, to)) << size;
        EXPECT_TRUE(contents == ReadFile(folder / "to") && Mode("from") == Mode("to")) << size;
    }
    Run("mkdir sub; ln -s from link; ln from hard");
    const std::tuple<const char*, const char*, bool, UInt32> kCases[] = {
        {"from", "from", false, 0},       {"from", "link", false, 0}, {"link", "hard", false, 0},
        {"missing", "x", false, 1},       {"hard", "no/x", false, 1}, {"sub", "x", false, 14}, // a file
        {"/proc/self/mem", "y", true, 10}}; // of size 0, by its status
    for (const auto& [fromName, toName, isCopied, moveError] : kCases) {
        FileSystemEntry from = Entry(fromName), to = Entry(toName);
        const VFS::FileSize size = local.Size(from);
        EXPECT_TRUE(local.Copy(from, to) == isCopied && local.Size(from) == size) << fromName << " to " << toName;
        EXPECT_TRUE(local.AtomicMove(from, to) == (moveError == 0) && from.lastError == moveError) << fromName;
    }
    FileSystemEntry missing = Entry("missing"), hard = Entry("hard");
    EXPECT_FALSE(local.SynchronizeMode(hard, missing) || missing.lastError != 1);
}
