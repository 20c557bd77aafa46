#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ReportRecorder.h"

#include <fcntl.h>
#include <functional>
#include <map>

// Counts what this program asks the system's stat, in place of which it stands.
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
    // What a listing of the folder holds, by the names below it.
    std::map<std::string, FileEntryInfo> List(bool isListed = true, UInt32 flags = 0) const {
        dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
        const std::string path = folder / ""; // whose "/" is not doubled
        EXPECT_EQ(isListed, local.Enumerate(path.c_str(), &list, true, nullptr, FileEnumerationFlag(flags)));
        std::map<std::string, FileEntryInfo> infos;
        for (size_t index = 0; index < list.size(); ++index)
            EXPECT_TRUE(infos.emplace(list[index].path + path.size(), list[index]).second) << list[index].path;
        return infos;
    }
};

TEST_F(LocalFileSystemPosixTest, OpeningFollowsThePermission) {
    // "old" holds 4 bytes, "new" is missing; the contents are those once "X" has been written, if it could be.
    const std::tuple<int, const char*, UInt32, UInt64, const char*> kCases[] = {
        {0, "old", 0, 0, "data"}, {0, "new", 1, 0, ""},      {1, "old", 0, 0, "X"},
        {1, "new", 0, 0, "X"},    {2, "old", 0, 0, "Xata"},  {2, "new", 0, 0, "X"},
        {2, ".", 14, 0, ""},      {3, "old", 0, 4, "dataX"}, {3, "new", 0, 0, "X"}};
    for (const auto& [permission, name, error, position, contents] : kCases) {
        SCOPED_TRACE(testing::Message() << name << ", permission " << permission);
        Run("printf data > old; rm -f new");
        FileSystemEntry entry = Entry(name);
        UInt64 byte = 0, count = 99;
        EXPECT_TRUE(Open(entry, permission) == (error == 0) && entry.lastError == error);
        EXPECT_TRUE(local.Position(entry) == position && local.Seek(entry, 0, kFileOriginBegin) == (error == 0));
        EXPECT_EQ(permission != 0 && error == 0, local.Write(entry, 1, "X", &count)); // at the end when appending
        EXPECT_EQ(permission % 2 == 0 && error == 0, local.Read(entry, 0, 1, &byte, &count, kFileReadFlagsNone));
        EXPECT_TRUE(local.Close(entry) && entry.handlerState == nullptr && entry.lastError == error);
        EXPECT_EQ(contents, error == 0 ? ReadFile(folder / name) : "");
    }
}

TEST_F(LocalFileSystemPosixTest, ReadsAndSeeksGoWhereTheySay) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, 0));
    ReportRecorder reports;
    const std::tuple<SInt64, int, std::string> kCases[] = {
        {6, 1, "6789"}, {-3, 3, "789"}, {2, 3, ""}, {-4, 2, "89"}, {-1, 1, ""}, {9, 0, "9"}, {5, 4, "56789"}};
    for (const auto& [offset, origin, rest] : kCases) {
        char buffer[16] = {};
        UInt64 count = 99;
        EXPECT_EQ(offset != -1, local.Seek(entry, offset, static_cast<FileOrigin>(origin)));
        const bool isRead = local.Read(entry, sizeof(buffer), buffer, &count, kFileReadFlagsNone);
        EXPECT_EQ(rest, isRead ? std::string(buffer, count) : "") << offset << " from " << origin;
    }
    EXPECT_TRUE(reports.Take().size() == 2 && local.Close(entry)); // of the origins that there are not
    // Wherever the calls before have left the position.
    char buffer[2] = {};
    UInt64 count = 0;
    ASSERT_TRUE(Open(entry, 2) && local.Read(entry, 2, 2, buffer, &count, kFileReadFlagsNone));
    ASSERT_TRUE(local.Read(entry, 2, 2, buffer, &count, kFileReadFlagsNone));
    EXPECT_EQ("23", std::string(buffer, count));
    ASSERT_TRUE(local.Seek(entry, 4, kFileOriginCurrent) && local.Write(entry, 1, "X", &count)); // at 8
    ASSERT_TRUE(local.Read(entry, 8, 2, buffer, &count, kFileReadFlagsNone));
    EXPECT_EQ("X9", std::string(buffer, count));
    EXPECT_TRUE(local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, AReadGoesToItsPositionWhoeverMovesTheFile) {
    Run("printf 0123456789 > file");
    char buffer[2] = {};
    UInt64 count = 0;
    const auto readDescriptor = [&](FileSystemEntry& entry) { return read(GetDescriptor(entry), buffer, 2) == 2; };
    const auto readInFork = [&](FileSystemEntry& entry) {
        return IsTrueForAnybody([&] { return local.Read(entry, 2, buffer, &count, kFileReadFlagsNone); });
    };
    struct Case {
        const char* mover;
        std::function<bool(FileSystemEntry&)> move;
    };
    const Case kCases[] = {
        {.mover = "nobody", .move = [](FileSystemEntry&) { return true; }},
        {.mover = "a read of the descriptor", .move = readDescriptor},
        {.mover = "a read in a fork", .move = readInFork},
    };
    for (const Case& c : kCases) {
        SCOPED_TRACE(c.mover);
        FileSystemEntry entry = Entry("file");
        ASSERT_TRUE(Open(entry, 0));
        EXPECT_TRUE(local.Read(entry, 0, 2, buffer, &count, kFileReadFlagsNone));
        EXPECT_TRUE(c.move(entry));
        EXPECT_TRUE(local.Read(entry, 2, 2, buffer, &count, kFileReadFlagsNone));
        EXPECT_EQ(std::string(buffer, count), "23");
        EXPECT_TRUE(local.Close(entry));
    }
}

