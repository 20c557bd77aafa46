#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Tests/Support/ReportRecorder.h"

#include <gtest/gtest.h>

#include <array>
#include <bit>

namespace {

// Claims the paths that hold its mark, and writes down what it is asked.
class MarkedPathsHandler : public LocalFileSystemPosix {
public:
    explicit MarkedPathsHandler(const char* mark) : m_Mark(mark) { GetFileSystem()->RegisterHandler(this); }
    ~MarkedPathsHandler() override { GetFileSystem()->UnregisterHandler(this); }

    std::string Take() { return std::exchange(m_Calls, {}); }

    bool CanHandle(core::string_ref path) const override { return path.find(m_Mark) != core::string_ref::npos; }
    bool CanConvertToAbsolutePath(core::string_ref path) const override { return CanHandle(path); }
    core::string ToAbsolute(core::string_ref) const override { return core::string(m_Mark); }
    void InitializeFileEntry(FileEntryData& entry) override {
        Note("+", entry);
        LocalFileSystemPosix::InitializeFileEntry(entry);
    }
    void DestroyFileEntry(FileEntryData& entry) override { Note("-", entry); }
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        return Note("open " + std::to_string(permission) + std::to_string(behavior), entry);
    }
    // As an adapter does that serves one use.
    bool Close(FileEntryData& entry) override {
        entry.accessorHandler = nullptr;
        return Note("close ", entry);
    }

private:
    bool Note(const std::string& call, const FileEntryData& entry) { return m_Calls += call + entry.path + " ", true; }

    const char* m_Mark;
    std::string m_Calls;
};

} // namespace

TEST(VirtualFileSystem, SizesAndOffsetsReportWhatTheyCannotHold) {
    constexpr SInt64 kMax = 0x7FFFFFFFFFFFFFFF;
    ReportRecorder reports;
    EXPECT_TRUE(VFS::FileOffset(VFS::FileSize(kMax)) == kMax && VFS::FileSize(0xFFFFFFFF).Cast<UInt32>() == 0xFFFFFFFF);
    EXPECT_TRUE(VFS::FileOffset(VFS::FileSize(UInt64{kMax} + 2)) == -kMax && VFS::FileOffset(-1).Cast<UInt64>() != 0);
    const std::vector<std::string> said = reports.Take();
    EXPECT_TRUE(said.size() == 2 &&
                said[0] ==
                    "./Runtime/VirtualFileSystem/VirtualFileSystemTypes:123: Value cannot be "
                    "stored by type cast target: exceeds maximum representable value. Result will be truncated.");
}

TEST(VirtualFileSystem, VirtualOperationsLieInTheirFixedSlots) {
    // The slot that a pointer to a virtual function carries, as the ABI here defines it; 0 and 1 are the destructor's.
    const auto slot = [](auto function) { return std::bit_cast<std::array<size_t, 2>>(function)[0] / sizeof(void*); };
    EXPECT_TRUE(slot(&FileSystemHandler::Close) == 7 && slot(&FileSystemHandler::CanHandle) == 12);
    EXPECT_TRUE(slot(&FileSystemHandler::MoveToTrash) == 32 && slot(&FileSystemHandler::ToLogicalPath) == 49);
    EXPECT_EQ(slot(&LocalFileSystemHandler::GetAvailableDiskSpace), 61u);
}

TEST(VirtualFileSystem, TheLastRegisteredHandlerThatClaimsAPathServesIt) {
    FileSystem& registry = *GetFileSystem();
    registry.SetCurrentDirectory("/cur");
    {
        MarkedPathsHandler first("mark"), second("mark2");
        EXPECT_TRUE(registry.GetHandlerForPath("x/mark2") == &second && registry.GetHandlerForPath("x/mark") == &first);
        EXPECT_TRUE(registry.ToAbsolute("mark2+") == "mark2" && registry.ToAbsolute("mark+") == "mark");
        EXPECT_FALSE(registry.Enumerate("no\\mark", nullptr, false, kFileEnumerationAll));
        EXPECT_EQ(first.Take(), "+no\\mark -no\\mark ");
    }
    EXPECT_TRUE(registry.ToAbsolute("mark") == "/cur/mark" && registry.ToAbsolute("/mark/..") == "/mark/..");
    EXPECT_EQ(registry.SetCurrentDirectory(std::string(1100, 'c').c_str()).size(), 4u); // of the one before
    EXPECT_EQ(registry.SetCurrentDirectory("").size(), kMaxPathLength);
}

TEST(VirtualFileSystem, EntriesAndAccessorsAreBoundAndUnboundInPairs) {
    MarkedPathsHandler handler("m");
    {
        FileSystemEntry entry("m\\a");
        entry.handlerState = &entry;
        const FileSystemEntry copy(entry);
        entry = *&entry;
        entry.Set(entry.Path() + 1);
        EXPECT_TRUE(strcmp(entry.Path(), "/a") == 0 && entry.handlerState == nullptr && copy.handlerState == nullptr);
        entry = copy;
        entry.Set((std::string(kMaxPathLength, 'p') + "m").c_str()); // the mark is cut, but seen
        EXPECT_EQ(handler.Take(), "+m/a +m/a -m/a +m/a -m/a +" + std::string(kMaxPathLength, 'p') + " ");
    }
    EXPECT_EQ(handler.Take(), "-m/a -" + std::string(kMaxPathLength, 'p') + " ");
    {
        FileAccessor accessor;
        UInt64 count = 7;
        EXPECT_TRUE(accessor.Close() && accessor.Open("m", kFilePermissionAppend, kFileAutoBehaviorLock));
        EXPECT_TRUE(accessor.Close() && !accessor.Close()); // asks again, but nobody is left to ask
        EXPECT_FALSE(accessor.Read(0, 1, &count, &count) || accessor.Write(1, &count, &count));
        EXPECT_TRUE(accessor.Open("m", kFilePermissionRead)); // and closed by the destructor
    }
    EXPECT_EQ(handler.Take(), "+m +m open 31m -m close m +m -m +m open 00m -m close m -m ");
}

TEST(VirtualFileSystem, WhatNoHandlerSuppliesHasDefaults) {
    ReportRecorder reports;
    FileSystemEntry entry("/nonexistent/file"), empty;
    EXPECT_FALSE(empty.Exists() || empty.IsFile() || empty.IsLocked() || empty.SetFlags(1, 1) || empty.FolderExists());
    EXPECT_TRUE(entry.handler->MoveToTrash(entry) && reports.Take().empty()); // although there is nothing to delete
    EXPECT_FALSE(entry.handler->CreateFileWithContentAtomically(entry, "x", 1) || entry.lastError != 15);
    EXPECT_EQ(reports.Take().size(), 1u);
}
