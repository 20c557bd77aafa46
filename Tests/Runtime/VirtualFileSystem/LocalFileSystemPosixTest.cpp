// What the POSIX back end does in its own way, or for the macOS one too, which inherits it.
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"

#include <map>

class LocalFileSystemPosixTest : public LocalDiskTest {
protected:
    // The bytes that one read delivers; "failed" when it answers false.
    std::string Read(FileEntryData& entry, UInt64 size) {
        std::string text(size, '?');
        UInt64 count = 0;
        return local.Read(entry, size, text.data(), &count, kFileReadFlagsNone) ? text.substr(0, count) : "failed";
    }
    std::string ReadAt(FileEntryData& entry, UInt64 position, UInt64 size) {
        std::string text(size, '?');
        UInt64 count = 0;
        const bool isRead = local.Read(entry, position, size, text.data(), &count, kFileReadFlagsNone);
        return isRead ? text.substr(0, count) : "failed";
    }
};

TEST_F(LocalFileSystemPosixTest, OpenDoesWhatThePermissionSays) {
    struct Use {
        FileSystemError error = kFileSystemErrorNone;
        UInt64 position = 0; // after the open
        bool canWrite = false, canRead = false;
    };
    struct {
        const char* name; // "old" holds "data", "new" is missing
        FilePermission permission;
        Use use;
        const char* contents; // after "X" was written at the start, if the permission allows it
    } const kCases[] = {
        {"old", kFilePermissionRead, {.canRead = true}, "data"},
        {"new", kFilePermissionRead, {.error = kFileSystemErrorNotFound}, nullptr},
        {"old", kFilePermissionWrite, {.canWrite = true}, "X"},
        {"new", kFilePermissionWrite, {.canWrite = true}, "X"},
        {"old", kFilePermissionReadWrite, {.canWrite = true, .canRead = true}, "Xata"},
        {"new", kFilePermissionReadWrite, {.canWrite = true, .canRead = true}, "X"},
        {".", kFilePermissionReadWrite, {.error = kFileSystemErrorUnknown}, nullptr},
        {"old", kFilePermissionAppend, {.position = 4, .canWrite = true}, "dataX"}, // wherever the position is
        {"new", kFilePermissionAppend, {.canWrite = true}, "X"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << c.name << " with permission " << c.permission);
        Run("printf data > old; rm -f new");
        FileSystemEntry entry = Entry(c.name);
        UInt64 count = 0;
        EXPECT_EQ(c.use.error == kFileSystemErrorNone, Open(entry, c.permission));
        EXPECT_EQ(c.use.error, entry.lastError);
        EXPECT_EQ(c.use.position, local.Position(entry).Cast<UInt64>());
        EXPECT_EQ(c.use.error == kFileSystemErrorNone, local.Seek(entry, 0, kFileOriginBegin));
        EXPECT_EQ(c.use.canWrite, local.Write(entry, 1, "X", &count));
        EXPECT_EQ(c.use.canRead, ReadAt(entry, 0, 1) != "failed");
        EXPECT_TRUE(local.Close(entry));
        EXPECT_EQ(nullptr, entry.handlerState);
        EXPECT_EQ(c.use.error, entry.lastError); // a failed open's stays
        if (c.contents != nullptr) {
            EXPECT_EQ(c.contents, ReadFile(entry.path));
        }
    }
}

