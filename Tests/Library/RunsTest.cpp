// Runs over damaged data and over blocks that the memory can't hold, and what visits hand over.
#include "Tests/Library/ExtractionTest.h"
#include "Tests/Support/FolderTree.h"

#include <chrono>
#include <condition_variable>
#include <csignal>
#include <map>
#include <mutex>
#include <sys/mman.h>
#include <sys/resource.h>

// Random damage: what is told, and what is on the disk, is the same for any number of threads, and agrees with what
// tests, visits and reads say.
TEST(Runs, TellDamageAlikeForAnyThreads) {
    const struct {
        const char* what;
        ArchiveDescription form;
        int flips;
    } cases[] = {
        {.what = "LZ4", .form = {.type = kCompressionLz4}, .flips = 100},
        {.what = "LZMA", .form = {.type = kCompressionLzma}, .flips = 6},
        {.what = "LZMA streams",
         .form = {.chunkSize = 3'000'000, .type = kCompressionLzma, .streamed = true},
         .flips = 6},
    };
    std::mt19937 random(5);
    for (const auto& row : cases) {
        SCOPED_TRACE(row.what);
        ArchiveDescription description = row.form;
        description.entries = ManyFiles(7);
        std::string bytes = BuildArchive(description).bytes;
        for (int flip = 0; flip < row.flips; ++flip)
            bytes[bytes.size() / 8 + random() % (bytes.size() / 8 * 7)] ^= static_cast<char>(1 << random() % 8);
        zarvo::archive archive = OpenBytes(bytes);

        std::map<uint64_t, uint64_t> damaged;
        zarvo::test_options test;
        test.entry = [&](uint64_t index, uint64_t readable) { damaged[index] = readable; };
        ASSERT_EQ(ZARVO_OK, archive.test({}, test).error.code());
        EXPECT_NE(0u, damaged.size());
        for (const zarvo::entry entry : archive.entries()) {
            const bool isDamaged = damaged.contains(entry.index());
            EXPECT_EQ(isDamaged ? damaged[entry.index()] : entry.size(), *archive.readable(entry.index()))
                << entry.path();
        }

        const TemporaryFolder alone, together;
        const Outcome outcome = Extract(bytes, alone.Path(), {.keep_broken = true}, {.threads = 1});
        EXPECT_EQ(damaged.size(), outcome.failures);
        for (const auto& [index, readable] : damaged) {
            const std::string path(archive.entries()[index].path());
            EXPECT_EQ(readable, std::filesystem::file_size(alone / path)) << path;
        }
        EXPECT_EQ(outcome, Extract(bytes, together.Path(), {.keep_broken = true}, {.threads = 8}));
        EXPECT_EQ(ReadFolderTree(alone.Path()), ReadFolderTree(together.Path()));
    }
}