TEST_F(LocalFileSystemPosixTest, FailuresOfTheSystemAreRecordedAndInterruptedCallsRepeated) {
    UInt64 count = 99;
    FileSystemEntry directory = Entry("."), full = Entry("/dev/full");
    ASSERT_TRUE(Open(directory, 0) && Open(full, 1));
    EXPECT_FALSE(local.Read(directory, 1, nullptr, &count, kFileReadFlagsNone) || count + directory.lastError != 14);
    close(*static_cast<int*>(directory.handlerState)); // behind its back
    EXPECT_FALSE(local.Close(directory) || directory.handlerState != nullptr || directory.lastError != 14);
    EXPECT_FALSE(local.Write(full, 1, "X", &(count = 99)) || count + full.lastError != 14);
    EXPECT_TRUE(local.Close(full) && full.lastError == 0);
    EXPECT_TRUE(FileSystemErrorFromErrno(EPERM) == 9 && FileSystemErrorFromErrno(EACCES) == 9);
    int calls = 0;
    EXPECT_EQ(RepeatOnInterrupt([&] { return errno = ++calls < 3 ? EINTR : EIO, -1; }) + calls, 2);
}

TEST_F(LocalFileSystemPosixTest, QuestionsFollowLinksOrNotAsEachSays) {
    Run("printf 12345 > file; chmod 444 file; ln -s . folder; ln -s file link; ln -s nowhere dangling");
    const FileSystemEntry file = Entry("file"), sub = Entry("folder"), link = Entry("link"), none = Entry("dangling");
    EXPECT_TRUE(local.Exists(file) && local.IsFile(file) && local.IsReadOnly(file) && local.IsDir(sub));
    EXPECT_TRUE(local.IsSymLink(sub) && local.IsSymLink(link) && local.IsFile(link) && local.IsSymLink(none));
    EXPECT_FALSE(local.IsSymLink(file) || local.IsFile(sub) || local.IsReadOnly(link) || local.Exists(none));
    const std::tuple<const char*, UInt32, UInt32, UInt8> kQueries[] = {
        {".", 0x90, 0x1D4, 0xF1},      {".", 0x10, 0x154, 0xF1},       {".", 0x80, 0xC0, 0xF0},
        {".", 0, 0x40, 0xF0},          {"file", 0x04, 0x154, 0xF0},    {"file", 0x20, 0x174, 0xF0},
        {"file", 0x200, 0x354, 0xF8},  {"link", 0x220, 0x374, 0xFA},   {"missing", 0x90, 0, 0xF4},
        {"missing", 0x10, 0x40, 0xF0}, {"dangling", 0x220, 0x40, 0xF0}};
    for (const auto& [name, query, answer, flags] : kQueries) {
        const FileSystemEntry entry = (answer & 0x114) != 0 ? Entry(name) : Entry("missing");
        FileEntryInfo info;
        info.flags = 0xF4; // hidden, and bits that are not the operation's
        EXPECT_EQ(answer, local.GetFileEntryInfo(Entry(name), info, static_cast<FileEntryInfoQueryFlags>(query)));
        EXPECT_TRUE(info.lastModified == local.LastModified(entry) && info.size == local.Size(entry)) << name << query;
        EXPECT_EQ(flags, info.flags) << name << ", query " << query;
    }
}

