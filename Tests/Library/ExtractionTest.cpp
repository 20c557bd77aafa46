#include "Tests/Library/LibraryTest.h"
#include "Tests/Library/SystemFaults.h"
#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/TemporaryFolder.h"

#include <deque>
#include <fcntl.h>
#include <map>
#include <mutex>
#include <random>
#include <sys/resource.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

// What lies below a folder: the text of each file, "/" for a folder, "-> target" for a link.
using Tree = std::map<std::string, std::string>;

Tree TreeOf(const std::string& folder) {
    Tree tree;
    for (const fs::directory_entry& entry : fs::recursive_directory_iterator(folder)) {
        const std::string name = entry.path().string().substr(folder.size() + 1);
        if (entry.is_symlink())
            tree[name] = "-> " + fs::read_symlink(entry.path()).string();
        else if (entry.is_directory())
            tree[name] = "/";
        else
            tree[name] = ReadFile(entry.path());
    }
    return tree;
}

// How many things are below a folder, also where they can't be read.
size_t CountThings(const std::string& folder) {
    const fs::recursive_directory_iterator things(folder, fs::directory_options::skip_permission_denied);
    return static_cast<size_t>(std::distance(begin(things), end(things)));
}

// While it is there, the process may have so many descriptors open.
class FewDescriptors : private NonCopyable {
public:
    explicit FewDescriptors(rlim_t count) {
        EXPECT_EQ(0, getrlimit(RLIMIT_NOFILE, &m_Before));
        const rlimit few = {count, m_Before.rlim_max};
        EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &few));
    }
    ~FewDescriptors() { EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &m_Before)); }

private:
    rlimit m_Before = {};
};

// How an extraction went: a line for each report, and what it comes to.
struct Outcome {
    std::string reports = {};
    zarvo_code code = ZARVO_OK;
    uint64_t files = 0;
    uint64_t failures = 0;

    friend bool operator==(const Outcome&, const Outcome&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Outcome& outcome) {
        return out << "code " << outcome.code << ", " << outcome.files << " files, " << outcome.failures
                   << " failures\n"
                   << outcome.reports;
    }
};

struct Settings {
    uint32_t threads = 2;
    int32_t overwrite = ZARVO_OVERWRITE_ALWAYS;
    int32_t keepBroken = 0;
    int32_t dryRun = 0;
    uint64_t strip = 0;
    uint64_t memory = 0;
    zarvo_patterns* wanted = nullptr;
};

struct ReportContext {
    const zarvo_archive* archive;
    std::string lines = {};
};

void AddReport(void* given, const zarvo_report* report) {
    auto& context = *static_cast<ReportContext*>(given);
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    EXPECT_EQ(ZARVO_OK, zarvo_get_entry(context.archive, report->index, &entry));
    const char* const words[] = {"", " kept", ": ", " broken: "};
    context.lines += std::string(entry.path) + words[report->outcome] + report->text + "\n";
}

Outcome Extract(const std::string& bytes, const std::string& folder, const Settings& settings = {}) {
    const zarvo::archive archive = OpenBytes(bytes);
    ReportContext context{archive.get()};
    zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
    run.threads = settings.threads;
    run.memory = settings.memory;
    run.wanted = settings.wanted;
    run.context = &context;
    zarvo_extract_options how = ZARVO_EXTRACT_OPTIONS_INIT;
    how.overwrite = settings.overwrite;
    how.keep_broken = settings.keepBroken;
    how.dry_run = settings.dryRun;
    how.strip = settings.strip;
    how.report = AddReport;
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    Outcome outcome;
    outcome.code = zarvo_extract(archive.get(), folder.c_str(), &run, &how, &summary, nullptr);
    outcome.reports = context.lines;
    outcome.files = summary.files;
    outcome.failures = summary.failures;
    return outcome;
}

std::string Archive(std::vector<ArchiveEntry> entries, CompressionType type = kCompressionLz4) {
    return BuildArchive({.entries = std::move(entries), .type = type}).bytes;
}

// Files of all sizes, in folders, with the units' size in reach; some are empty, some hold several units.
std::vector<ArchiveEntry> ManyFiles(unsigned seed) {
    std::mt19937 random(seed);
    const std::string text = SampleText(3'000'000);
    std::vector<ArchiveEntry> entries;
    for (int number = 0; number < 40; ++number) {
        const size_t sizes[] = {0, 10, 5'000, 50'000};
        const size_t size = number == 20 ? 1'300'000 : sizes[random() % 4];
        const std::string folder = "f" + std::to_string(random() % 5) + "/g" + std::to_string(random() % 3) + "/";
        entries.push_back({.path = folder + std::to_string(number), .bytes = text.substr(random() % 1'000'000, size)});
    }
    return entries;
}

} // namespace

