#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Tests/Support/ReportRecorder.h"

#include <array>
#include <bit>
#include <gtest/gtest.h>

// Claims the paths that hold its mark, and records the calls that it gets: "+path" binds an entry, "-path" undoes it.
struct MarkedPathsHandler : LocalFileSystemPosix {
    explicit MarkedPathsHandler(const char* ownMark) : mark(ownMark) { GetFileSystem()->RegisterHandler(this); }
    ~MarkedPathsHandler() override { GetFileSystem()->UnregisterHandler(this); }

    bool CanHandle(core::string_ref path) const override { return path.find(mark) != core::string_ref::npos; }
    bool CanConvertToAbsolutePath(core::string_ref path) const override { return CanHandle(path); }
    core::string ToAbsolute(core::string_ref) const override { return core::string(mark); }
    void InitializeFileEntry(FileEntryData& entry) override {
        LocalFileSystemPosix::InitializeFileEntry(entry);
        Record("+", entry);
    }
    void DestroyFileEntry(FileEntryData& entry) override { Record("-", entry); }
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        lastPermission = permission;
        lastBehavior = behavior;
        Record("open ", entry);
        return true;
    }
    bool Close(FileEntryData& entry) override { // serves one use, as an adapter does
        entry.accessorHandler = nullptr;
        Record("close ", entry);
        return true;
    }
    void Record(const char* call, const FileEntryData& entry) { calls += std::string(call) + entry.path + " "; }

    std::string TakeCalls() { return std::exchange(calls, {}); }

    const char* mark;
    std::string calls;
    FilePermission lastPermission = kFilePermissionRead;
    FileAutoBehavior lastBehavior = kFileAutoBehaviorNone;
};

TEST(VirtualFileSystem, VirtualOperationsKeepTheirSlots) {
    // The slot is in the pointer to a virtual function, as the ABI here defines it. The destructor has slots 0 and 1.
    const auto slot = [](auto function) { return std::bit_cast<std::array<size_t, 2>>(function)[0] / sizeof(void*); };
    EXPECT_EQ(7u, slot(&FileSystemHandler::Close));
    EXPECT_EQ(61u, slot(&LocalFileSystemHandler::GetAvailableDiskSpace));
}

TEST(VirtualFileSystem, SizesTooLargeForAnOffsetAreReported) {
    ReportRecorder reports;
    EXPECT_EQ(INT64_MAX, VFS::FileOffset(VFS::FileSize(INT64_MAX)).Cast<SInt64>());
    EXPECT_EQ(std::vector<std::string>(), reports.Take());
    EXPECT_EQ(INT64_MIN, VFS::FileOffset(VFS::FileSize(1ull << 63)).Cast<SInt64>());
    EXPECT_EQ(
        std::vector<std::string>{
            "./Runtime/VirtualFileSystem/VirtualFileSystemTypes:123: Value cannot be stored by type cast "
            "target: exceeds maximum representable value. Result will be truncated."},
        reports.Take());
}

TEST(FileSystem, TheLastHandlerThatClaimsAPathServesIt) {
    MarkedPathsHandler first("mark"), second("mark2");
    EXPECT_EQ(&second, GetFileSystem()->GetHandlerForPath("x/mark2"));
    EXPECT_EQ(&first, GetFileSystem()->GetHandlerForPath("x/mark"));
    EXPECT_STREQ("Local", GetFileSystem()->GetHandlerForPath("x")->Name());
}

TEST(FileSystem, HandlersMakeTheirPathsAbsolute) {
    GetFileSystem()->SetCurrentDirectory("/cur");
    {
        MarkedPathsHandler first("mark"), second("mark2");
        EXPECT_STREQ("mark2", GetFileSystem()->ToAbsolute("mark2+").c_str());
        EXPECT_STREQ("mark", GetFileSystem()->ToAbsolute("mark+").c_str());
    }
    EXPECT_STREQ("/cur/mark", GetFileSystem()->ToAbsolute("mark").c_str());
    EXPECT_STREQ("/mark/..", GetFileSystem()->ToAbsolute("/mark/..").c_str());
    GetFileSystem()->SetCurrentDirectory("");
}