// Several threads come upon them in any order.
TEST(Runs, TellRemarksInOneOrder) {
    ArchiveDescription description = {.entries = {{.path = "a", .bytes = "0123456789"}}};
    const auto add = [&](int kind) {
        description.blocks.push_back({.size = 2, .type = static_cast<CompressionType>(kind), .stored = "01"});
    };
    description.entries[0].bytes.resize(2'406);
    for (int block = 0; block < 1'200; ++block)
        add(9); // more than are kept of different remarks
    for (const int kind : {7, 8, 7})
        add(kind);
    const std::string bytes = BuildArchive(description).bytes;
    for (const uint32_t threads : {1u, 3u}) {
        std::string remarks;
        zarvo::archive archive = OpenBytes(bytes, {.log = [&](std::string_view remark) { remarks += remark; }});
        EXPECT_EQ(ZARVO_OK, archive.test({.threads = threads}).error.code());
        EXPECT_EQ("Decompressing this format (7) is not supported on this platform."
                  "Decompressing this format (8) is not supported on this platform."
                  "Decompressing this format (9) is not supported on this platform.",
                  remarks)
            << threads << " threads";
    }
}

TEST(Runs, HandOverEachFileInOrder) {
    const std::vector<ArchiveEntry> entries = ManyFiles(9);
    for (const bool isStreamed : {false, true}) {
        SCOPED_TRACE(isStreamed ? "streamed" : "in blocks");
        const std::string bytes = BuildArchive({.entries = entries,
                                                .chunkSize = isStreamed ? 0u : 131'072u,
                                                .type = kCompressionLzma,
                                                .streamed = isStreamed})
                                      .bytes;
        zarvo::archive archive = OpenBytes(bytes);
        std::mutex lock;
        std::map<uint64_t, std::string> seen;
        zarvo::visit_options visit;
        visit.bytes = [&](uint64_t index, uint64_t offset, std::span<const std::byte> piece) {
            const std::lock_guard guard(lock);
            EXPECT_EQ(seen[index].size(), offset);
            seen[index].append(reinterpret_cast<const char*>(piece.data()), piece.size());
        };
        ASSERT_EQ(ZARVO_OK, archive.visit({.threads = 4}, visit).error.code());
        for (size_t index = 0; index < entries.size(); ++index)
            EXPECT_EQ(Delivered{entries[index].bytes}, Delivered{seen[index]}) << index;
    }
}

// Callers may hold something for each file until its result is told.
TEST(Runs, TellOfFoldersBeforeTheDataIsRead) {
    const std::string bytes =
        BuildArchive(
            {.entries = {{.path = "folder", .flags = kFolderEntry}, {.path = "empty"}, {.path = "file", .bytes = "1"}}})
            .bytes;
    zarvo::archive archive = OpenBytes(bytes);
    std::mutex lock;
    std::condition_variable isTold;
    uint64_t told = 0, toldBefore = 0;
    zarvo::visit_options visit;
    visit.report = [&](const zarvo_report&) {
        const std::lock_guard guard(lock);
        ++told;
        isTold.notify_one();
    };
    visit.bytes = [&](uint64_t, uint64_t, std::span<const std::byte>) {
        std::unique_lock guard(lock);
        isTold.wait_for(guard, std::chrono::seconds(10), [&] { return told == 2; });
        toldBefore = told;
    };
    ASSERT_EQ(ZARVO_OK, archive.visit({.threads = 1}, visit).error.code());
    EXPECT_EQ(2u, toldBefore);
    EXPECT_EQ(3u, told);
}

// A block that the budget can't hold is streamed where its kind allows it. Where not, all files in it fail, also those
// that begin inside it. Stored bytes count, too: a small block can claim, and have, many.
TEST(Runs, KeepTheMemoryBudget) {
    const std::string text = SampleText(3'000'000);
    const struct {
        const char* what;
        ArchiveBlock block;
        const char* reports;
    } cases[] = {
        {.what = "LZMA", .block = {.size = 3'000'001, .type = kCompressionLzma}, .reports = "a\nb\n"},
        {.what = "LZ4",
         .block = {.size = 3'000'001, .type = kCompressionLz4},
         .reports = "a: block 0 of 3000001 bytes is too large to be held in memory\n"
                    "b: block 0 of 3000001 bytes is too large to be held in memory\n"},
        {.what = "small LZ4 of many bytes",
         .block = {.size = 4, .type = kCompressionLz4, .stored = std::string(3'000'000, 'x')},
         .reports = "a: block 0 of 3000000 bytes is too large to be held in memory\nb\n"},
    };
    for (const auto& row : cases) {
        const TemporaryFolder folder;
        const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = text}, {.path = "b", .bytes = "2"}},
                                                .blocks = {row.block}})
                                      .bytes;
        EXPECT_EQ(row.reports, Extract(bytes, folder / "out", {}, {.threads = 2, .memory = 4'000'000}).reports)
            << row.what;
    }
}