TEST_F(LocalFileSystemPosixTest, SeeksFromEachOrigin) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, kFilePermissionRead));
    struct {
        SInt64 offset;
        FileOrigin origin;
        const char* rest; // what is left to read from there
        const char* reported = "";
    } const kCases[] = {
        {.offset = 6, .origin = kFileOriginBegin, .rest = "6789"},
        {.offset = -3, .origin = kFileOriginEnd, .rest = "789"},
        {.offset = 2, .origin = kFileOriginEnd, .rest = "failed"},
        {.offset = -4, .origin = kFileOriginCurrent, .rest = "89"}, // from 12, which is past the end
        {.offset = 8, .origin = FileOrigin(0), .rest = "89", .reported = "unknown file origin enum\n"},
        {.offset = 7, .origin = FileOrigin(4), .rest = "789", .reported = "unknown file origin enum\n"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << c.offset << " from " << c.origin);
        const ConsoleCapture console;
        EXPECT_TRUE(local.Seek(entry, c.offset, c.origin));
        EXPECT_EQ(c.reported, console.Text());
        EXPECT_EQ(c.rest, Read(entry, 16));
    }
    EXPECT_FALSE(local.Seek(entry, -1, kFileOriginBegin));
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, PositionedTransfersMoveThePosition) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, kFilePermissionReadWrite));
    char byte;
    UInt64 count = 0;
    EXPECT_EQ("23", ReadAt(entry, 2, 2));
    EXPECT_EQ(4u, local.Position(entry).Cast<UInt64>());
    EXPECT_EQ(1, read(GetDescriptor(entry), &byte, 1)); // as another process with the same open file could
    EXPECT_EQ("45", ReadAt(entry, 4, 2));
    EXPECT_TRUE(local.Write(entry, 8, 1, "X", &count));
    EXPECT_EQ(9u, local.Position(entry).Cast<UInt64>());
    EXPECT_EQ("X9", ReadAt(entry, 8, 2));
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, AFailedTransferRecordsItsError) {
    FileSystemEntry full = Entry("/dev/full"), directory = Entry(".");
    ASSERT_TRUE(Open(full, kFilePermissionWrite));
    ASSERT_TRUE(Open(directory, kFilePermissionRead));
    const Outcome kFailed{false, kFileSystemErrorUnknown};
    char byte = 'X';
    UInt64 written = 99, delivered = 99;
    EXPECT_EQ(kFailed, (Outcome{local.Write(full, 1, &byte, &written), full.lastError}));
    EXPECT_EQ(0u, written);
    EXPECT_EQ(kDone, (Outcome{local.Close(full), full.lastError})) << "forgets the error of before";
    EXPECT_EQ(kFailed, (Outcome{local.Read(directory, 1, &byte, &delivered, kFileReadFlagsNone), directory.lastError}));
    EXPECT_EQ(0u, delivered);
    EXPECT_TRUE(local.Close(directory));
}

TEST_F(LocalFileSystemPosixTest, AFailedCloseRecordsItsError) {
    FileSystemEntry entry = Entry(".");
    ASSERT_TRUE(Open(entry, kFilePermissionRead));
    close(GetDescriptor(entry)); // so that the back end's close fails
    EXPECT_FALSE(local.Close(entry));
    EXPECT_EQ(nullptr, entry.handlerState);
    EXPECT_EQ(kFileSystemErrorUnknown, entry.lastError);
}

TEST(LocalFileSystemPosixCalls, ErrnoHasItsFileSystemError) {
    const std::map<int, FileSystemError> kErrors = {{0, kFileSystemErrorNone},
                                                    {ENOENT, kFileSystemErrorNotFound},
                                                    {EEXIST, kFileSystemErrorAlreadyExists},
                                                    {EPERM, kFileSystemErrorAccessDenied},
                                                    {EACCES, kFileSystemErrorAccessDenied},
                                                    {EXDEV, kFileSystemErrorCrossDevice},
                                                    {EIO, kFileSystemErrorUnknown}};
    for (const auto& [number, error] : kErrors)
        EXPECT_EQ(error, FileSystemErrorFromErrno(number)) << strerror(number);
}

TEST(LocalFileSystemPosixCalls, InterruptedCallsAreRepeated) {
    int calls = 0;
    const auto failThirdTime = [&] {
        ++calls;
        errno = calls < 3 ? EINTR : EIO;
        return -1;
    };
    EXPECT_EQ(-1, RepeatOnInterrupt(failThirdTime));
    EXPECT_EQ(3, calls);
}

