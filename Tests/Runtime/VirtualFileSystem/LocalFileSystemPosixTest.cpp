#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ReportRecorder.h"

#include <algorithm>
#include <fcntl.h>
#include <functional>

// Counts this program's calls of stat, which it replaces.
static int gStatCalls = 0;
extern "C" int stat(const char* path, struct stat* status) noexcept {
    ++gStatCalls;
    return fstatat(AT_FDCWD, path, status, 0);
}

class LocalFileSystemPosixTest : public LocalDiskTest {
protected:
    bool DeleteTree(const char* name, bool isRecursive = true) const {
        return GetFileSystem()->Delete((folder / name).c_str(), isRecursive);
    }

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

    // The sorted listing of the folder, with paths below it. Folders have size 0, as their real size is the disk's.
    std::vector<Listed> List(UInt32 flags = kFileEnumerationAll) const {
        dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
        const std::string top = folder / ""; // ends in "/"
        EXPECT_TRUE(local.Enumerate(top.c_str(), &list, true, nullptr, FileEnumerationFlag(flags)));
        std::vector<Listed> listed;
        for (size_t index = 0; index < list.size(); ++index) {
            const bool isFolder = (list[index].flags & kFileEntryIsDirectory) != 0;
            listed.push_back({list[index].path + top.size(), isFolder ? 0 : list[index].size, list[index].flags});
        }
        std::sort(listed.begin(), listed.end(), [](const Listed& a, const Listed& b) { return a.path < b.path; });
        return listed;
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
        if (c.contents != nullptr) {
            EXPECT_EQ(c.contents, ReadFile(entry.path));
        }
    }
}

TEST_F(LocalFileSystemPosixTest, ClosingAFailedOpenKeepsItsError) {
    FileSystemEntry entry = Entry("none");
    EXPECT_FALSE(Open(entry, kFilePermissionRead));
    EXPECT_TRUE(local.Close(entry));
    EXPECT_EQ(nullptr, entry.handlerState);
    EXPECT_EQ(kFileSystemErrorNotFound, entry.lastError);
}

TEST_F(LocalFileSystemPosixTest, SeeksFromEachOrigin) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, kFilePermissionRead));
    struct {
        SInt64 offset;
        FileOrigin origin;
        const char* rest; // what is left to read from there
    } const kCases[] = {
        {.offset = 6, .origin = kFileOriginBegin, .rest = "6789"},
        {.offset = -3, .origin = kFileOriginEnd, .rest = "789"},
        {.offset = 2, .origin = kFileOriginEnd, .rest = "failed"},
        {.offset = -4, .origin = kFileOriginCurrent, .rest = "89"}, // from 12, which is past the end
    };
    for (const auto& c : kCases) {
        EXPECT_TRUE(local.Seek(entry, c.offset, c.origin)) << c.offset << " from " << c.origin;
        EXPECT_EQ(c.rest, Read(entry, 16)) << c.offset << " from " << c.origin;
    }
    EXPECT_FALSE(local.Seek(entry, -1, kFileOriginBegin));
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, AnUnknownOriginIsReportedAndTheBegin) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, kFilePermissionRead));
    for (const int origin : {0, 4}) {
        ReportRecorder reports;
        EXPECT_TRUE(local.Seek(entry, 8, FileOrigin(origin)));
        const std::vector<std::string> texts = reports.Take();
        ASSERT_EQ(1u, texts.size()) << origin;
        EXPECT_TRUE(texts[0].ends_with(": unknown file origin enum")) << texts[0];
        EXPECT_EQ("89", Read(entry, 16)) << origin;
    }
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, PositionedTransfersMoveThePosition) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, kFilePermissionReadWrite));
    UInt64 count = 0;
    EXPECT_EQ("23", ReadAt(entry, 2, 2));
    EXPECT_EQ(4u, local.Position(entry).Cast<UInt64>());
    EXPECT_TRUE(local.Write(entry, 8, 1, "X", &count));
    EXPECT_EQ(9u, local.Position(entry).Cast<UInt64>());
    EXPECT_EQ("X9", ReadAt(entry, 8, 2));
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, ReadsItsPositionWhoeverMovesTheFile) {
    Run("printf 0123456789 > file");
    struct {
        const char* mover;
        std::function<bool(FileSystemEntry&)> move;
    } const kCases[] = {
        {.mover = "nobody", .move = [](FileSystemEntry&) { return true; }},
        {.mover = "a read of the descriptor",
         .move =
             [](FileSystemEntry& entry) {
                 char byte;
                 return read(GetDescriptor(entry), &byte, 1) == 1;
             }},
        {.mover = "a read in a fork",
         .move = [&](FileSystemEntry& entry) { return IsTrueForAnyUser([&] { return Read(entry, 2) == "23"; }); }},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.mover);
        FileSystemEntry entry = Entry("file");
        ASSERT_TRUE(Open(entry, kFilePermissionRead));
        EXPECT_EQ("01", ReadAt(entry, 0, 2));
        EXPECT_TRUE(c.move(entry));
        EXPECT_EQ("23", ReadAt(entry, 2, 2));
        EXPECT_TRUE(local.Close(entry));
    }
}

