#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"

#include <array>
#include <bit>
#include <gtest/gtest.h>

// Claims the paths that hold its mark, and writes down what it is asked.
struct MarkedPathsHandler : LocalFileSystemPosix {
    explicit MarkedPathsHandler(const char* ownMark) : mark(ownMark) { GetFileSystem()->RegisterHandler(this); }
    ~MarkedPathsHandler() override { GetFileSystem()->UnregisterHandler(this); }

    bool CanHandle(core::string_ref path) const override { return path.find(mark) != core::string_ref::npos; }
    bool CanConvertToAbsolutePath(core::string_ref path) const override { return CanHandle(path); }
    core::string ToAbsolute(core::string_ref) const override { return core::string(mark); }
    void InitializeFileEntry(FileEntryData& entry) override {
        LocalFileSystemPosix::InitializeFileEntry(entry);
        Note("+", entry);
    }
    void DestroyFileEntry(FileEntryData& entry) override { Note("-", entry); }
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        return Note("open " + std::to_string(permission) + std::to_string(behavior), entry);
    }
    bool Close(FileEntryData& entry) override { // as an adapter does that serves one use
        entry.accessorHandler = nullptr;
        return Note("close ", entry);
    }
    bool Note(const std::string& call, const FileEntryData& entry) { return calls += call + entry.path + " ", true; }

    const char* mark;
    std::string calls;
};

TEST(VirtualFileSystem, VirtualOperationsLieInTheirFixedSlots) {
    // The slot that a pointer to a virtual function carries, as the ABI here defines it; 0 and 1 are the destructor's.
    const auto slot = [](auto function) { return std::bit_cast<std::array<size_t, 2>>(function)[0] / sizeof(void*); };
    EXPECT_TRUE(slot(&FileSystemHandler::Close) == 7 && slot(&LocalFileSystemHandler::GetAvailableDiskSpace) == 61);
}

TEST(VirtualFileSystem, TheLastRegisteredHandlerThatClaimsAPathServesIt) {
    FileSystem& registry = *GetFileSystem();
    registry.SetCurrentDirectory("/cur");
    {
        MarkedPathsHandler first("mark"), second("mark2");
        EXPECT_TRUE(registry.GetHandlerForPath("x/mark2") == &second && registry.GetHandlerForPath("x/mark") == &first);
        EXPECT_TRUE(registry.ToAbsolute("mark2+") == "mark2" && registry.ToAbsolute("mark+") == "mark");
        EXPECT_FALSE(registry.Enumerate("no\\mark", nullptr, false, kFileEnumerationAll) ||
                     first.calls != "+no\\mark -no\\mark ");
    }
    EXPECT_TRUE(registry.ToAbsolute("mark") == "/cur/mark" && registry.ToAbsolute("/mark/..") == "/mark/..");
    EXPECT_EQ(registry.SetCurrentDirectory(std::string(1'100, 'c').c_str()).size(), 4u); // of the one before
    EXPECT_EQ(registry.SetCurrentDirectory("").size(), kMaxPathLength);
}

TEST(VirtualFileSystem, EntriesAndAccessorsAreBoundAndUnboundInPairs) {
    const std::string longPath(kMaxPathLength, 'p');
    MarkedPathsHandler handler("m");
    {
        FileSystemEntry entry("m\\a");
        entry.handlerState = &entry;
        const FileSystemEntry copy(entry);
        entry = *&entry;
        entry.Set(entry.Path());
        EXPECT_TRUE(strcmp(entry.Path(), "m/a") == 0 && entry.handlerState == nullptr && copy.handlerState == nullptr);
        entry = copy;
        entry.Set((longPath + "m").c_str()); // the mark is cut, but seen
        FileAccessor accessor;
        EXPECT_TRUE(accessor.Close() && accessor.Open("m", kFilePermissionAppend, kFileAutoBehaviorLock));
        EXPECT_TRUE(accessor.Close() && !accessor.Close()); // asks again, but nobody is left to ask
        EXPECT_FALSE(accessor.Read(0, 1, nullptr, nullptr) || accessor.Write(1, nullptr, nullptr));
        EXPECT_TRUE(accessor.Open("m", kFilePermissionRead)); // and closed by the destructor
    }
    EXPECT_EQ(handler.calls, "+m/a +m/a -m/a +m/a -m/a +m/a -m/a +" + longPath +
                                 " +m +m open 31m -m close m +m -m +m open 00m -m close m -m -m/a -" + longPath + " ");
}