TEST_F(LocalFileSystemPosixTest, QuestionsFollowLinksOrNot) {
    Run("printf 12345 > file; chmod 444 file; ln -s . folder; ln -s file link; ln -s nowhere dangling");
    struct {
        const char* name;
        bool exists = true, isFile = false, isDir = false, isSymLink = false, isReadOnly = false;
    } const kCases[] = {
        {.name = "file", .isFile = true, .isReadOnly = true},
        {.name = "folder", .isDir = true, .isSymLink = true},
        {.name = "link", .isFile = true, .isSymLink = true}, // whose own mode has all rights
        {.name = "dangling", .exists = false, .isSymLink = true},
        {.name = "none", .exists = false},
        {.name = "/dev/null", .isFile = true},
    };
    for (const auto& c : kCases) {
        const FileSystemEntry entry = Entry(c.name);
        EXPECT_EQ(c.exists, local.Exists(entry)) << c.name;
        EXPECT_EQ(c.isFile, local.IsFile(entry)) << c.name;
        EXPECT_EQ(c.isDir, local.IsDir(entry)) << c.name;
        EXPECT_EQ(c.isSymLink, local.IsSymLink(entry)) << c.name;
        EXPECT_EQ(c.isReadOnly, local.IsReadOnly(entry)) << c.name;
    }
}

TEST_F(LocalFileSystemPosixTest, SetLengthNeedsNoOpenFile) {
    Run("printf data > file");
    FileSystemEntry file = Entry("file"), none = Entry("none");
    EXPECT_TRUE(local.SetLength(file, 3));
    EXPECT_EQ("dat", ReadFile(file.path));
    EXPECT_TRUE(local.SetLength(file, 4));
    EXPECT_EQ(std::string("dat\0", 4), ReadFile(file.path));
    EXPECT_FALSE(local.SetLength(none, 3));
}

TEST_F(LocalFileSystemPosixTest, CreateAsDirRecordsItsError) {
    FileSystemEntry made = Entry("made"), deep = Entry("no/made");
    EXPECT_EQ(kDone, (Outcome{local.CreateAsDir(made), made.lastError}));
    EXPECT_EQ((Outcome{false, kFileSystemErrorAlreadyExists}), (Outcome{local.CreateAsDir(made), made.lastError}));
    EXPECT_EQ((Outcome{false, kFileSystemErrorNotFound}), (Outcome{local.CreateAsDir(deep), deep.lastError}));
}

TEST_F(LocalFileSystemPosixTest, SetReadOnlyGivesBackTheOwnersRightAlone) {
    Run("touch file; chmod 4766 file; ln -s file link");
    FileSystemEntry file = Entry("file"), link = Entry("link"), none = Entry("none");
    EXPECT_TRUE(local.SetReadOnly(file, true));
    EXPECT_EQ("4544", Mode("file"));
    EXPECT_TRUE(local.SetReadOnly(file, false));
    EXPECT_EQ("4744", Mode("file"));
    EXPECT_TRUE(local.SetReadOnly(link, true));
    EXPECT_EQ("555", Mode("file")) << "the link's own mode without the right to write";
    EXPECT_FALSE(local.SetReadOnly(none, true));
}

TEST_F(LocalFileSystemPosixTest, TimeStampsAreWholeSeconds) {
    Run("touch file");
    FileSystemEntry file = Entry("file"), none = Entry("none");
    const DateTime time{kUnixEpochTicks - 50'000'000}, finer{time.ticks - 9'999'999}; // rounded towards 1970
    EXPECT_TRUE(local.SetFileTimeStamp(file, finer));
    EXPECT_EQ(time.ticks, local.LastModified(file).ticks);
    EXPECT_TRUE(local.Touch(file));
    EXPECT_GT(local.LastModified(file).ticks, kUnixEpochTicks);
    EXPECT_FALSE(local.Touch(none));
    EXPECT_FALSE(local.SetFileTimeStamp(none, time));
}

TEST_F(LocalFileSystemPosixTest, ALockCreatesItsFile) {
    FileSystemEntry file = Entry("file");
    EXPECT_FALSE(local.IsLocked(file));
    EXPECT_TRUE(local.Lock(file, kFileLockExclusive));
    EXPECT_TRUE(IsThere("file"));
    EXPECT_TRUE(local.IsLocked(Entry("file")));
    EXPECT_TRUE(local.Lock(file, kFileLockUnlock));
    EXPECT_FALSE(local.IsLocked(file));
    EXPECT_EQ(nullptr, file.handlerState);
    EXPECT_FALSE(local.Lock(file, kFileLockUnlock)) << "it is closed";
}