TEST(Extraction, WritesEveryFormWithAnyNumberOfThreads) {
    const std::vector<ArchiveEntry> entries = ManyFiles(3);
    Tree expected;
    for (const ArchiveEntry& entry : entries) {
        expected[entry.path] = entry.bytes;
        for (fs::path above = fs::path(entry.path).parent_path(); !above.empty(); above = above.parent_path())
            expected[above] = "/";
    }
    const struct {
        const char* what;
        ArchiveDescription form;
    } cases[] = {
        {"stored", {}},
        {"LZ4", {.type = kCompressionLz4}},
        {"LZ4 in tiny blocks", {.chunkSize = 1'000, .type = kCompressionLz4}},
        {"LZMA", {.type = kCompressionLzma}},
        {"LZMA streams", {.chunkSize = 3'000'000, .type = kCompressionLzma, .streamed = true}},
        {"web", {.layout = ArchiveLayout::kWeb}},
        {"raw", {.layout = ArchiveLayout::kRaw}},
    };
    for (const auto& row : cases) {
        ArchiveDescription description = row.form;
        description.entries = entries;
        const std::string bytes = BuildArchive(description).bytes;
        for (const uint32_t threads : {1u, 2u, 8u}) {
            SCOPED_TRACE(std::string(row.what) + ", threads " + std::to_string(threads));
            const TemporaryFolder folder;
            const Outcome outcome = Extract(bytes, folder / "out/put", {.threads = threads});
            EXPECT_EQ(ZARVO_OK, outcome.code);
            EXPECT_EQ(entries.size(), outcome.files);
            EXPECT_EQ(0u, outcome.failures);
            EXPECT_EQ(true, expected == TreeOf(folder / "out/put"));
        }
    }
}

// Random damage: what is told, and what is on the disk, is the same for any number of threads, and agrees with what
// tests, visits and reads say.
TEST(Extraction, DamageIsToldAlikeByAllAndForAnyThreads) {
    std::mt19937 random(5);
    for (const CompressionType type : {kCompressionLz4, kCompressionLzma}) {
        for (const bool isStreamed : {false, type == kCompressionLzma}) {
            SCOPED_TRACE(std::to_string(type) + (isStreamed ? " streamed" : ""));
            std::string bytes = BuildArchive({.entries = ManyFiles(7),
                                              .chunkSize = isStreamed ? 3'000'000u : 131'072u,
                                              .type = type,
                                              .streamed = isStreamed})
                                    .bytes;
            for (int flip = 0; flip < (type == kCompressionLz4 ? 100 : 6); ++flip)
                bytes[bytes.size() / 8 + random() % (bytes.size() / 8 * 7)] ^= static_cast<char>(1 << random() % 8);
            zarvo::archive archive = OpenBytes(bytes);

            std::map<uint64_t, uint64_t> damaged;
            zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
            run.context = &damaged;
            zarvo_test_options test = ZARVO_TEST_OPTIONS_INIT;
            test.entry = [](void* context, uint64_t index, uint64_t readable) {
                (*static_cast<std::map<uint64_t, uint64_t>*>(context))[index] = readable;
            };
            ASSERT_EQ(ZARVO_OK, zarvo_test(archive.get(), &run, &test, nullptr, nullptr));
            EXPECT_NE(0u, damaged.size());
            for (const zarvo::entry entry : archive.entries()) {
                const bool isDamaged = damaged.contains(entry.index());
                EXPECT_EQ(isDamaged ? damaged[entry.index()] : entry.size(), *archive.readable(entry.index()))
                    << entry.path();
            }

            Outcome first;
            Tree firstTree;
            for (const uint32_t threads : {1u, 8u}) {
                const TemporaryFolder folder;
                const Outcome outcome = Extract(bytes, folder.Path(), {.threads = threads, .keepBroken = 1});
                EXPECT_EQ(damaged.size(), outcome.failures);
                const Tree tree = TreeOf(folder.Path());
                for (const auto& [index, readable] : damaged)
                    EXPECT_EQ(readable, tree.at(std::string(archive.entries()[index].path())).size()) << index;
                if (threads == 1) {
                    first = outcome;
                    firstTree = tree;
                }
                EXPECT_EQ(first, outcome);
                EXPECT_EQ(true, firstTree == tree);
            }
        }
    }
}

TEST(Extraction, VisitHandsOverEachFileInOrder) {
    struct Seen {
        std::mutex lock;
        std::map<uint64_t, std::string> bytes;
    };
    const std::vector<ArchiveEntry> entries = ManyFiles(9);
    for (const bool isStreamed : {false, true}) {
        const std::string bytes = BuildArchive({.entries = entries,
                                                .chunkSize = isStreamed ? 0u : 131'072u,
                                                .type = kCompressionLzma,
                                                .streamed = isStreamed})
                                      .bytes;
        const zarvo::archive archive = OpenBytes(bytes);
        Seen seen;
        zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
        run.threads = 4;
        run.context = &seen;
        zarvo_visit_options visit = ZARVO_VISIT_OPTIONS_INIT;
        visit.bytes = [](void* context, uint64_t index, uint64_t offset, const void* data, size_t size) {
            auto& given = *static_cast<Seen*>(context);
            std::lock_guard lock(given.lock);
            EXPECT_EQ(given.bytes[index].size(), offset);
            given.bytes[index].append(static_cast<const char*>(data), size);
        };
        ASSERT_EQ(ZARVO_OK, zarvo_visit(archive.get(), &run, &visit, nullptr, nullptr));
        for (size_t index = 0; index < entries.size(); ++index)
            EXPECT_EQ(true, entries[index].bytes == seen.bytes[index]) << index;
    }
}

TEST(Extraction, PathsAreRefusedSettledAndStripped) {
    const std::string bytes = Archive({{.path = "/a/b", .bytes = "1"},
                                       {.path = "../x", .bytes = "2"},
                                       {.path = "a\\b", .bytes = "3"},
                                       {.path = "a/b/c", .bytes = "4"},
                                       {.path = "d", .flags = kFolderEntry},
                                       {.path = "d", .bytes = "5"},
                                       {.path = "d/e", .bytes = "6"},
                                       {.path = ".", .bytes = "7"},
                                       {.path = "f/", .bytes = "8"}});
    {
        const TemporaryFolder folder;
        EXPECT_EQ((Outcome{.reports = "../x: the path has a component \"..\"\n"
                                      "a\\b\n"
                                      "a/b/c: an entry before it in the archive has its place\n"
                                      "d\n"
                                      "d: an entry before it in the archive has its place\n"
                                      "d/e\n"
                                      ".: the path is empty\n"
                                      "f/: the path of a file ends with a separator\n",
                           .files = 2,
                           .failures = 5}),
                  Extract(bytes, folder / "out"));
        EXPECT_EQ((Tree{{"a", "/"}, {"a/b", "3"}, {"d", "/"}, {"d/e", "6"}}), TreeOf(folder / "out"));
    }
    {
        const TemporaryFolder folder;
        EXPECT_EQ((Outcome{.reports = "../x: the path has a component \"..\"\n"
                                      "a\\b\n"
                                      "a/b/c: an entry before it in the archive has its place\n"
                                      "d/e\n"
                                      ".: the path is empty\n"
                                      "f/: the path of a file ends with a separator\n",
                           .files = 2,
                           .failures = 4}),
                  Extract(bytes, folder / "out", {.strip = 1}));
        EXPECT_EQ((Tree{{"b", "3"}, {"e", "6"}}), TreeOf(folder / "out"));
    }
}

// A dry run says what the run then says, whatever is in the folder, and changes nothing.
TEST(Extraction, DryRunSaysWhatTheRunWouldSay) {
    const std::string text = SampleText(1'500'000);
    ArchiveDescription description;
    description.entries = {{.path = "a/b", .bytes = "1"},
                           {.path = "empty"},
                           {.path = "..", .bytes = "2"},
                           {.path = "file/x", .bytes = "3"},
                           {.path = "file/y", .flags = kFolderEntry},
                           {.path = "link/x"},
                           {.path = "folder", .bytes = "4"},
                           {.path = "folder/x", .bytes = "5"},
                           {.path = "pipe", .bytes = "6"},
                           {.path = "standing", .flags = kFolderEntry},
                           {.path = "sealed/x", .bytes = "7"},
                           {.path = "sealed/there", .bytes = "8"},
                           {.path = "sealed/new/x", .bytes = "9"},
                           {.path = "new/" + std::string(300, 'n') + "/x", .bytes = "10"},
                           {.path = "new/" + std::string(300, 'n'), .bytes = "11"},
                           {.path = std::string(300, 'm'), .bytes = "12"},
                           {.path = "broken", .bytes = "12345678"},
                           {.path = "large", .bytes = text},
                           {.path = "outside", .bytes = "13"}};
    size_t before = 0;
    for (size_t entry = 0; entry < 16; ++entry)
        before += description.entries[entry].bytes.size();
    description.blocks = {{.size = before + 4},
                          {.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')},
                          {.size = text.size(), .type = kCompressionLz4}};
    description.fields["node[18].offset"] = 5'000'000;
    const std::string bytes = BuildArchive(description).bytes;
    const auto settings = [](int32_t overwrite, int32_t keepBroken, int32_t dryRun) {
        return Settings{.overwrite = overwrite, .keepBroken = keepBroken, .dryRun = dryRun};
    };
    for (const int32_t overwrite : {ZARVO_OVERWRITE_ALWAYS, ZARVO_OVERWRITE_NEVER, ZARVO_OVERWRITE_FAIL})
        for (const int32_t keepBroken : {0, 1})
            for (const char* const below : {"", "/new/out"}) {
                SCOPED_TRACE(std::to_string(overwrite) + below);
                const TemporaryFolder folder;
                fs::permissions(folder.Path(), fs::perms::all);
                const OrdinaryUser user;
                for (const char* const name : {"folder", "standing", "sealed"})
                    fs::create_directory(folder / name);
                for (const char* const name : {"file", "broken", "sealed/there"})
                    WriteFile(folder / name, "old");
                fs::create_symlink("standing", folder / "link");
                EXPECT_EQ(0, mkfifo((folder / "pipe").c_str(), 0600));
                fs::permissions(folder / "sealed", fs::perms::owner_read | fs::perms::owner_exec);
                const std::string out = folder.Path() + below;
                const size_t things = CountThings(folder.Path());
                const Outcome dry = Extract(bytes, out, settings(overwrite, keepBroken, 1));
                EXPECT_EQ(things, CountThings(folder.Path()));
                const Outcome wet = Extract(bytes, out, settings(overwrite, keepBroken, 0));
                fs::permissions(folder / "sealed", fs::perms::owner_all);
                EXPECT_EQ(wet, dry);
                EXPECT_LT(0u, wet.files);
                EXPECT_LT(5u, wet.failures);
            }
}

TEST(Extraction, DryRunSaysWhyTheFolderCantBeMade) {
    const TemporaryFolder folder;
    WriteFile(folder / "file", "");
    fs::create_symlink("nowhere", folder / "dangling");
    const std::string bytes = Archive({{.path = "a", .bytes = "1"}});
    for (const std::string name :
         {"file", "file/out", "dangling", "dangling/out", "dangling/out/more", "new/out/", "new//more"}) {
        SCOPED_TRACE(name);
        const Outcome dry = Extract(bytes, folder / name, {.dryRun = 1});
        EXPECT_EQ(false, fs::exists(folder / "new") && !name.starts_with("new//"));
        EXPECT_EQ(Extract(bytes, folder / name), dry);
    }
    EXPECT_EQ(Extract(bytes, ""), Extract(bytes, "", {.dryRun = 1}));
}

// A second run over what is there reads none of the data.
TEST(Extraction, KeptFilesAreNotDecoded) {
    const TemporaryFolder folder;
    for (const int32_t overwrite : {ZARVO_OVERWRITE_ALWAYS, ZARVO_OVERWRITE_NEVER, ZARVO_OVERWRITE_FAIL}) {
        SCOPED_TRACE(overwrite);
        auto source = std::make_unique<CountingSource>(Archive(ManyFiles(13)));
        CountingSource& counts = *source;
        zarvo::archive archive = *zarvo::archive::open(std::move(source));
        counts.reads = 0;
        const zarvo::run_result result = archive.extract(folder / "out", {}, {.overwrite = overwrite});
        EXPECT_EQ(ZARVO_OK, result.error.code());
        EXPECT_EQ(overwrite == ZARVO_OVERWRITE_ALWAYS, counts.reads.load() != 0);
        EXPECT_EQ(overwrite == ZARVO_OVERWRITE_NEVER ? 40u : 0u, result.summary.kept);
        EXPECT_EQ(overwrite == ZARVO_OVERWRITE_FAIL ? 40u : 0u, result.summary.failures);
    }
}

// Very many files that begin before a unit's end and end after it, with few descriptors: all are written, one decoding
// is enough, and a run that fails leaves nothing behind.
TEST(Extraction, AnyNumberOfFilesMayShareTheirData) {
    constexpr uint64_t kFiles = 500, kFrom = 1'040'000, kSize = 30'000;
    const std::string text = SampleText(3'000'000);
    ArchiveDescription description{.entries = {{.path = "all", .bytes = text}}, .type = kCompressionLz4};
    for (uint64_t file = 0; file < kFiles; ++file) {
        const std::string node = "node[" + std::to_string(description.entries.size()) + "].";
        description.entries.push_back({.path = "f" + std::to_string(file % 20) + "/" + std::to_string(file)});
        description.fields[node + "offset"] = kFrom + file;
        description.fields[node + "size"] = kSize;
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
            result = archive.extract(folder / "out", {.threads = 2});
            const SystemFault fault({.call = "pwrite", .number = 400, .error = ENOSPC});
            failed = archive.extract(folder / "failed", {.threads = 2});
        }
        EXPECT_EQ(kFiles + 1, result.summary.files);
        EXPECT_LE(counts.bytesRead.load(), 2 * archive.info().stored_size);
        const Tree tree = TreeOf(folder / "out");
        EXPECT_EQ(kFiles + 21, tree.size());
        for (uint64_t file = 0; file < kFiles; ++file)
            EXPECT_EQ(text.substr(kFrom + file, kSize),
                      tree.at("f" + std::to_string(file % 20) + "/" + std::to_string(file)));
        EXPECT_EQ(ZARVO_ERROR_SYSTEM, failed.error.code());
        EXPECT_EQ(kFiles + 1, failed.summary.files + failed.summary.failures);
        for (const auto& [name, there] : TreeOf(folder / "failed"))
            EXPECT_EQ(std::string::npos, name.find(".zarvo-")) << name;
    }
}

// Whoever takes the temporary name of a file that is not open gets none of its bytes.
TEST(Extraction, TakenTemporaryIsNotWritten) {
    const TemporaryFolder folder;
    fs::create_directory(folder / "out");
    WriteFile(folder / "mine", "mine");
    const std::string text = SampleText(3'000'000);
    const std::string bytes = Archive({{.path = "a", .bytes = text}}, kCompressionNone);
    struct Swapping final : zarvo::source {
        int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
            for (const auto& entry : fs::directory_iterator(*folder / "out")) {
                fs::remove(entry.path());
                fs::create_hard_link(*folder / "mine", entry.path());
                hasSwapped = true;
            }
            const size_t count = std::min<uint64_t>(buffer.size(), bytes->size() - std::min(offset, bytes->size()));
            memcpy(buffer.data(), bytes->data() + offset, count);
            return static_cast<int64_t>(count);
        }
        int64_t size() override { return static_cast<int64_t>(bytes->size()); }

        const TemporaryFolder* folder = nullptr;
        const std::string* bytes = nullptr;
        bool hasSwapped = false;
    };
    auto source = std::make_unique<Swapping>();
    Swapping& swapping = *source;
    swapping.folder = &folder;
    swapping.bytes = &bytes;
    zarvo::archive archive = *zarvo::archive::open(std::move(source));
    zarvo::run_result result;
    {
        const FewDescriptors few(12); // none for a file that stays open
        result = archive.extract(folder / "out", {.threads = 1});
    }
    EXPECT_EQ(true, swapping.hasSwapped);
    EXPECT_EQ(1u, result.summary.failures);
    EXPECT_EQ("mine", ReadFile(folder / "mine"));
    EXPECT_EQ(false, fs::exists(folder / "out/a"));
}

// What a full disk has kept from being done is counted.
TEST(Extraction, FullDiskFailsAllThatIsNotDone) {
    const TemporaryFolder folder;
    const SystemFault fault({.call = "pwrite", .number = 2, .error = ENOSPC});
    const Outcome outcome = Extract(
        Archive(
            {{.path = "a", .bytes = "1"}, {.path = "b", .bytes = "2"}, {.path = "c"}, {.path = "..", .bytes = "3"}}),
        folder.Path(), {.threads = 1});
    EXPECT_EQ((Outcome{.reports = "a\n..: the path has a component \"..\"\n",
                       .code = ZARVO_ERROR_SYSTEM,
                       .files = 1,
                       .failures = 3}),
              outcome);
}

// How far tests are is told in entries, too; the last word is that all have been looked at.
TEST(Extraction, ProgressOfTestsCountsEntries) {
    ArchiveDescription description{.entries = ManyFiles(15), .chunkSize = 1'000'000, .type = kCompressionLz4};
    description.entries.push_back({.path = "folder", .flags = kFolderEntry});
    const std::string bytes = BuildArchive(description).bytes;
    zarvo::archive archive = OpenBytes(bytes);
    zarvo_progress last = {};
    zarvo::run_options run;
    run.progress = [&](const zarvo_progress& progress) {
        last = progress;
        return true;
    };
    EXPECT_EQ(ZARVO_OK, archive.test(run).error.code());
    EXPECT_EQ(41u, last.files_total);
    EXPECT_EQ(41u, last.files);
    EXPECT_EQ(archive.info().data_size, last.bytes);
}

// Bytes are counted with each file, and not when all that are decoded together are done.
TEST(Extraction, ProgressCountsTheBytesOfEachFile) {
    struct State {
        std::atomic<bool> isWaiting = false, isSeen = false;
        uint64_t bytes = 0;
    } state;
    const std::string bytes =
        Archive({{.path = "a", .bytes = "1"}, {.path = "b", .bytes = "22"}, {.path = "c", .bytes = "333"}});
    const zarvo::archive archive = OpenBytes(bytes);
    zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
    run.context = &state;
    run.progress = [](void* context, const zarvo_progress* progress) {
        State& seen = *static_cast<State*>(context);
        if (!seen.isWaiting || seen.isSeen) return 0;
        seen.bytes = progress->bytes;
        seen.isSeen = true;
        seen.isSeen.notify_all();
        return 0;
    };
    zarvo_visit_options visit = ZARVO_VISIT_OPTIONS_INIT;
    visit.bytes = [](void* context, uint64_t index, uint64_t, const void*, size_t) {
        State& waiting = *static_cast<State*>(context);
        if (index != 2) return;
        waiting.isWaiting = true;
        waiting.isSeen.wait(false);
    };
    EXPECT_EQ(ZARVO_OK, zarvo_visit(archive.get(), &run, &visit, nullptr, nullptr));
    EXPECT_EQ(3u, state.bytes);
}

#ifndef VARNEX_UNDER_SANITIZERS
// Without threads, the calling one works, and looks up from it.
TEST(Extraction, ProgressStopsARunWithoutThreads) {
    const std::string bytes = BuildArchive({.entries = ManyFiles(17), .type = kCompressionLz4}).bytes;
    zarvo::archive archive = OpenBytes(bytes);
    size_t looks = 0, files = 0;
    zarvo::run_options run;
    run.progress = [&](const zarvo_progress&) { return ++looks < 2; };
    zarvo::visit_options visit;
    visit.bytes = [&](uint64_t, uint64_t, std::span<const std::byte>) {
        ++files;
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    };
    const SystemFault fault({.call = "pthread_create"});
    EXPECT_EQ(ZARVO_ERROR_STOPPED, archive.visit(run, visit).error.code());
    EXPECT_GT(8u, files);
}
#endif

TEST(Extraction, WhatIsThereIsReplacedKeptOrAFailure) {
    const std::string bytes = Archive({{.path = "a", .bytes = "new"}, {.path = "b"}, {.path = "c", .bytes = "new"}});
    const struct {
        int32_t overwrite;
        Outcome outcome;
        Tree tree;
    } cases[] = {
        {.overwrite = ZARVO_OVERWRITE_ALWAYS,
         .outcome = {.reports = "a\nb\nc\n", .files = 3},
         .tree = {{"a", "new"}, {"b", ""}, {"c", "new"}, {"linked", "old"}}},
        {.overwrite = ZARVO_OVERWRITE_NEVER,
         .outcome = {.reports = "a kept\nb kept\nc\n", .files = 1},
         .tree = {{"a", "old"}, {"b", "-> linked"}, {"c", "new"}, {"linked", "old"}}},
        {.overwrite = ZARVO_OVERWRITE_FAIL,
         .outcome = {.reports = "a: File exists\nb: File exists\nc\n", .files = 1, .failures = 2},
         .tree = {{"a", "old"}, {"b", "-> linked"}, {"c", "new"}, {"linked", "old"}}},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.overwrite);
        const TemporaryFolder folder;
        WriteFile(folder / "linked", "old");
        fs::create_hard_link(folder / "linked", folder / "a");
        fs::create_symlink("linked", folder / "b");
        EXPECT_EQ(row.outcome, Extract(bytes, folder.Path(), {.overwrite = row.overwrite}));
        EXPECT_EQ(row.tree, TreeOf(folder.Path()));
    }
}

