// The command run in process, while the file system fails, falls short, changes or dies, or memory is refused.
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/FaultyFileSystem.h"
#include "Tests/Support/RefusedMemory.h"
#include "Tests/Tools/Extractor/ExtractorTest.h"
#include "Tools/Extractor/Extractor.h"

#include <csignal>

class DisturbedWorld : public testing::Test {
protected:
    // What holds whatever happens: a success is whole; a failure is reported, and what it leaves is the start of what
    // should be there, and nothing else.
    void ExpectHonest(bool isAllOk, const std::string& said) {
        SCOPED_TRACE(said);
        EXPECT_EQ(isAllOk, said.ends_with(Say("ok")));
        EXPECT_EQ(!isAllOk, said.find("ERROR: ") != std::string::npos);
        FolderTree tree = ReadFolderTree(m_Folder.Path());
        tree.erase("a.zarvo");
        if (isAllOk) {
            EXPECT_EQ(Output(Entries(kFiles)), tree);
            return;
        }
        for (const ArchiveEntry& entry : Entries(kFiles)) {
            if (tree.erase("a.zarvo_data/" + entry.path) == 0) continue;
            const std::string written = ReadFile(m_Path + "_data/" + entry.path);
            EXPECT_EQ(Brief(entry.bytes.substr(0, written.size())), Brief(written)) << entry.path;
        }
        for (const char* const path : {"a.zarvo_data", "a.zarvo_data/a", "a.zarvo_data/a/b"})
            if (tree.count(path) != 0 && tree[path] == kFolder) tree.erase(path);
        EXPECT_EQ(FolderTree(), tree);
    }

    bool Extract() {
        const ConsoleCapture capture;
        const bool isAllOk = ExtractArchive(m_Path.c_str());
        ExpectHonest(isAllOk, capture.Text());
        return isAllOk;
    }

    // Puts an archive of kFiles where it was at the start, with no output folder.
    void Reset(const std::string& form) {
        fs::remove_all(m_Path + "_data");
        WriteFile(m_Path, BuildArchive(Archive(form + kFiles)).bytes);
    }

    // Extracts with a fault at the first call, the second, and so on, until a run meets none.
    void ExtractWithFaults(FaultKind kind, const std::function<void()>& action = {}) {
        for (const std::string form : kForms) {
            FaultyFileSystem faults;
            faults.action = action;
            const size_t descriptors = CountOpenDescriptors();
            for (int n = 1; n == 1 || faults.HasStruck(); ++n) {
                SCOPED_TRACE(testing::Message() << form << ", call " << n);
                Reset(form);
                faults.Arm(n, kind);
                const bool isAllOk = Extract();
                EXPECT_EQ(descriptors, CountOpenDescriptors());
                if (!faults.HasStruck()) {
                    EXPECT_TRUE(isAllOk);
                }
            }
        }
    }

    static constexpr const char* kForms[] = {
        "lz4 section chunk=30000", "lzma streamed", "stored", "old lzma", "web", "raw"};
    const std::string kFiles = " a/b/one-of-a-name-that-needs-memory:c66000 two:text";
    const TemporaryFolder m_Folder;
    const std::string m_Path = m_Folder / "a.zarvo";
};

TEST_F(DisturbedWorld, AnyCallMayFailOnce) { ExtractWithFaults({.isLasting = false, .isShort = false}); }

TEST_F(DisturbedWorld, AnyCallMayBeTheFirstToFail) { ExtractWithFaults({.isLasting = true, .isShort = false}); }

TEST_F(DisturbedWorld, AnyTransferMayFallShort) { ExtractWithFaults({.isLasting = false, .isShort = true}); }

TEST_F(DisturbedWorld, TheArchiveMayBeRemovedAtAnyCall) {
    ExtractWithFaults({}, [&] { fs::remove(m_Path); });
}

TEST_F(DisturbedWorld, TheArchiveMayBeCutAtAnyCall) {
    ExtractWithFaults({}, [&] { fs::resize_file(m_Path, fs::file_size(m_Path) / 2); });
}

// The archive sets the size of most large requests, so a refusal must not end the process. The other one is for the
// transfer buffer.
TEST_F(DisturbedWorld, LargeRequestsForMemoryMayBeRefused) {
    constexpr size_t kLarge = 4'096;
    for (const std::string form : kForms)
        for (int n = 1; n == 1 || RefusedMemory::HasStruck(); ++n) {
            SCOPED_TRACE(testing::Message() << form << ", request " << n);
            Reset(form);
            const ConsoleCapture capture;
            const bool isAllOk = [&] {
                const RefusedMemory refused(n, false, kLarge);
                return ExtractArchive(m_Path.c_str());
            }();
            if (!RefusedMemory::HasStruck()) {
                EXPECT_TRUE(isAllOk);
            }
            ExpectHonest(isAllOk, capture.Text());
        }
}

// A refused request of a few bytes may end the process; nothing else may.
TEST_F(DisturbedWorld, AnyRequestForMemoryMayBeRefused) {
    constexpr int kFailed = 1, kWasRefused = 2, kEnded = kStatusOfSignal + SIGABRT; // statuses
    for (const std::string form : kForms)
        for (const bool isLasting : {false, true}) {
            int status = kWasRefused;
            for (int n = 1; status >= kWasRefused; ++n) {
                SCOPED_TRACE(testing::Message() << form << ", request " << n << ", lasting " << isLasting);
                Reset(form);
                std::string said;
                std::tie(status, said) = RunForked([&] {
                    const RefusedMemory refused(n, isLasting);
                    const bool isAllOk = ExtractArchive(m_Path.c_str());
                    return (isAllOk ? 0 : kFailed) | (RefusedMemory::HasStruck() ? kWasRefused : 0);
                });
                if (status == kEnded) continue;
                ASSERT_LE(status, kFailed | kWasRefused) << said;
                ExpectHonest((status & kFailed) == 0, said);
                // Only the layout "web" has to look for its directory.
                if (form != "web") {
                    EXPECT_EQ(std::string::npos, said.find(Say("nodirectory"))) << said;
                }
            }
            EXPECT_EQ(0, status);
        }
}

// The folders are there from the start, but no query may tell so.
TEST_F(DisturbedWorld, AFolderThatCantBeMadeFailsTheRun) {
    struct NoFolders : FaultyFileSystem {
        // A file has taken the name meanwhile.
        bool CreateAsDir(FileEntryData& entry) override {
            entry.lastError = kFileSystemErrorAlreadyExists;
            return false;
        }
        bool IsDir(const FileEntryData&) const override { return false; }
        FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData&, FileEntryInfo&,
                                                 FileEntryInfoQueryFlags) const override {
            return kFileEntryQueryNone;
        }
    };
    Reset("");
    fs::create_directories(m_Path + "_data/a/b");
    const NoFolders disturbed;
    EXPECT_FALSE(Extract());
}

// Some disks report only then that they are full.
TEST_F(DisturbedWorld, AFileThatCantBeClosedFailsTheRun) {
    struct NoClosing : FaultyFileSystem {
        bool Close(FileEntryData& entry) override {
            (void)FaultyFileSystem::Close(entry);
            return false;
        }
    };
    Reset("");
    const NoClosing disturbed;
    EXPECT_FALSE(Extract());
}