TEST_F(LocalFileSystemPosixTest, ALockThatFailsClosesTheEntry) {
    Run("touch file");
    FileSystemEntry first = Entry("file"), second = Entry("file"), nowhere = Entry("no/file");
    EXPECT_TRUE(local.Lock(first, kFileLockExclusive));
    EXPECT_TRUE(Open(second, kFilePermissionRead));
    EXPECT_FALSE(local.Lock(second, kFileLockShared));
    EXPECT_EQ(nullptr, second.handlerState);
    EXPECT_FALSE(local.Lock(nowhere, kFileLockShared));
    EXPECT_EQ(nullptr, nowhere.handlerState);
    EXPECT_TRUE(local.Lock(first, kFileLockUnlock));
}

TEST_F(LocalFileSystemPosixTest, SharedLocksAreHeldTogether) {
    FileSystemEntry first = Entry("file"), second = Entry("file");
    EXPECT_TRUE(local.Lock(first, kFileLockExclusive));
    EXPECT_TRUE(local.Lock(first, kFileLockShared)) << "changes the lock that it has";
    EXPECT_TRUE(local.Lock(second, kFileLockShared));
    EXPECT_TRUE(local.Lock(second, kFileLockUnlock));
    EXPECT_TRUE(local.IsLocked(second));
    EXPECT_TRUE(local.Lock(first, kFileLockUnlock));
    EXPECT_FALSE(local.IsLocked(second));
}

TEST_F(LocalFileSystemPosixTest, AFolderIsLockedByAFileDirectlyInIt) {
    Run("mkdir -p sub/deeper; touch sub/deeper/file");
    FileSystemEntry file = Entry("sub/file");
    EXPECT_TRUE(local.Lock(file, kFileLockExclusive));
    EXPECT_TRUE(local.IsLocked(Entry("sub/file")));
    EXPECT_TRUE(local.IsLocked(Entry("sub")));
    EXPECT_FALSE(local.IsLocked(Entry("sub/deeper")));
    EXPECT_TRUE(local.Lock(file, kFileLockUnlock));
}

TEST_F(LocalFileSystemPosixTest, AFileThatCantBeOpenedIsLocked) {
    Run("touch file; chmod 0 file");
    WorkAsAnyUser();
    EXPECT_TRUE(local.IsLocked(Entry("file")));
}

TEST_F(LocalFileSystemPosixTest, CopiesContentsAndMode) {
    struct {
        const char *size, *mode;
    } const kCases[] = {{"200001", "614"}, {"65536", "604"}, {"0", "604"}, {"65535", "674"}, {"1", "614"}};
    FileSystemEntry from = Entry("from"), to = Entry("to");
    for (const auto& c : kCases) {
        Run(std::string("head -c ") + c.size + " /dev/urandom > from; chmod " + c.mode + " from");
        EXPECT_TRUE(local.Copy(from, to)) << c.size;
        EXPECT_EQ(Mode("from"), Mode("to")) << c.size;
        EXPECT_TRUE(ReadFile(from.path) == ReadFile(to.path)) << c.size << " bytes"; // too many to print
    }
}

TEST_F(LocalFileSystemPosixTest, RefusesCopiesThatCantBeWhole) {
    Run("printf data > from; mkdir sub; ln -s from link; ln from hard");
    struct {
        const char *from, *to;
    } const kCases[] = {{"from", "from"}, {"from", "link"}, {"link", "hard"},
                        {"none", "x"},    {"hard", "no/x"}, {"sub", "x"}};
    for (const auto& c : kCases) {
        FileSystemEntry from = Entry(c.from), to = Entry(c.to);
        EXPECT_FALSE(local.Copy(from, to)) << c.from << " to " << c.to;
    }
    EXPECT_EQ("data", ReadFile(folder / "from"));
}