TEST(FileSystem, TheCurrentDirectoryIsCut) {
    GetFileSystem()->SetCurrentDirectory("/cur");
    EXPECT_STREQ("/cur", GetFileSystem()->SetCurrentDirectory(std::string(1'100, 'c').c_str()).c_str());
    EXPECT_EQ(std::string(kMaxPathLength, 'c'), GetFileSystem()->SetCurrentDirectory("").c_str());
}

TEST(FileSystem, AListedPathKeepsItsBackslashes) {
    MarkedPathsHandler handler("mark");
    EXPECT_FALSE(GetFileSystem()->Enumerate("no\\mark", nullptr, false, kFileEnumerationAll));
    EXPECT_EQ("+no\\mark -no\\mark ", handler.calls);
}

TEST(FileSystemEntry, BackslashesBecomeSeparators) { EXPECT_STREQ("m/a", FileSystemEntry("m\\a").Path()); }

TEST(FileSystemEntry, ACopyIsBoundButNotOpen) {
    MarkedPathsHandler handler("m");
    FileSystemEntry entry("m/a");
    entry.handlerState = &entry;
    const FileSystemEntry copy(entry);
    EXPECT_EQ("+m/a +m/a ", handler.TakeCalls());
    EXPECT_EQ(nullptr, copy.handlerState);
    entry = copy;
    EXPECT_EQ("-m/a +m/a ", handler.TakeCalls());
    EXPECT_EQ(nullptr, entry.handlerState);
}

TEST(FileSystemEntry, AssignedToItselfItStaysAsItIs) {
    MarkedPathsHandler handler("m");
    FileSystemEntry entry("m/a");
    entry.handlerState = &entry;
    entry = *&entry;
    EXPECT_EQ("+m/a ", handler.calls);
    EXPECT_EQ(&entry, entry.handlerState);
}

TEST(FileSystemEntry, SetUndoesTheBindingFirst) {
    MarkedPathsHandler handler("m");
    FileSystemEntry entry("m/a");
    entry.handlerState = &entry;
    entry.lastError = kFileSystemErrorUnknown;
    entry.Set("m/b");
    EXPECT_EQ("+m/a -m/a +m/b ", handler.calls);
    EXPECT_EQ(nullptr, entry.handlerState);
    EXPECT_EQ(kFileSystemErrorNone, entry.lastError);
}

TEST(FileSystemEntry, SetTakesPartOfItsOwnPath) {
    MarkedPathsHandler handler("mark");
    FileSystemEntry entry("xx/mark/a");
    entry.Set(entry.Path() + 3);
    EXPECT_STREQ("mark/a", entry.Path());
    EXPECT_EQ(&handler, entry.handler);
}

TEST(FileSystemEntry, ALongPathIsCutAfterItsHandlerIsFound) {
    MarkedPathsHandler handler("m");
    const std::string cut(kMaxPathLength, 'p');
    const FileSystemEntry entry((cut + "m").c_str());
    EXPECT_EQ(cut, entry.Path());
    EXPECT_EQ(&handler, entry.handler);
}

TEST(FileAccessor, AnUnopenedOneClosesWithSuccess) { EXPECT_TRUE(FileAccessor().Close()); }

TEST(FileAccessor, PassesOnHowToOpen) {
    MarkedPathsHandler handler("m");
    FileAccessor accessor;
    EXPECT_TRUE(accessor.Open("m", kFilePermissionAppend, kFileAutoBehaviorLock));
    EXPECT_EQ(kFilePermissionAppend, handler.lastPermission);
    EXPECT_EQ(kFileAutoBehaviorLock, handler.lastBehavior);
}

TEST(FileAccessor, OpensACopyOfTheEntry) {
    MarkedPathsHandler handler("m");
    FileAccessor accessor;
    EXPECT_TRUE(accessor.Open("m", kFilePermissionRead));
    EXPECT_EQ("+m +m open m -m ", handler.TakeCalls()); // the last undoes the entry made from the path
    EXPECT_TRUE(accessor.Close());
    EXPECT_EQ("close m ", handler.TakeCalls());
}

TEST(FileAccessor, TheDestructorClosesAndUndoesTheBinding) {
    MarkedPathsHandler handler("m");
    {
        FileAccessor accessor;
        EXPECT_TRUE(accessor.Open("m", kFilePermissionRead));
        handler.calls.clear();
    }
    EXPECT_EQ("close m -m ", handler.calls);
}

TEST(FileAccessor, AnswersFalseOnceItsHandlerHasGone) {
    MarkedPathsHandler handler("m");
    FileAccessor accessor;
    EXPECT_TRUE(accessor.Open("m", kFilePermissionRead));
    EXPECT_TRUE(accessor.Close());
    EXPECT_FALSE(accessor.Close());
    EXPECT_FALSE(accessor.Read(0, 1, nullptr, nullptr));
    EXPECT_FALSE(accessor.Write(1, nullptr, nullptr));
    EXPECT_EQ(0u, accessor.Size());
}