TEST_F(LocalFileSystemPosixTest, AFailedReadRecordsItsError) {
    FileSystemEntry entry = Entry(".");
    ASSERT_TRUE(Open(entry, kFilePermissionRead));
    char byte;
    UInt64 count = 99;
    EXPECT_FALSE(local.Read(entry, 1, &byte, &count, kFileReadFlagsNone));
    EXPECT_EQ(0u, count);
    EXPECT_EQ(kFileSystemErrorUnknown, entry.lastError);
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, AFailedWriteRecordsItsError) {
    FileSystemEntry entry = Entry("/dev/full");
    ASSERT_TRUE(Open(entry, kFilePermissionWrite));
    UInt64 count = 99;
    EXPECT_FALSE(local.Write(entry, 1, "X", &count));
    EXPECT_EQ(0u, count);
    EXPECT_EQ(kFileSystemErrorUnknown, entry.lastError);
    EXPECT_TRUE(local.Close(entry));
    EXPECT_EQ(kFileSystemErrorNone, entry.lastError);
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
    struct {
        int number;
        FileSystemError error;
    } const kCases[] = {
        {0, kFileSystemErrorNone},
        {ENOENT, kFileSystemErrorNotFound},
        {EEXIST, kFileSystemErrorAlreadyExists},
        {EPERM, kFileSystemErrorAccessDenied},
        {EACCES, kFileSystemErrorAccessDenied},
        {EXDEV, kFileSystemErrorCrossDevice},
        {EIO, kFileSystemErrorUnknown},
    };
    for (const auto& c : kCases)
        EXPECT_EQ(c.error, FileSystemErrorFromErrno(c.number)) << strerror(c.number);
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

TEST_F(LocalFileSystemPosixTest, AQueryFillsWhatItReports) {
    constexpr UInt32 kAlways = kFileEntryQueryHidden;
    constexpr UInt32 kStatus = kFileEntryQueryDirectory | kFileEntryQuerySize | kFileEntryQueryLastModified;
    constexpr int kForeignBits = 0xF0; // not the operation's
    Run("printf 12345 > file; chmod 444 file; ln -s file link; ln -s nowhere dangling");
    struct {
        const char* name;
        UInt32 query, answer;
        int flags; // without the foreign bits
    } const kCases[] = {
        {".", kFileEntryQueryExists | kFileEntryQueryDirectory, kAlways | kStatus | kFileEntryQueryExists,
         kFileEntryIsDirectory},
        {".", kFileEntryQueryDirectory, kAlways | kStatus, kFileEntryIsDirectory},
        {".", kFileEntryQueryExists, kAlways | kFileEntryQueryExists, 0},
        {".", kFileEntryQueryNone, kAlways, 0},
        {"file", kFileEntryQuerySize, kAlways | kStatus, 0},
        {"file", kFileEntryQuerySymLink, kAlways | kStatus | kFileEntryQuerySymLink, 0},
        {"file", kFileEntryQueryReadOnly, kAlways | kStatus | kFileEntryQueryReadOnly, kFileEntryIsReadOnly},
        {"link", kFileEntryQuerySymLink | kFileEntryQueryReadOnly,
         kAlways | kStatus | kFileEntryQuerySymLink | kFileEntryQueryReadOnly,
         kFileEntryIsSymLink | kFileEntryIsReadOnly},
        {"none", kFileEntryQueryExists | kFileEntryQueryDirectory, kFileEntryQueryNone, kFileEntryIsHidden},
        {"none", kFileEntryQueryDirectory, kAlways, 0},
        {"dangling", kFileEntryQuerySymLink | kFileEntryQueryReadOnly, kAlways, 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << c.name << ", query " << c.query);
        FileEntryInfo info;
        info.flags = kForeignBits | kFileEntryIsHidden;
        const FileSystemEntry entry = Entry(c.name);
        EXPECT_EQ(c.answer, local.GetFileEntryInfo(entry, info, FileEntryInfoQueryFlags(c.query)));
        EXPECT_EQ(kForeignBits | c.flags, info.flags);
        const bool isFilled = (c.answer & kFileEntryQuerySize) != 0;
        EXPECT_EQ(isFilled ? local.Size(entry) : VFS::FileSize(), info.size);
        EXPECT_EQ(isFilled ? local.LastModified(entry) : DateTime(), info.lastModified);
    }
}

TEST_F(LocalFileSystemPosixTest, CreateAsDirRecordsItsError) {
    FileSystemEntry made = Entry("made"), deep = Entry("no/made");
    EXPECT_EQ(kDone, (Outcome{local.CreateAsDir(made), made.lastError}));
    EXPECT_EQ((Outcome{false, kFileSystemErrorAlreadyExists}), (Outcome{local.CreateAsDir(made), made.lastError}));
    EXPECT_EQ((Outcome{false, kFileSystemErrorNotFound}), (Outcome{local.CreateAsDir(deep), deep.lastError}));
}

TEST_F(LocalFileSystemPosixTest, CreateAsFileLeavesAFileThatExists) {
    FileSystemEntry file = Entry("file"), deep = Entry("no/made");
    EXPECT_TRUE(local.CreateAsFile(file));
    EXPECT_TRUE(local.SetLength(file, 3));
    EXPECT_FALSE(local.CreateAsFile(file));
    EXPECT_EQ(3u, local.Size(file).Cast<UInt64>());
    EXPECT_FALSE(local.CreateAsFile(deep));
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

TEST_F(LocalFileSystemPosixTest, DeletesAFullFolderOnlyRecursively) {
    Run("mkdir -p tree/.sub/$(printf '\\377'); touch tree/.sub/$(printf %0255d 0)");
    EXPECT_FALSE(DeleteTree("tree", false));
    EXPECT_TRUE(IsThere("tree/.sub"));
    EXPECT_TRUE(DeleteTree("tree"));
    EXPECT_FALSE(IsThere("tree"));
}

TEST_F(LocalFileSystemPosixTest, DeletesLinksButNotTheirTargets) {
    Run("mkdir kept tree; touch kept/file; ln -s kept link");
    Run("ln -s ../kept tree/link; ln -s . tree/loop; ln -s nowhere tree/dangling");
    EXPECT_TRUE(DeleteTree("tree"));
    EXPECT_FALSE(IsThere("tree"));
    EXPECT_TRUE(DeleteTree("link/"));
    EXPECT_FALSE(IsThere("link"));
    EXPECT_TRUE(IsThere("kept/file"));
}

TEST_F(LocalFileSystemPosixTest, DeletesNothingOutsideThroughABackslash) {
    Run("mkdir -p kept odd; touch kept/file 'odd/..\\kept'");
    EXPECT_FALSE(DeleteTree("odd"));
    EXPECT_TRUE(IsThere("kept/file"));
}

TEST_F(LocalFileSystemPosixTest, DeletesWhatItCanOfAFolder) {
    Run("mkdir -p theirs/sub; touch theirs/file theirs/sub/file; chmod 777 theirs; chmod 555 theirs/sub");
    EXPECT_FALSE(IsTrueForAnyUser([&] { return DeleteTree("theirs"); }));
    EXPECT_FALSE(IsThere("theirs/file"));
    EXPECT_TRUE(IsThere("theirs/sub/file"));
}

TEST_F(LocalFileSystemPosixTest, LeavesChildrenWhosePathsAreCut) {
    struct {
        size_t room; // that the folder's path leaves in an entry
        bool isShortNameLeft;
    } const kCases[] = {
        {.room = 9, .isShortNameLeft = false}, // a separator and 8 characters
        {.room = 1, .isShortNameLeft = true},
        {.room = 0, .isShortNameLeft = true},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.room);
        std::string path = folder / "deep/";
        while (path.size() < kMaxPathLength - c.room)
            path += path.size() % 100 == 0 ? '/' : 'd';
        Run("mkdir -p " + path + "; touch " + path + "/12345678 " + path + "/123456789");
        EXPECT_FALSE(DeleteTree("deep"));
        Run("cd " + path + "; test -e 123456789; test " + (c.isShortNameLeft ? "" : "!") + " -e 12345678");
        Run("cd " + path + "; rm -f 12345678 123456789");
        EXPECT_TRUE(DeleteTree("deep"));
    }
}

TEST_F(LocalFileSystemPosixTest, ListsAndDeletesDeepAndWideTrees) {
    Run("mkdir -p deep$(printf '/d%.0s' $(seq 199)) wide; cd wide; seq 10000 | xargs touch");
    EXPECT_EQ(200u + 1 + 10'000, List().size());
    EXPECT_TRUE(DeleteTree("deep"));
    EXPECT_TRUE(DeleteTree("wide"));
    EXPECT_EQ(std::vector<Listed>(), List());
}

TEST_F(LocalFileSystemPosixTest, DeletingAsksOncePerFile) {
    constexpr int kFiles = 100, kFolders = 2;
    Run("mkdir -p tree/sub; cd tree; touch $(seq 100)");
    gStatCalls = 0;
    EXPECT_TRUE(DeleteTree("tree"));
    EXPECT_EQ(kFiles + kFolders + 2, gStatCalls) << "2 to compare the listing's folder with the tree";
}

TEST_F(LocalFileSystemPosixTest, ALockCreatesItsFile) {
    FileSystemEntry file = Entry("file");
    EXPECT_FALSE(local.IsLocked(file));
    EXPECT_TRUE(local.Lock(file, kFileLockExclusive));
    EXPECT_TRUE(IsThere("file"));
    EXPECT_TRUE(local.IsLocked(Entry("file")));
    EXPECT_TRUE(local.Lock(file, kFileLockUnlock));
    EXPECT_EQ(nullptr, file.handlerState);
    EXPECT_FALSE(local.IsLocked(file));
}

TEST_F(LocalFileSystemPosixTest, ALockThatFailsClosesTheEntry) {
    Run("touch file");
    FileSystemEntry first = Entry("file"), second = Entry("file");
    EXPECT_TRUE(local.Lock(first, kFileLockExclusive));
    EXPECT_TRUE(Open(second, kFilePermissionRead));
    EXPECT_FALSE(local.Lock(second, kFileLockShared));
    EXPECT_EQ(nullptr, second.handlerState);
    EXPECT_TRUE(local.Lock(first, kFileLockUnlock));
}

TEST_F(LocalFileSystemPosixTest, AnOpenThatFailsForALockIsClosed) {
    FileSystemEntry nowhere = Entry("no/file");
    EXPECT_FALSE(local.Lock(nowhere, kFileLockShared));
    EXPECT_EQ(nullptr, nowhere.handlerState);
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

TEST_F(LocalFileSystemPosixTest, UnlockingAClosedEntryFails) {
    FileSystemEntry file = Entry("file");
    EXPECT_FALSE(local.Lock(file, kFileLockUnlock));
}

TEST_F(LocalFileSystemPosixTest, AFolderIsLockedByAFileDirectlyInIt) {
    Run("mkdir -p sub/deeper; touch sub/deeper/file");
    FileSystemEntry file = Entry("sub/file");
    EXPECT_TRUE(local.Lock(file, kFileLockExclusive));
    // The paths that are asked are relative to the process's working directory.
    const auto isLocked = [&](const char* name) {
        return IsTrueForAnyUser([&] { return chdir(folder.Path().c_str()) == 0 && local.IsLocked(Entry(name)); });
    };
    EXPECT_TRUE(isLocked("sub/file"));
    EXPECT_TRUE(isLocked("sub"));
    EXPECT_FALSE(isLocked("sub/deeper"));
    EXPECT_TRUE(local.Lock(file, kFileLockUnlock));
}

TEST_F(LocalFileSystemPosixTest, AFileThatCantBeOpenedIsLocked) {
    Run("touch file; chmod 0 file");
    EXPECT_TRUE(IsTrueForAnyUser([&] { return local.IsLocked(Entry("file")); }));
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

TEST_F(LocalFileSystemPosixTest, TargetResolvesEveryLink) {
    Run("mkdir sub; ln -s sub/../second first; ln -s sub second; ln -s nowhere dangling");
    FileSystemEntry target;
    EXPECT_TRUE(local.Target(Entry("first/./"), target));
    EXPECT_EQ(folder / "sub", target.Path());
    EXPECT_FALSE(local.Target(Entry("dangling"), target));
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

TEST_F(LocalFileSystemPosixTest, AListingTellsKindsAndSizes) {
    Run("mkdir sub; printf 12345 > sub/file; chmod 444 sub/file; printf 1 > $(printf '\\377x'); touch .hidden");
    Run("ln -s nowhere dangling; ln -s sub/file link; ln -s self self");
    const std::vector<Listed> kExpected = {
        {.path = ".hidden", .flags = kFileEntryIsHidden},
        {.path = "dangling", .flags = kFileEntryIsSymLink},
        {.path = "link", .size = 5, .flags = kFileEntryIsSymLink | kFileEntryIsReadOnly},
        {.path = "self", .flags = kFileEntryIsSymLink},
        {.path = "sub", .flags = kFileEntryIsDirectory},
        {.path = "sub/file", .size = 5, .flags = kFileEntryIsReadOnly},
        {.path = "\xFFx", .size = 1},
    };
    EXPECT_EQ(kExpected, List());
}

TEST_F(LocalFileSystemPosixTest, AListingTellsTimes) {
    Run("touch -d 2001-02-03 file; ln -s file link; ln -s nowhere dangling");
    dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
    EXPECT_TRUE(local.Enumerate(folder.Path().c_str(), &list, false, nullptr, kFileEnumerationAll));
    EXPECT_EQ(3u, list.size());
    for (size_t index = 0; index < list.size(); ++index)
        EXPECT_EQ(local.LastModified(Entry(list[index].path)).ticks, list[index].lastModified.ticks)
            << list[index].path; // 0 for the dangling link
}

// One loop a listing: with two, a listing that does not end takes too long to fail.
TEST_F(LocalFileSystemPosixTest, AListingEndsInALoopOfLinks) {
    const int kLink = kFileEntryIsDirectory | kFileEntryIsSymLink;
    for (const char* target : {".", ".."}) {
        SCOPED_TRACE(target);
        Run(std::string("rm -rf a; mkdir a; touch a/file; ln -s ") + target + " a/loop");
        const std::vector<Listed> kExpected = {
            {.path = "a", .flags = kFileEntryIsDirectory}, {.path = "a/file"}, {.path = "a/loop", .flags = kLink}};
        EXPECT_EQ(kExpected, List());
    }
}

TEST_F(LocalFileSystemPosixTest, ALinkToAFolderIsListedInto) {
    Run("mkdir a; touch a/file; ln -s a b");
    const std::vector<Listed> kExpected = {
        {.path = "a", .flags = kFileEntryIsDirectory},
        {.path = "a/file"},
        {.path = "b", .flags = kFileEntryIsDirectory | kFileEntryIsSymLink},
        {.path = "b/file"},
    };
    EXPECT_EQ(kExpected, List());
}

TEST_F(LocalFileSystemPosixTest, AListingKeepsWhatItHasWhenItFails) {
    Run("mkdir shut; chmod 0 shut");
    const auto listAsAnyUser = [&](auto test) {
        return IsTrueForAnyUser([&] {
            dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
            const bool answer = local.Enumerate(folder.Path().c_str(), &list, true, nullptr, kFileEnumerationAll);
            return test(answer, list.size());
        });
    };
    EXPECT_TRUE(listAsAnyUser([](bool answer, size_t) { return !answer; }));
    EXPECT_TRUE(listAsAnyUser([](bool, size_t count) { return count == 1; }));
}

TEST(LocalFileSystemPosixPaths, FlagsSkipNames) {
    constexpr bool kFile = false, kFolder = true;
    struct {
        FileEnumerationFlag flag;
        bool isFolder, isHidden;
        const char* name;
        bool isSkipped;
    } const kCases[] = {
        {kFileEnumerationAll, kFile, true, ".a", false},
        {kFileEnumerationSkipHiddenFiles, kFile, true, ".a", true},
        {kFileEnumerationSkipHiddenFiles, kFile, false, "a", false},
        {kFileEnumerationSkipHiddenFiles, kFolder, true, ".a", false},
        {kFileEnumerationSkipHiddenFolders, kFolder, true, ".a", true},
        {kFileEnumerationSkipHiddenFolders, kFolder, false, "a", false},
        {kFileEnumerationSkipHiddenFolders, kFile, true, ".a", false},
        {kFileEnumerationSkipFiles, kFile, false, "a", true},
        {kFileEnumerationSkipFiles, kFile, true, ".a", false},
        {kFileEnumerationSkipFolders, kFolder, false, "a", true},
        {kFileEnumerationSkipFolders, kFile, false, "a", false},
        {kFileEnumerationSkipByName, kFolder, true, ".git", true},
        {kFileEnumerationSkipByName, kFile, false, "backup~", true},
        {kFileEnumerationSkipByName, kFolder, false, "CVS", true},
        {kFileEnumerationSkipByName, kFile, false, "cvs2", false},
        {kFileEnumerationSkipTemporary, kFile, false, "notes.TMP", true},
        {kFileEnumerationSkipTemporary, kFolder, false, "x.tmp", false},
        {kFileEnumerationSkipTemporary, kFile, false, "tmp", false},
    };
    for (const auto& c : kCases)
        EXPECT_EQ(c.isSkipped, FlaggedAsSkipped(c.isFolder, c.isHidden, c.name, c.flag)) << c.name << " " << c.flag;
}

TEST_F(LocalFileSystemPosixTest, ASkippedFolderIsNotListedInto) {
    Run("mkdir -p CVS sub; touch CVS/in sub/in sub/n.tmp");
    const std::vector<Listed> kExpected = {{.path = "sub", .flags = kFileEntryIsDirectory}, {.path = "sub/in"}};
    EXPECT_EQ(kExpected, List(kFileEnumerationSkipByName | kFileEnumerationSkipTemporary));
}

TEST_F(LocalFileSystemPosixTest, SumsTheSizesOfFiles) {
    Run("mkdir sub; printf 12345 > sub/file; printf 12345 > file; ln -s nowhere dangling");
    ReportRecorder reports;
    UInt64 total = 0;
    void* counter = &total;
    EXPECT_TRUE(local.Enumerate(folder.Path().c_str(), nullptr, true, &counter, kFileEnumerationSumSizes));
    EXPECT_EQ(10u, total);
    EXPECT_EQ(2u, reports.Take().size()) << "one for each folder";
}

TEST_F(LocalFileSystemPosixTest, SummingWithoutACounterIsReported) {
    Run("touch file");
    ReportRecorder reports;
    EXPECT_TRUE(local.Enumerate(folder.Path().c_str(), nullptr, true, nullptr, kFileEnumerationSumSizes));
    const std::vector<std::string> texts = reports.Take();
    ASSERT_EQ(2u, texts.size());
    EXPECT_TRUE(texts[1].ends_with(": Assertion failed on expression: 'handlerData != NULL'")) << texts[1];
}