TEST_F(LocalFileSystemPosixTest, ACopyAsksTheOpenFileForItsSize) {
    struct OpenFilesOnly : LocalFileSystemPosix {
        OpenFilesOnly() { GetFileSystem()->RegisterHandler(this); }
        ~OpenFilesOnly() override { GetFileSystem()->UnregisterHandler(this); }
        VFS::FileSize Size(const FileEntryData& entry) const override {
            return entry.handlerState != nullptr ? LocalFileSystemPosix::Size(entry) : VFS::FileSize();
        }
    } handler;
    Run("printf data > from");
    FileSystemEntry from = Entry("from"), to = Entry("to");
    EXPECT_TRUE(handler.Copy(from, to));
    EXPECT_EQ("data", ReadFile(to.path));
}

TEST_F(LocalFileSystemPosixTest, AMissingTargetForTheModeIsRecorded) {
    Run("touch from");
    const FileSystemEntry from = Entry("from"), none = Entry("none");
    EXPECT_FALSE(LocalFileSystemPosix::SynchronizeMode(from, none));
    EXPECT_EQ(kFileSystemErrorNotFound, none.lastError);
    EXPECT_FALSE(LocalFileSystemPosix::SynchronizeMode(none, from));
    EXPECT_EQ(kFileSystemErrorNone, from.lastError);
}

TEST_F(LocalFileSystemPosixTest, AMoveRecordsItsErrorInItsSource) {
    Run("printf data > from; printf old > to; mkdir sub");
    struct {
        const char *from, *to;
        FileSystemError error;
    } const kCases[] = {
        {.from = "none", .to = "x", .error = kFileSystemErrorNotFound},
        {.from = "from", .to = "no/x", .error = kFileSystemErrorNotFound},
        {.from = "sub", .to = "to", .error = kFileSystemErrorUnknown},
        {.from = "/proc/self/mem", .to = "x", .error = kFileSystemErrorCrossDevice},
        {.from = "from", .to = "to", .error = kFileSystemErrorNone},
    };
    for (const auto& c : kCases) {
        FileSystemEntry from = Entry(c.from), to = Entry(c.to);
        EXPECT_EQ(c.error == kFileSystemErrorNone, local.AtomicMove(from, to)) << c.from << " to " << c.to;
        EXPECT_EQ(c.error, from.lastError) << c.from << " to " << c.to;
    }
    EXPECT_FALSE(IsThere("from"));
    EXPECT_EQ("data", ReadFile(folder / "to"));
}

TEST(LocalFileSystemPosixPaths, ParentAndFilenameSplitAPath) {
    struct {
        const char* path;
        bool hasParent;
        const char *parent, *filename;
    } const kCases[] = {
        {.path = "plain", .hasParent = false, .parent = "unchanged", .filename = "plain"},
        {.path = "/", .hasParent = false, .parent = "unchanged", .filename = ""},
        {.path = "/a", .hasParent = true, .parent = "", .filename = "a"},
        {.path = "/a/b\\c/", .hasParent = true, .parent = "/a/b", .filename = ""},
        {.path = "a\\b", .hasParent = true, .parent = "a", .filename = "b"},
    };
    const LocalFileSystemPosix local;
    for (const auto& c : kCases) {
        FileEntryData entry; // FileSystemEntry would convert the backslashes
        strcpy(entry.path, c.path);
        core::string parent("unchanged");
        EXPECT_EQ(c.hasParent, local.Parent(entry, parent)) << c.path;
        EXPECT_STREQ(c.parent, parent.c_str()) << c.path;
        EXPECT_STREQ(c.filename, local.Filename(entry)) << c.path;
    }
}

TEST_F(LocalFileSystemPosixTest, ToLocalGivesTheWholeFile) {
    Run("printf data > file");
    core::string path;
    VFS::FileSize offset = 7, size;
    EXPECT_TRUE(local.ToLocal(Entry("file"), path, offset, size));
    EXPECT_EQ(folder / "file", path.c_str());
    EXPECT_EQ(0u, offset.Cast<UInt64>());
    EXPECT_EQ(4u, size.Cast<UInt64>());
    EXPECT_FALSE(local.ToLocal(Entry("none"), path, offset, size));
}