// Nothing leaves the folder by a link, and what is no file is never opened.
TEST(Extraction, LinksAndOddThingsAreNeverFollowed) {
    const TemporaryFolder folder;
    fs::create_directories(folder / "out");
    fs::create_directories(folder / "elsewhere");
    WriteFile(folder / "secret", "secret");
    fs::create_symlink("../elsewhere", folder / "out/folder");
    fs::create_symlink("../secret", folder / "out/file");
    fs::create_symlink("nowhere", folder / "out/dangling");
    fs::create_directories(folder / "out/standing");
    ASSERT_EQ(0, mkfifo((folder / "out/pipe").c_str(), 0600));
    const std::string notAFolder = "Not a directory: a link is in the place of a folder\n";
    EXPECT_EQ((Outcome{.reports = "folder/a: " + notAFolder + "folder: " + notAFolder + "file\ndangling\n" +
                                  "standing: Is a directory: a folder is in the place of a file\npipe\n" +
                                  "pipe/x: an entry before it in the archive has its place\n",
                       .files = 3,
                       .failures = 4}),
              Extract(Archive({{.path = "folder/a", .bytes = "1"},
                               {.path = "folder", .flags = kFolderEntry},
                               {.path = "file", .bytes = "2"},
                               {.path = "dangling", .bytes = "3"},
                               {.path = "standing", .bytes = "4"},
                               {.path = "pipe", .bytes = "5"},
                               {.path = "pipe/x", .bytes = "6"}}),
                      folder / "out"));
    EXPECT_EQ((Tree{{"elsewhere", "/"},
                    {"out", "/"},
                    {"out/dangling", "3"},
                    {"out/file", "2"},
                    {"out/folder", "-> ../elsewhere"},
                    {"out/pipe", "5"},
                    {"out/standing", "/"},
                    {"secret", "secret"}}),
              TreeOf(folder.Path()));
}