TEST_F(LocalFileSystemPosixTest, FilesAndFoldersAreMadeAndTheirAttributesSet) {
    FileSystemEntry made = Entry("made"), deep = Entry("no/made"), file = Entry("file"), link = Entry("link");
    EXPECT_TRUE(local.CreateAsDir(made) && made.lastError == 0 && !local.CreateAsDir(made) && made.lastError == 7);
    EXPECT_FALSE(local.CreateAsDir(deep) || deep.lastError != 1 || local.CreateAsFile(deep));
    EXPECT_TRUE(local.CreateAsFile(file) && local.SetLength(file, 3) && !local.CreateAsFile(file));
    Run("test $(stat -c %s file) = 3; chmod 4766 file; ln -s file link");
    EXPECT_TRUE(local.SetReadOnly(file, true) && Mode("file") == 04544);
    EXPECT_TRUE(local.SetReadOnly(file, false) && Mode("file") == 04744);
    EXPECT_TRUE(local.SetReadOnly(link, true) && Mode("file") == 0555); // the link's own mode without the rights
    const DateTime time{kUnixEpochTicks - 50'000'000}, finer{time.ticks - 9'999'999}; // cut off towards 1970
    EXPECT_TRUE(local.SetFileTimeStamp(file, finer) && local.LastModified(file) == time);
    EXPECT_TRUE(local.Touch(file) && local.LastModified(file).ticks > time.ticks);
    EXPECT_FALSE(local.SetReadOnly(deep, true) || local.Touch(deep) || local.SetFileTimeStamp(deep, time));
}