TEST_F(LocalFileSystemPosixTest, ATildeIsTheHomeFolder) {
    setenv("HOME", folder.Path().c_str(), 1);
    const LocalFileSystemPosix atHome;
    EXPECT_EQ(folder.Path(), atHome.ToAbsolute("~").c_str());
    EXPECT_EQ(folder / "x", atHome.ToAbsolute("~/x").c_str());
    EXPECT_EQ(folder.Path() + "x", atHome.ToAbsolute("~x").c_str());
    unsetenv("HOME");
    EXPECT_STRNE("", LocalFileSystemPosix().ToAbsolute("~").c_str()) << "of the real user";
}

TEST_F(LocalFileSystemPosixTest, UserFoldersAreCreatedAndPrinted) {
    const std::string config = folder / ".config/zarvo3d";
    const ConsoleCapture console;
    setenv("HOME", folder.Path().c_str(), 1);
    Run("mkdir .config");
    EXPECT_EQ(config + "/Caches", local.GetUserAppCacheFolder().c_str());
    EXPECT_EQ("700", Mode(config));
    EXPECT_TRUE(IsThere(config + "/Caches"));
    EXPECT_EQ("Creating user config folder: " + config + "\n", console.Text());
    unsetenv("HOME");
    EXPECT_STREQ("", local.GetUserAppCacheFolder().c_str());
}

TEST_F(LocalFileSystemPosixTest, AFailedDiskSpaceQueryIsPrinted) {
    const ConsoleCapture console;
    UInt64 bytes = 7;
    EXPECT_FALSE(local.GetAvailableDiskSpace("/missing", bytes));
    EXPECT_EQ(7u, bytes);
    EXPECT_EQ("statvfs failed with errno=2; path was /missing\n", console.Text());
    EXPECT_TRUE(local.GetAvailableDiskSpace("/", bytes));
    EXPECT_GT(bytes, 7u);
}

TEST(LocalFileSystemPosixPaths, FlagsSkipNames) {
    constexpr bool kFile = false, kDirectory = true;
    struct {
        FileEnumerationFlag flag;
        bool isFolder, isHidden;
        const char* name;
        bool isSkipped;
    } const kCases[] = {
        {kFileEnumerationAll, kFile, true, ".a", false},
        {kFileEnumerationSkipHiddenFiles, kFile, true, ".a", true},
        {kFileEnumerationSkipHiddenFiles, kFile, false, "a", false},
        {kFileEnumerationSkipHiddenFiles, kDirectory, true, ".a", false},
        {kFileEnumerationSkipHiddenFolders, kDirectory, true, ".a", true},
        {kFileEnumerationSkipHiddenFolders, kDirectory, false, "a", false},
        {kFileEnumerationSkipHiddenFolders, kFile, true, ".a", false},
        {kFileEnumerationSkipFiles, kFile, false, "a", true},
        {kFileEnumerationSkipFiles, kFile, true, ".a", false},
        {kFileEnumerationSkipFolders, kDirectory, false, "a", true},
        {kFileEnumerationSkipFolders, kFile, false, "a", false},
        {kFileEnumerationSkipByName, kDirectory, true, ".git", true},
        {kFileEnumerationSkipByName, kFile, false, "backup~", true},
        {kFileEnumerationSkipByName, kDirectory, false, "CVS", true},
        {kFileEnumerationSkipByName, kFile, false, "cvs2", false},
        {kFileEnumerationSkipTemporary, kFile, false, "notes.TMP", true},
        {kFileEnumerationSkipTemporary, kDirectory, false, "x.tmp", false},
        {kFileEnumerationSkipTemporary, kFile, false, "tmp", false},
    };
    for (const auto& c : kCases)
        EXPECT_EQ(c.isSkipped, FlaggedAsSkipped(c.isFolder, c.isHidden, c.name, c.flag)) << c.name << " " << c.flag;
}