TEST(Runs, KeepBrokenFilesOnlyWhereAsked) {
    const std::string bytes =
        BuildArchive({.entries = {{.path = "a", .bytes = "12345678"}},
                      .blocks = {{.size = 4}, {.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')}}})
            .bytes;
    const TemporaryFolder folder;
    EXPECT_EQ((Outcome{.reports = "a: block 1 is damaged\n", .failures = 1}), Extract(bytes, folder.Path()));
    EXPECT_EQ(FolderTree{}, ReadFolderTree(folder.Path()));
    EXPECT_EQ((Outcome{.reports = "a broken: block 1 is damaged\n", .failures = 1}),
              Extract(bytes, folder.Path(), {.keep_broken = true}));
    EXPECT_EQ((FolderTree{{"a", "1234"}}), ReadFolderTree(folder.Path()));
}

// Blocks that claim 4 GiB each, all past the archive's end.
TEST(Runs, MissingBlocksCostNextToNothing) {
    constexpr size_t kBlocks = 1'000;
    ArchiveDescription description = {.entries = {{.path = "a", .bytes = std::string(kBlocks, 'x')}}, .chunkSize = 1};
    for (size_t index = 0; index < kBlocks; ++index)
        description.fields["block[" + std::to_string(index) + "].uncompressedSize"] = 0xFFFF'FFFF;
    description.fields["node[0].size"] = kBlocks * UINT64_C(0xFFFF'FFFF);
    const std::string bytes = BuildArchive(description).bytes;
    zarvo::archive archive = OpenBytes(bytes);
    rusage before = {}, after = {};
    ASSERT_EQ(0, getrusage(RUSAGE_SELF, &before));
    const zarvo::run_result result = archive.test();
    ASSERT_EQ(0, getrusage(RUSAGE_SELF, &after));
    EXPECT_EQ(ZARVO_OK, result.error.code());
    EXPECT_EQ(kBlocks, result.summary.damaged_blocks);
    EXPECT_GT(1, after.ru_utime.tv_sec - before.ru_utime.tv_sec);
    const TemporaryFolder folder;
    EXPECT_EQ("a: block 0 ends after the archive's last byte\n", Extract(bytes, folder.Path()).reports);
}

// All threads together decode 8 MiB at a time, however many they are.
TEST(Runs, ManyThreadsShareTheMemoryOfEight) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = SampleText(3'000'000)}}}).bytes;
    zarvo::archive archive = OpenBytes(bytes);
    std::mutex lock;
    size_t largest = 0;
    zarvo::visit_options visit;
    visit.bytes = [&](uint64_t, uint64_t, std::span<const std::byte> piece) {
        const std::lock_guard guard(lock);
        largest = std::max(largest, piece.size());
    };
    ASSERT_EQ(ZARVO_OK, archive.visit({.threads = 64}, visit).error.code());
    EXPECT_EQ(131'072u, largest);
}

// Memory that a program makes readable when it is read.
class LazyMemory : private NonCopyable {
public:
    explicit LazyMemory(const std::string& bytes) {
        s_Size = bytes.size();
        s_Begin = mmap(nullptr, s_Size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        memcpy(s_Begin, bytes.data(), s_Size);
        struct sigaction action = {};
        action.sa_flags = SA_SIGINFO;
        action.sa_sigaction = [](int, siginfo_t* fault, void*) {
            const auto* const at = static_cast<const char*>(fault->si_addr);
            const auto* const begin = static_cast<const char*>(s_Begin);
            if (at < begin || at >= begin + s_Size) (void)signal(SIGSEGV, SIG_DFL); // a fault of its own
            mprotect(s_Begin, s_Size, PROT_READ);
            s_IsRead = true;
        };
        sigaction(SIGSEGV, &action, &m_Before);
        Hide();
    }
    ~LazyMemory() {
        sigaction(SIGSEGV, &m_Before, nullptr);
        munmap(s_Begin, s_Size);
    }

    void Hide() {
        mprotect(s_Begin, s_Size, PROT_NONE);
        s_IsRead = false;
    }
    std::span<const std::byte> Bytes() const { return {static_cast<const std::byte*>(s_Begin), s_Size}; }
    static bool IsRead() { return s_IsRead; }

private:
    static inline void* s_Begin = nullptr;
    static inline size_t s_Size = 0;
    static inline std::atomic<bool> s_IsRead = false;
    struct sigaction m_Before = {};
};

TEST(Runs, LeaveFaultsOfThreadsToTheProgram) {
    LazyMemory memory(BuildArchive({.entries = ManyFiles(3)}).bytes);
    zarvo::archive archive = *zarvo::archive::open(memory.Bytes());
    memory.Hide();
    EXPECT_EQ(ZARVO_OK, archive.test({.threads = 2}).error.code());
    EXPECT_TRUE(memory.IsRead());
}