// Paths longer than the system takes at once, and a component that it does not take at all.
TEST(Extraction, LongPathsWorkAndLongComponentsFail) {
    std::string deep;
    for (int level = 0; level < 30; ++level)
        deep += std::string(200, 'd') + "/";
    const TemporaryFolder folder;
    const Outcome outcome =
        Extract(Archive({{.path = deep + "file", .bytes = "1"}, {.path = std::string(300, 'n'), .bytes = "2"}}),
                folder / "out");
    EXPECT_EQ((Outcome{.reports = deep + "file\n" + std::string(300, 'n') + ": File name too long\n",
                       .files = 1,
                       .failures = 1}),
              outcome);
    int descriptor = open((folder / "out").c_str(), O_PATH);
    for (int level = 0; level < 30; ++level) {
        const int next = openat(descriptor, std::string(200, 'd').c_str(), O_PATH);
        close(descriptor);
        descriptor = next;
    }
    const int file = openat(descriptor, "file", O_RDONLY);
    char byte = 0;
    EXPECT_EQ(1, read(file, &byte, 1));
    EXPECT_EQ('1', byte);
    close(file);
    close(descriptor);
}

TEST(Extraction, ArchiveInItsOwnFolderIsNotReplaced) {
    const TemporaryFolder folder;
    WriteFile(folder / "archive", Archive({{.path = "archive", .bytes = "1"}, {.path = "b", .bytes = "2"}}));
    zarvo::archive archive = *zarvo::archive::open(folder / "archive");
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    EXPECT_EQ(ZARVO_OK, zarvo_extract(archive.get(), folder.Path().c_str(), nullptr, nullptr, &summary, nullptr));
    EXPECT_EQ(1u, summary.files);
    EXPECT_EQ(1u, summary.failures);
    EXPECT_EQ("2", ReadFile(folder / "b"));
}