TEST_F(LocalFileSystemPosixTest, DeletingTakesATreeButNothingOutsideIt) {
    Run("mkdir -p kept tree/.sub/$(printf '\\377') odd; touch kept/file 'odd/..\\kept' tree/.sub/$(printf %0255d 0)");
    Run("ln -s kept link; ln -s ../kept tree/link; ln -s . tree/loop; ln -s nowhere tree/dangling");
    EXPECT_FALSE(DeleteTree("tree", false) || DeleteTree("odd"));
    EXPECT_TRUE(DeleteTree("tree") && DeleteTree("link/") && Mode("tree") + Mode("link") == -2);
    Run("test -e kept/file; mkdir -p theirs/sub; touch theirs/file theirs/sub/file; chmod 777 theirs");
    EXPECT_TRUE(IsTrueForAnybody([&] { return !DeleteTree("theirs") && Mode("theirs/file") == -1; }));
    // Folders whose paths leave room for 8 characters, for the separator alone, and for nothing.
    for (const size_t room : {9u, 1u, 0u}) {
        std::string path = folder / "deep/";
        while (path.size() < kMaxPathLength - room)
            path += path.size() % 100 == 0 ? '/' : 'd';
        Run("mkdir -p " + path + "; touch " + path + "/12345678 " + path + "/123456789");
        EXPECT_FALSE(DeleteTree("deep")) << room;
        Run("cd " + path + "; test " + (room < 9 ? "" : "!") + " -e 12345678; rm -f 12345678; rm 123456789");
        EXPECT_TRUE(DeleteTree("deep")) << room;
    }
    Run("rm -r odd theirs kept; mkdir -p deep$(printf '/d%.0s' $(seq 199)) wide; cd wide; seq 10000 | xargs touch");
    EXPECT_EQ(List().size(), 200u + 1 + 10'000);
    EXPECT_TRUE(DeleteTree("deep") && DeleteTree("wide") && List().empty());
}

TEST_F(LocalFileSystemPosixTest, DeletingAsksOnceAFileAndThriceAFolder) {
    constexpr int kFiles = 100;
    Run("mkdir -p tree/sub; cd tree; touch $(seq 100)");
    gStatCalls = 0;
    EXPECT_TRUE(DeleteTree("tree"));
    // Whether each is a folder; and of "tree", whether that is the folder which the listing names: twice more.
    EXPECT_EQ(gStatCalls, kFiles + 1 + 3);
}

TEST_F(LocalFileSystemPosixTest, ALockKeepsOthersOutUntilItIsGivenBack) {
    Run("mkdir -p sub/deeper; touch sub/deeper/b");
    FileSystemEntry first = Entry("sub/a"), second = Entry("sub/a"), nowhere = Entry("no/file");
    EXPECT_FALSE(local.IsLocked(first) || local.Lock(first, kFileLockUnlock)); // not there
    EXPECT_TRUE(local.Lock(first, kFileLockExclusive) && local.IsLocked(second));
    EXPECT_TRUE(IsTrueForAnybody([&] { // another process, for which paths in a folder are relative to where it is
        return chdir(folder.Path().c_str()) == 0 && local.IsLocked(second) && local.IsLocked(Entry("sub")) &&
               !local.IsLocked(Entry("sub/deeper"));
    }));
    EXPECT_TRUE(Open(second, 0) && !local.Lock(second, kFileLockShared) && second.handlerState == nullptr); // closed
    EXPECT_TRUE(local.Lock(first, kFileLockShared) && local.Lock(second, kFileLockShared)); // changed for another
    EXPECT_TRUE(local.Lock(second, kFileLockUnlock) && local.IsLocked(second) && local.Lock(first, kFileLockUnlock));
    EXPECT_FALSE(local.IsLocked(second) || local.Lock(nowhere, kFileLockShared) || nowhere.handlerState != nullptr);
    Run("chmod 0 sub/a"); // so that it can't be opened
    EXPECT_TRUE(IsTrueForAnybody([&] { return local.IsLocked(second); }));
}

TEST_F(LocalFileSystemPosixTest, CopiesAreWholeAndMovesAreRenames) {
    FileSystemEntry from = Entry("from"), to = Entry("to"), missing = Entry("missing");
    for (const char* const size : {"200001", "65536", "0", "65535", "1"}) {
        Run(std::string("head -c ") + size + " /dev/urandom > from; chmod 6$((" + size + " % 8))4 from");
        EXPECT_TRUE(local.Copy(from, to) && Mode("from") == Mode("to") && ReadFile(from.path) == ReadFile(to.path));
    }
    Run("mkdir sub; ln -s from link; ln from hard");
    // "x" is a file, and a file of /proc of size 0, by its status.
    const std::tuple<const char*, const char*, bool, UInt32> kCases[] = {
        {"from", "from", false, 0},       {"from", "link", false, 0}, {"link", "hard", false, 0},
        {"missing", "x", false, 1},       {"hard", "no/x", false, 1}, {"sub", "x", false, 14},
        {"/proc/self/mem", "y", true, 10}};
    for (const auto& [fromName, toName, isCopied, moveError] : kCases) {
        FileSystemEntry source = Entry(fromName), target = Entry(toName);
        const VFS::FileSize size = local.Size(source);
        EXPECT_TRUE(local.Copy(source, target) == isCopied && local.Size(source) == size) << fromName << toName;
        EXPECT_EQ(local.AtomicMove(source, target) ? 0u : source.lastError, moveError) << fromName << toName;
    }
    EXPECT_FALSE(local.SynchronizeMode(to, missing) || missing.lastError != 1);
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
    FileSystemEntry from = Entry("from");
    FileSystemEntry to = Entry("to");
    EXPECT_TRUE(handler.Copy(from, to));
    EXPECT_EQ(ReadFile(to.path), "data");
}

TEST_F(LocalFileSystemPosixTest, PathsAreTakenApartAndResolved) {
    FileEntryData entry; // an entry that is set has no backslashes
    core::string parent("none");
    strcpy(entry.path, "plain");
    EXPECT_TRUE(!local.Parent(entry, parent) && parent == "none" && strcmp(local.Filename(entry), "plain") == 0);
    strcpy(entry.path, "/a/b\\c/");
    EXPECT_TRUE(local.Parent(entry, parent) && parent == "/a/b" && strcmp(local.Filename(entry), "") == 0);
    Run("mkdir sub; ln -s sub/../second first; ln -s sub second; ln -s nowhere dangling");
    FileSystemEntry target;
    EXPECT_TRUE(local.Target(Entry("first/./"), target) && !local.Target(Entry("dangling"), target));
    EXPECT_EQ(target.Path(), folder / "sub");
}

TEST_F(LocalFileSystemPosixTest, UserFoldersAreMadeAndFailuresPrinted) {
    const std::string config = folder / ".config/zarvo3d", said = "Creating user config folder: " + config + "\n";
    const ConsoleCapture console;
    UInt64 bytes = 7;
    setenv("HOME", folder.Path().c_str(), 1);
    EXPECT_TRUE(LocalFileSystemPosix().ToAbsolute("~/x") == (folder / "x").c_str());
    Run("mkdir .config");
    EXPECT_TRUE(local.GetUserAppCacheFolder() == (config + "/Caches").c_str() && Mode(config) == 0700);
    EXPECT_TRUE(!local.GetAvailableDiskSpace("/missing", bytes) && bytes == 7);
    EXPECT_EQ(console.Text(), said + "statvfs failed with errno=2; path was /missing\n");
    EXPECT_TRUE(unsetenv("HOME") == 0 && !LocalFileSystemPosix().ToAbsolute("~").empty()); // of the real user
    EXPECT_TRUE(local.GetUserAppCacheFolder().empty() && local.GetAvailableDiskSpace("/", bytes) && bytes > 7);
}

TEST_F(LocalFileSystemPosixTest, AListingTellsTimesSizesAndKindsAndEndsInLoops) {
    Run("mkdir .s; printf 12345 > .s/file; chmod 444 .s/file; printf 1 > $(printf '\\377x'); ln -s nowhere dangling");
    Run("ln -s self self; ln -s .s sub; cd .s; ln -s file link~; ln -s . loop; ln -s .. up; mkdir Cvs; touch .h n.TMP");
    std::string listed;
    for (const auto& [name, info] : List()) {
        listed += name + " " + std::to_string(info.flags) + "/";
        listed += std::to_string((info.flags & kFileEntryIsDirectory) != 0 ? 0 : info.size) + " ";
        EXPECT_EQ(local.LastModified(Entry(name)), info.lastModified) << name; // 0 of what leads nowhere
    }
    for (UInt32 flag = 0x02; flag != 0x80; flag *= 2)
        listed += std::to_string(List(true, flag).size()) + " ";
    EXPECT_EQ(listed, ".s 5/0 .s/.h 4/0 .s/Cvs 1/0 .s/file 8/5 .s/link~ 10/5 .s/loop 3/0 .s/n.TMP 0/0 .s/up 3/0 "
                      "dangling 2/0 self 2/0 sub 3/0 sub/.h 4/0 sub/Cvs 1/0 sub/file 8/5 sub/link~ 10/5 sub/loop 3/0 "
                      "sub/n.TMP 0/0 sub/up 3/0 \xFFx 0/1 17 11 10 8 8 17 ");
    ReportRecorder reports; // of each folder
    UInt64 total = 0;
    void* counter = &total;
    EXPECT_TRUE(local.Enumerate(folder.Path().c_str(), nullptr, true, &counter, kFileEnumerationSumSizes));
    EXPECT_TRUE(total == 4 * 5 + 1 && reports.Take().size() == 5) << total;
    Run("mkdir s; touch s/file; chmod 0 s"); // what can't be opened ends a listing with what it has
    EXPECT_TRUE(IsTrueForAnybody([&] { return List(false, 0x2A).count("s") == 1 && !HasFailure(); }));
}
