// Extraction where the system refuses what it asks for: descriptors, room on the disk, single calls.
#include "Tests/Library/ExtractionTest.h"
#include "Tests/Library/SystemFaults.h"
#include "Tests/Support/FolderTree.h"

#include <algorithm>
#include <deque>
#include <unistd.h>

namespace fs = std::filesystem;

// Very many files, deep down, that begin before a unit's end and end after it, with few descriptors: all are written,
// one decoding is enough, and a run that fails leaves nothing behind.
TEST(ExtractionFaults, AnyNumberOfFilesMayShareTheirData) {
    constexpr uint64_t kFiles = 500, kFrom = 1'040'000, kSize = 30'000;
    const std::string text = SampleText(3'000'000);
    ArchiveDescription description{.entries = {{.path = "all", .bytes = text}}, .type = kCompressionLz4};
    FolderTree expected = {{"all", Brief(text)}};
    for (uint64_t file = 0; file < kFiles; ++file) {
        std::string path;
        for (uint64_t level = 0; level < 12; ++level)
            path += std::to_string(file % (level + 2)) + "/";
        path += std::to_string(file);
        const std::string node = "node[" + std::to_string(description.entries.size()) + "].";
        description.entries.push_back({.path = path});
        description.fields[node + "offset"] = kFrom + file;
        description.fields[node + "size"] = kSize;
        expected[path] = Brief(text.substr(kFrom + file, kSize));
    }
    const std::string bytes = BuildArchive(description).bytes;
    for (const rlim_t descriptors : {16u, 64u, 1'024u}) {
        SCOPED_TRACE(descriptors);
        const TemporaryFolder folder;
        auto source = std::make_unique<CountingSource>(bytes);
        CountingSource& counts = *source;
        zarvo::archive archive = *zarvo::archive::open(std::move(source));
        counts.bytesRead = 0;
        zarvo::run_result result, failed;
        {
            const FewDescriptors few(descriptors);
            result = archive.extract(folder / "out", {.threads = 8});
            const SystemFault fault({.call = "pwrite", .number = 400, .error = ENOSPC});
            failed = archive.extract(folder / "failed", {.threads = 8});
        }
        EXPECT_EQ(kFiles + 1, result.summary.files);
        EXPECT_LE(counts.bytesRead.load(), 2 * archive.info().stored_size);
        EXPECT_EQ(expected, ReadFolderTree(folder / "out"));
        EXPECT_EQ(ZARVO_ERROR_SYSTEM, failed.error.code());
        EXPECT_EQ(kFiles + 1, failed.summary.files + failed.summary.failures);
        for (const auto& [name, there] : ReadFolderTree(folder / "failed"))
            EXPECT_EQ(std::string::npos, name.find(".zarvo-")) << name;
    }
}

// Whoever takes the temporary name of a file that is not open gets none of its bytes.
TEST(ExtractionFaults, TakenTemporaryIsNotWritten) {
    const TemporaryFolder folder;
    fs::create_directory(folder / "out");
    WriteFile(folder / "mine", "mine");
    const std::string text = SampleText(3'000'000);
    auto source = std::make_unique<CountingSource>(Archive({{.path = "a", .bytes = text}}, kCompressionNone));
    bool hasSwapped = false;
    source->beforeRead = [&] {
        for (const auto& entry : fs::directory_iterator(folder / "out")) {
            fs::remove(entry.path());
            fs::create_hard_link(folder / "mine", entry.path());
            hasSwapped = true;
        }
    };
    zarvo::archive archive = *zarvo::archive::open(std::move(source));
    zarvo::run_result result;
    {
        const FewDescriptors few(12); // none for a file that stays open
        result = archive.extract(folder / "out", {.threads = 1});
    }
    EXPECT_EQ(true, hasSwapped);
    EXPECT_EQ(1u, result.summary.failures);
    EXPECT_EQ("mine", ReadFile(folder / "mine"));
    EXPECT_EQ(false, fs::exists(folder / "out/a"));
}

// What a full disk has kept from being done is counted.
TEST(ExtractionFaults, FullDiskFailsAllThatIsNotDone) {
    const TemporaryFolder folder;
    const SystemFault fault({.call = "pwrite", .number = 2, .error = ENOSPC});
    const Outcome outcome = Extract(
        Archive(
            {{.path = "a", .bytes = "1"}, {.path = "b", .bytes = "2"}, {.path = "c"}, {.path = "..", .bytes = "3"}}),
        folder.Path(), {}, {.threads = 1});
    EXPECT_EQ((Outcome{.reports = "a\n..: the path has a component \"..\"\n",
                       .code = ZARVO_ERROR_SYSTEM,
                       .files = 1,
                       .failures = 3}),
              outcome);
}

// Of several folders that are missing, the first one can't be made; the others then fail because it is missing.
TEST(ExtractionFaults, RefusedFolderIsTheReason) {
    const TemporaryFolder folder;
    const auto slashes = static_cast<int>(std::ranges::count(folder.Path(), '/'));
    const SystemFault fault({.call = "mkdir", .number = slashes + 1, .error = EACCES});
    const std::string bytes = Archive({{.path = "a"}});
    zarvo::archive archive = OpenBytes(bytes);
    EXPECT_EQ(EACCES, archive.extract(folder / "new/deep/out", {}, {}).error.system_code());
}

class FailingCalls : public testing::Test {
protected:
    static constexpr FaultDescription kFaults[] = {
        {.call = "openat", .error = EMFILE}, {.call = "openat", .error = EINTR},  {.call = "mkdirat", .error = EIO},
        {.call = "linkat", .error = EIO},    {.call = "renameat2", .error = EIO}, {.call = "pwrite", .error = EIO},
        {.call = "pwrite", .error = EINTR},  {.call = "pwrite", .error = ENOSPC}, {.call = "pthread_create"},
    };
    const std::string m_Text = SampleText(1'200'000);
    const std::vector<ArchiveEntry> m_Entries = {
        {.path = "a/b", .bytes = m_Text.substr(0, 100)}, {.path = "c/d", .bytes = m_Text}, {.path = "e"}};
    const FolderTree m_Whole = {{"a/b", Brief(m_Text.substr(0, 100))}, {"c/d", Brief(m_Text)}, {"e", ""}};

    // Every call fails once: what has a name is whole, nothing else is left, and the next run completes it.
    void FailEach(const std::string& bytes) const {
        for (FaultDescription description : kFaults) {
            bool hasStruck = true;
            for (description.number = 1; hasStruck; ++description.number) {
                SCOPED_TRACE(std::string(description.call) + " " + std::to_string(description.number) + " fails with " +
                             std::to_string(description.error));
                const TemporaryFolder folder;
                const size_t descriptors = CountOpenDescriptors();
                {
                    const SystemFault fault(description);
                    const Outcome outcome = Extract(bytes, folder / "out");
                    hasStruck = fault.HasStruck();
                    EXPECT_EQ(3u, outcome.files + outcome.failures) << outcome;
                    EXPECT_EQ(true, hasStruck || outcome.files == 3) << outcome;
                }
                EXPECT_EQ(descriptors, CountOpenDescriptors());
                for (const auto& [name, there] : ReadFolderTree(folder / "out")) {
                    const auto whole = m_Whole.find(name);
                    EXPECT_EQ(whole != m_Whole.end() ? whole->second : kFolder, there) << name;
                }
                EXPECT_EQ(0u, Extract(bytes, folder / "out").failures);
                EXPECT_EQ(m_Whole, ReadFolderTree(folder / "out"));
            }
        }
    }
};

TEST_F(FailingCalls, LeaveNothingHalfDoneOnAnyFileSystem) {
    const struct {
        const char* what;
        std::vector<FaultDescription> lacks;
    } fileSystems[] = {
        {.what = "with everything", .lacks = {}},
        {.what = "without files without names", .lacks = {{.call = "O_TMPFILE", .error = EOPNOTSUPP}}},
        {.what = "without a direct way to name files", .lacks = {{.call = "AT_EMPTY_PATH", .error = ENOENT}}},
        {.what = "without RENAME_NOREPLACE",
         .lacks = {{.call = "O_TMPFILE", .error = EOPNOTSUPP}, {.call = "RENAME_NOREPLACE", .error = EINVAL}}},
        {.what = "without links",
         .lacks = {{.call = "O_TMPFILE", .error = EOPNOTSUPP},
                   {.call = "RENAME_NOREPLACE", .error = EINVAL},
                   {.call = "link of a name", .error = EPERM}}},
    };
    for (const auto& fileSystem : fileSystems) {
        SCOPED_TRACE(fileSystem.what);
        std::deque<SystemFault> lacking;
        for (const FaultDescription& lack : fileSystem.lacks)
            lacking.emplace_back(lack);
        FailEach(Archive(m_Entries));
    }
}

TEST_F(FailingCalls, LeaveNothingHalfDoneOfAStream) {
    const std::string bytes =
        BuildArchive({.entries = m_Entries, .chunkSize = 0, .type = kCompressionLzma, .streamed = true}).bytes;
    FailEach(bytes);
}

// Files in several parts are opened again for each.
TEST_F(FailingCalls, LeaveNothingHalfDoneWithFewDescriptors) {
    const FewDescriptors few(16);
    FailEach(Archive(m_Entries));
}

// A name that a killed process with this one's number has left is passed over.
TEST(ExtractionFaults, TemporariesOfAKilledRunAreInNobodysWay) {
    const TemporaryFolder folder;
    for (int number = 0; number < 2'000; ++number) {
        char name[32];
        snprintf(name, sizeof(name), ".zarvo-%x-%x", static_cast<unsigned>(getpid()), number);
        WriteFile(folder / name, "");
    }
    WriteFile(folder / "a", "old");
    EXPECT_EQ((Outcome{.reports = "a\n", .files = 1}), Extract(Archive({{.path = "a", .bytes = "1"}}), folder.Path()));
    EXPECT_EQ("1", ReadFile(folder / "a"));
}