// A block that the budget can't hold is streamed where its kind allows it, and an error of its files where not.
TEST(Extraction, MemoryBudgetIsKept) {
    const std::string text = SampleText(3'000'000);
    for (const CompressionType type : {kCompressionLzma, kCompressionLz4}) {
        const TemporaryFolder folder;
        const std::string bytes =
            BuildArchive({.entries = {{.path = "a", .bytes = text}}, .chunkSize = 0, .type = type}).bytes;
        const Outcome outcome = Extract(bytes, folder / "out", {.memory = 4'000'000});
        const std::string refusal = "a: block 0 of 3000000 bytes is too large to be held in memory\n";
        EXPECT_EQ(type == kCompressionLzma ? "a\n" : refusal, outcome.reports);
    }
}

TEST(Extraction, FolderThatCantBeMadeEndsTheRun) {
    const TemporaryFolder folder;
    WriteFile(folder / "file", "");
    EXPECT_EQ((Outcome{.code = ZARVO_ERROR_SYSTEM, .failures = 2}),
              Extract(Archive({{.path = "a"}, {.path = "b"}}), folder / "file/out"));
}

// A file that is larger than it may be is an entry's failure, and leaves nothing behind.
TEST(Extraction, FileTooLargeForTheLimitLeavesNothing) {
    const TemporaryFolder folder;
    const std::string text = SampleText(3'000'000);
    const std::string bytes = Archive(
        {{.path = "a", .bytes = text.substr(0, 1'000)}, {.path = "b", .bytes = text}, {.path = "c", .bytes = "1"}});
    signal(SIGXFSZ, SIG_IGN);
    const rlimit limited = {2'000'000, RLIM_INFINITY};
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &limited));
    const Outcome outcome = Extract(bytes, folder / "out");
    const rlimit unlimited = {RLIM_INFINITY, RLIM_INFINITY};
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &unlimited));
    EXPECT_EQ((Outcome{.reports = "a\nb: File too large\nc\n", .files = 2, .failures = 1}), outcome);
    EXPECT_EQ((Tree{{"a", text.substr(0, 1'000)}, {"c", "1"}}), TreeOf(folder / "out"));
}

// The run waits for its first look at the progress, which stops it: nothing is half there.
TEST(Extraction, ProgressStopsTheRun) {
    struct WaitingSource final : zarvo::source {
        explicit WaitingSource(std::string served) : bytes(std::move(served)) {}

        int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
            isHeld.wait(true);
            const size_t start = std::min<uint64_t>(offset, bytes.size());
            const size_t count = std::min(buffer.size(), bytes.size() - start);
            memcpy(buffer.data(), bytes.data() + start, count);
            return static_cast<int64_t>(count);
        }
        int64_t size() override { return static_cast<int64_t>(bytes.size()); }

        std::string bytes;
        std::atomic<bool> isHeld = false;
    };
    auto source = std::make_unique<WaitingSource>(BuildArchive({.entries = ManyFiles(1)}).bytes);
    WaitingSource& held = *source;
    const zarvo::archive archive = *zarvo::archive::open(std::move(source));
    held.isHeld = true;
    zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
    run.context = &held;
    run.progress = [](void* context, const zarvo_progress*) {
        std::atomic<bool>& isHeld = static_cast<WaitingSource*>(context)->isHeld;
        isHeld = false;
        isHeld.notify_all();
        return 1;
    };
    const TemporaryFolder folder;
    EXPECT_EQ(ZARVO_ERROR_STOPPED,
              zarvo_extract(archive.get(), (folder / "out").c_str(), &run, nullptr, nullptr, nullptr));
    for (const auto& [name, text] : TreeOf(folder / "out"))
        EXPECT_EQ(std::string::npos, name.find(".zarvo-")) << name;
}

TEST(Extraction, FileKeptBrokenIsReportedAsSuch) {
    std::string damaged(3, '\xFF');
    const std::string bytes =
        BuildArchive({.entries = {{.path = "a", .bytes = "12345678"}},
                      .blocks = {{.size = 4}, {.size = 4, .type = kCompressionLz4, .stored = damaged}}})
            .bytes;
    const TemporaryFolder folder;
    EXPECT_EQ((Outcome{"a: block 1 is damaged\n", ZARVO_OK, 0, 1}), Extract(bytes, folder.Path()));
    EXPECT_EQ((Outcome{"a broken: block 1 is damaged\n", ZARVO_OK, 0, 1}),
              Extract(bytes, folder.Path(), {.keepBroken = 1}));
    EXPECT_EQ((Tree{{"a", "1234"}}), TreeOf(folder.Path()));
}

// What a callback of C++ throws ends the run, and comes out of the call, also from other threads.
TEST(Extraction, ExceptionsOfCallbacksAreThrownAgain) {
    const std::string damaged =
        BuildArchive({.entries = ManyFiles(11),
                      .blocks = {{.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')}}})
            .bytes;
    const TemporaryFolder folder;
    const auto fail = [](auto&&...) { throw std::runtime_error("from the callback"); };
    const auto failSaying = [](auto&&...) -> bool { throw std::runtime_error("from the callback"); };
    const std::pair<const char*, std::function<zarvo::run_result(zarvo::archive&)>> kRuns[] = {
        {"progress", [&](zarvo::archive& archive) { return archive.test({.progress = failSaying}); }},
        {"extract", [&](zarvo::archive& archive) { return archive.extract(folder / "out", {}, {.report = fail}); }},
        {"block", [&](zarvo::archive& archive) { return archive.test({}, {.block = fail}); }},
        {"entry", [&](zarvo::archive& archive) { return archive.test({}, {.entry = fail}); }},
        {"bytes", [&](zarvo::archive& archive) { return archive.visit({.threads = 8}, {.bytes = fail}); }},
        {"report", [&](zarvo::archive& archive) { return archive.visit({}, {.report = fail}); }},
    };
    for (const auto& [callback, run] : kRuns) {
        zarvo::archive archive = OpenBytes(damaged);
        EXPECT_THROW((void)run(archive), std::runtime_error) << callback;
        EXPECT_FALSE(archive.test().error) << "after " << callback;
    }
}

TEST(Extraction, NothingIsCalledAfterAnException) {
    const std::string bytes = Archive(ManyFiles(11));
    zarvo::archive archive = OpenBytes(bytes);
    size_t calls = 0, reports = 0;
    zarvo::visit_options what;
    what.bytes = [&](auto&&...) {
        ++calls;
        throw std::runtime_error("once");
    };
    what.report = [&](const zarvo_report&) { ++reports; };
    EXPECT_THROW((void)archive.visit({.threads = 1}, what), std::runtime_error);
    EXPECT_EQ(1u, calls);
    EXPECT_EQ(0u, reports);
}

// An entry that is under way when the run is stopped is still told.
TEST(Extraction, StoppedRunTellsWhatWasUnderWay) {
    struct State {
        std::atomic<int> looks = 0;
        std::string reports = {};
    };
    const std::string text = SampleText(1'500'000);
    const std::string bytes = Archive({{.path = "a", .bytes = text.substr(0, 10)}, {.path = "b", .bytes = text}});
    const zarvo::archive archive = OpenBytes(bytes);
    State state;
    zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
    run.threads = 2;
    run.context = &state;
    run.progress = [](void* context, const zarvo_progress*) {
        std::atomic<int>& looks = static_cast<State*>(context)->looks;
        ++looks;
        looks.notify_all();
        return 1;
    };
    zarvo_visit_options visit = ZARVO_VISIT_OPTIONS_INIT;
    visit.bytes = [](void* context, uint64_t index, uint64_t, const void*, size_t) {
        // The other thread has ended by the third look, or soon after.
        std::atomic<int>& looks = static_cast<State*>(context)->looks;
        for (int seen = 0; index == 0 && seen < 3; seen = looks)
            looks.wait(seen);
    };
    visit.report = [](void* context, const zarvo_report* report) {
        static_cast<State*>(context)->reports += std::to_string(report->index) + report->text + "\n";
    };
    EXPECT_EQ(ZARVO_ERROR_STOPPED, zarvo_visit(archive.get(), &run, &visit, nullptr, nullptr));
    EXPECT_EQ("0\n", state.reports);
}

// A file that begins inside a block that may not be held fails alone.
TEST(Extraction, FilesInsideARefusedBlockFail) {
    const TemporaryFolder folder;
    const std::string text = SampleText(3'000'000);
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = text}, {.path = "b", .bytes = "2"}},
                                            .chunkSize = 0,
                                            .type = kCompressionLz4})
                                  .bytes;
    const std::string refusal = ": block 0 of 3000001 bytes is too large to be held in memory\n";
    EXPECT_EQ("a" + refusal + "b" + refusal, Extract(bytes, folder / "out", {.memory = 4'000'000}).reports);
}

// Stored bytes count, too: a small block can claim, and have, many.
TEST(Extraction, StoredBytesBeyondTheBudgetAreRefused) {
    const TemporaryFolder folder;
    ArchiveDescription description = {.entries = {{.path = "a", .bytes = "text"}}, .type = kCompressionLz4};
    description.blocks = {{.size = 4, .stored = std::string(3'000'000, 'x')}};
    const Outcome outcome = Extract(BuildArchive(description).bytes, folder / "out", {.memory = 4'000'000});
    EXPECT_EQ("a: block 0 of 3000000 bytes is too large to be held in memory\n", outcome.reports);
}

// Blocks that claim 4 GiB each, all past the archive's end.
TEST(Extraction, MissingBlocksCostNextToNothing) {
    constexpr size_t kBlocks = 1'000;
    ArchiveDescription description = {.entries = {{.path = "a", .bytes = std::string(kBlocks, 'x')}}, .chunkSize = 1};
    for (size_t index = 0; index < kBlocks; ++index)
        description.fields["block[" + std::to_string(index) + "].uncompressedSize"] = 0xFFFF'FFFF;
    description.fields["node[0].size"] = kBlocks * UINT64_C(0xFFFF'FFFF);
    const std::string bytes = BuildArchive(description).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    zarvo_summary summary = ZARVO_SUMMARY_INIT;
    rusage before = {};
    ASSERT_EQ(0, getrusage(RUSAGE_SELF, &before));
    EXPECT_EQ(ZARVO_OK, zarvo_test(archive.get(), nullptr, nullptr, &summary, nullptr));
    rusage after = {};
    ASSERT_EQ(0, getrusage(RUSAGE_SELF, &after));
    EXPECT_EQ(kBlocks, summary.damaged_blocks);
    EXPECT_GT(1, after.ru_utime.tv_sec - before.ru_utime.tv_sec);
    const TemporaryFolder folder;
    EXPECT_EQ("a: block 0 ends after the archive's last byte\n", Extract(bytes, folder.Path()).reports);
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
    const Tree m_Whole = {{"a", "/"}, {"a/b", m_Text.substr(0, 100)}, {"c", "/"}, {"c/d", m_Text}, {"e", ""}};

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
                for (const auto& [name, there] : TreeOf(folder / "out"))
                    EXPECT_EQ(true, m_Whole.contains(name) && m_Whole.at(name) == there) << name;
                EXPECT_EQ(0u, Extract(bytes, folder / "out").failures);
                EXPECT_EQ(true, m_Whole == TreeOf(folder / "out"));
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
TEST(Extraction, TemporariesOfAKilledRunAreInNobodysWay) {
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

// Many threads, deep folders, and hardly a descriptor.
TEST(Extraction, FewDescriptorsAreEnough) {
    std::vector<ArchiveEntry> entries;
    for (size_t number = 0; number < 60; ++number) {
        std::string path;
        for (size_t level = 0; level < 12; ++level)
            path += std::to_string(number % (level + 2)) + "/";
        entries.push_back({.path = path + std::to_string(number), .bytes = std::string(200'000 + number, 'x')});
    }
    const std::string bytes = Archive(entries, kCompressionNone);
    const TemporaryFolder folder;
    Outcome outcome;
    {
        const FewDescriptors few(16);
        outcome = Extract(bytes, folder / "out", {.threads = 8});
    }
    EXPECT_EQ(0u, outcome.failures) << outcome;
    EXPECT_EQ(entries.size(), outcome.files);
}

// All threads together decode 8 MiB at a time, however many they are.
TEST(Extraction, ManyThreadsShareTheMemoryOfEight) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = SampleText(3'000'000)}}}).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    std::atomic<size_t> largest = 0;
    zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
    run.threads = 64;
    run.context = &largest;
    zarvo_visit_options visit = ZARVO_VISIT_OPTIONS_INIT;
    visit.bytes = [](void* context, uint64_t, uint64_t, const void*, size_t size) {
        std::atomic<size_t>& largestSize = *static_cast<std::atomic<size_t>*>(context);
        size_t seen = largestSize;
        while (seen < size && !largestSize.compare_exchange_weak(seen, size)) {
        }
    };
    ASSERT_EQ(ZARVO_OK, zarvo_visit(archive.get(), &run, &visit, nullptr, nullptr));
    EXPECT_EQ(131'072u, largest.load());
}
