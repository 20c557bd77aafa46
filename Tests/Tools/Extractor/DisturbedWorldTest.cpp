// The road run in process, while the file system below it fails, falls short, changes or dies, or memory is refused.
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/FaultyFileSystem.h"
#include "Tests/Support/RefusedMemory.h"
#include "Tests/Tools/Extractor/ExtractorTest.h"
#include "Tools/Extractor/Extractor.h"

class DisturbedWorld : public testing::Test {
protected:
    // Runs the road and holds what must be true whatever happens: a success is whole; a failure says so, and what it
    // leaves is the start of what should be there, and nothing else.
    bool Extract(int refusedRequest = 0, bool isLasting = false) {
        ConsoleCapture capture;
        const bool isAllOk = [&] {
            const RefusedMemory refused(refusedRequest, isLasting);
            return ExtractArchive(m_Path.c_str());
        }();
        EXPECT_EQ(isAllOk, capture.Text().ends_with(Say("ok"))) << capture.Text();
        EXPECT_EQ(isAllOk, capture.Text().find("ERROR: ") == std::string::npos) << capture.Text();
        m_Said = capture.Text();
        FolderTree tree = ReadFolderTree(m_Folder.Path());
        tree.erase("a.zarvo");
        EXPECT_EQ(isAllOk ? Output(Entries(kFiles)) : tree, tree);
        for (const ArchiveEntry& entry : Entries(kFiles))
            if (tree.erase("a.zarvo_data/" + entry.path) != 0) {
                EXPECT_TRUE(entry.bytes.starts_with(ReadFile(m_Path + "_data/" + entry.path))) << capture.Text();
            }
        for (const auto& [path, content] : tree)
            EXPECT_TRUE(content == kFolder && std::string("a.zarvo_data/a/b").starts_with(path)) << path;
        return isAllOk;
    }

    // With a fault at the first call, the second, and so on, until a run meets none.
    void ExtractWithFaults(const std::string& form, FaultKind kind, const std::function<void()>& action = {}) {
        FaultyFileSystem faults;
        faults.action = action;
        const size_t descriptors = CountOpenDescriptors();
        for (int n = 1; n == 1 || faults.HasStruck(); ++n) {
            SCOPED_TRACE(testing::Message() << form << ", call " << n << ", kind " << kind.isLasting << kind.isShort);
            fs::remove_all(m_Path + "_data");
            WriteFile(m_Path, BuildArchive(Archive(form + kFiles)).bytes);
            faults.Arm(n, kind);
            EXPECT_TRUE(Extract() || faults.HasStruck());
            EXPECT_EQ(descriptors, CountOpenDescriptors());
        }
    }

    const std::string kFiles = " a/b/one-of-a-name-that-needs-memory:c66000 two:text";
    const TemporaryFolder m_Folder;
    const std::string m_Path = m_Folder / "a.zarvo";
    std::string m_Said; // by the last run
};

TEST_F(DisturbedWorld, AnyCallMayFailOrFallShortOrFindTheArchiveCutOrGone) {
    for (const char* form : {"lz4 section chunk=30000", "lzma streamed", "stored", "old lzma", "web", "raw"}) {
        for (const FaultKind kind : {FaultKind{false, false}, FaultKind{true, false}, FaultKind{false, true}})
            ExtractWithFaults(form, kind);
        ExtractWithFaults(form, {}, [&] { fs::remove(m_Path); });
        ExtractWithFaults(form, {}, [&] { fs::resize_file(m_Path, fs::file_size(m_Path) / 2); });
    }
}

TEST_F(DisturbedWorld, AnyRequestForMemoryMayBeRefused) {
    (void)GetFileSystem(); // no program goes on without it
    for (const std::string form : {"lz4 section chunk=30000", "lzma streamed", "stored", "old lzma", "web", "raw"})
        for (const bool isLasting : {false, true})
            for (int n = 1; n == 1 || RefusedMemory::HasStruck(); ++n) {
                SCOPED_TRACE(testing::Message() << form << ", request " << n << ", lasting " << isLasting);
                fs::remove_all(m_Path + "_data");
                WriteFile(m_Path, BuildArchive(Archive(form + kFiles)).bytes);
                EXPECT_TRUE(Extract(n, isLasting) || RefusedMemory::HasStruck());
                // Other archives have their directory already.
                EXPECT_TRUE(form == "web" || m_Said.find(Say("nodirectory")) == std::string::npos) << m_Said;
            }
}

// A folder that is there already, though nobody knows, and a disk that is found to be full when a file is closed.
TEST_F(DisturbedWorld, AFolderThatCantBeMadeOrAFileThatCantBeClosedIsAFailure) {
    struct NoFolders : FaultyFileSystem {
        // A file has come there meanwhile.
        bool CreateAsDir(FileEntryData& entry) override {
            return entry.lastError = kFileSystemErrorAlreadyExists, false;
        }
        bool IsDir(const FileEntryData&) const override { return false; }
        FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData&, FileEntryInfo&,
                                                 FileEntryInfoQueryFlags) const override {
            return kFileEntryQueryNone;
        }
    };
    struct NoClosing : FaultyFileSystem {
        bool Close(FileEntryData& entry) override { return FaultyFileSystem::Close(entry) && false; }
    };
    fs::create_directories(m_Path + "_data/a/b");
    WriteFile(m_Path, BuildArchive(Archive(kFiles)).bytes);
    EXPECT_FALSE((NoFolders(), Extract()));
    EXPECT_FALSE((NoClosing(), Extract()));
}
