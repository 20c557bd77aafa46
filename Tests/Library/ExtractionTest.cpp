// Where extraction puts files, and what becomes of those that are there.
#include "Tests/Library/ExtractionTest.h"
#include "Tests/Support/FolderTree.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

// How many things are below a folder, also where they can't be read.
size_t CountThings(const std::string& folder) {
    const fs::recursive_directory_iterator things(folder, fs::directory_options::skip_permission_denied);
    return static_cast<size_t>(std::distance(begin(things), end(things)));
}

} // namespace

TEST(Extraction, WritesEveryFormWithAnyNumberOfThreads) {
    const std::vector<ArchiveEntry> entries = ManyFiles(3);
    FolderTree expected;
    for (const ArchiveEntry& entry : entries)
        expected[entry.path] = Brief(entry.bytes);
    const struct {
        const char* what;
        ArchiveDescription form;
    } cases[] = {
        {.what = "stored", .form = {}},
        {.what = "LZ4", .form = {.type = kCompressionLz4}},
        {.what = "LZ4 in tiny blocks", .form = {.chunkSize = 1'000, .type = kCompressionLz4}},
        {.what = "LZMA", .form = {.type = kCompressionLzma}},
        {.what = "LZMA streams", .form = {.chunkSize = 3'000'000, .type = kCompressionLzma, .streamed = true}},
        {.what = "web", .form = {.layout = ArchiveLayout::kWeb}},
        {.what = "raw", .form = {.layout = ArchiveLayout::kRaw}},
    };
    for (const auto& row : cases) {
        ArchiveDescription description = row.form;
        description.entries = entries;
        const std::string bytes = BuildArchive(description).bytes;
        for (const uint32_t threads : {1u, 2u, 8u}) {
            SCOPED_TRACE(std::string(row.what) + ", threads " + std::to_string(threads));
            const TemporaryFolder folder;
            const Outcome outcome = Extract(bytes, folder / "out/put", {}, {.threads = threads});
            EXPECT_EQ(ZARVO_OK, outcome.code);
            EXPECT_EQ(entries.size(), outcome.files);
            EXPECT_EQ(0u, outcome.failures);
            EXPECT_EQ(expected, ReadFolderTree(folder / "out/put"));
        }
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
    const struct {
        uint64_t strip;
        Outcome outcome;
        FolderTree tree;
    } cases[] = {
        {.strip = 0,
         .outcome = {.reports = "../x: the path has a component \"..\"\n"
                                "a\\b\n"
                                "a/b/c: an entry before it in the archive has its place\n"
                                "d\n"
                                "d: an entry before it in the archive has its place\n"
                                "d/e\n"
                                ".: the path is empty\n"
                                "f/: the path of a file ends with a separator\n",
                     .files = 2,
                     .failures = 5},
         .tree = {{"a/b", "3"}, {"d/e", "6"}}},
        {.strip = 1,
         .outcome = {.reports = "../x: the path has a component \"..\"\n"
                                "a\\b\n"
                                "a/b/c: an entry before it in the archive has its place\n"
                                "d/e\n"
                                ".: the path is empty\n"
                                "f/: the path of a file ends with a separator\n",
                     .files = 2,
                     .failures = 4},
         .tree = {{"b", "3"}, {"e", "6"}}},
    };
    for (const auto& row : cases) {
        const TemporaryFolder folder;
        EXPECT_EQ(row.outcome, Extract(bytes, folder / "out", {.strip = row.strip})) << "strip " << row.strip;
        EXPECT_EQ(row.tree, ReadFolderTree(folder / "out")) << "strip " << row.strip;
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
    for (const int32_t overwrite : {ZARVO_OVERWRITE_ALWAYS, ZARVO_OVERWRITE_NEVER, ZARVO_OVERWRITE_FAIL})
        for (const bool keepBroken : {false, true})
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
                zarvo::extract_options how = {.overwrite = overwrite, .keep_broken = keepBroken, .dry_run = true};
                const Outcome dry = Extract(bytes, out, how);
                EXPECT_EQ(things, CountThings(folder.Path()));
                how.dry_run = false;
                const Outcome wet = Extract(bytes, out, how);
                fs::permissions(folder / "sealed", fs::perms::owner_all);
                EXPECT_EQ(wet, dry);
                EXPECT_LT(0u, wet.files);
                EXPECT_LT(5u, wet.failures);
            }
}

TEST(Extraction, FolderThatCantBeMadeEndsTheRun) {
    const TemporaryFolder folder;
    WriteFile(folder / "file", "");
    fs::create_symlink("nowhere", folder / "dangling");
    const std::string bytes = Archive({{.path = "a"}, {.path = "b"}});
    const Outcome failed = {.code = ZARVO_ERROR_SYSTEM, .failures = 2}, done = {.reports = "a\nb\n", .files = 2};
    const struct {
        std::string out;
        Outcome outcome;
    } cases[] = {
        {.out = folder / "file", .outcome = failed},
        {.out = folder / "file/out", .outcome = failed},
        {.out = folder / "dangling", .outcome = failed},
        {.out = folder / "dangling/out", .outcome = failed},
        {.out = folder / "dangling/out/more", .outcome = failed},
        {.out = "", .outcome = failed},
        {.out = folder / "new/out/", .outcome = done},
        {.out = folder / "new//more", .outcome = done},
    };
    for (const auto& row : cases) {
        const bool isThere = fs::exists(folder / "new");
        EXPECT_EQ(row.outcome, Extract(bytes, row.out, {.dry_run = true})) << "dry: " << row.out;
        EXPECT_EQ(isThere, fs::exists(folder / "new")) << row.out;
        EXPECT_EQ(row.outcome, Extract(bytes, row.out)) << row.out;
    }
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

TEST(Extraction, WhatIsThereIsReplacedKeptOrAFailure) {
    const std::string bytes = Archive({{.path = "a", .bytes = "new"}, {.path = "b"}, {.path = "c", .bytes = "new"}});
    const struct {
        int32_t overwrite;
        Outcome outcome;
        FolderTree tree;
    } cases[] = {
        {.overwrite = ZARVO_OVERWRITE_ALWAYS,
         .outcome = {.reports = "a\nb\nc\n", .files = 3},
         .tree = {{"a", "new"}, {"b", ""}, {"c", "new"}, {"linked", "old"}}},
        {.overwrite = ZARVO_OVERWRITE_NEVER,
         .outcome = {.reports = "a kept\nb kept\nc\n", .files = 1},
         .tree = {{"a", "old"}, {"b", "linked"}, {"c", "new"}, {"linked", "old"}}},
        {.overwrite = ZARVO_OVERWRITE_FAIL,
         .outcome = {.reports = "a: File exists\nb: File exists\nc\n", .files = 1, .failures = 2},
         .tree = {{"a", "old"}, {"b", "linked"}, {"c", "new"}, {"linked", "old"}}},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.overwrite);
        const TemporaryFolder folder;
        WriteFile(folder / "linked", "old");
        fs::create_hard_link(folder / "linked", folder / "a");
        fs::create_symlink("linked", folder / "b");
        EXPECT_EQ(row.outcome, Extract(bytes, folder.Path(), {.overwrite = row.overwrite}));
        EXPECT_EQ(row.tree, ReadFolderTree(folder.Path()));
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
    EXPECT_EQ((FolderTree{{"elsewhere", kFolder},
                          {"out/dangling", "3"},
                          {"out/file", "2"},
                          {"out/folder", "../elsewhere"},
                          {"out/pipe", "5"},
                          {"out/standing", kFolder},
                          {"secret", "secret"}}),
              ReadFolderTree(folder.Path()));
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
    const zarvo::run_result result = archive.extract(folder.Path());
    EXPECT_EQ(ZARVO_OK, result.error.code());
    EXPECT_EQ(1u, result.summary.files);
    EXPECT_EQ(1u, result.summary.failures);
    EXPECT_EQ("2", ReadFile(folder / "b"));
}
