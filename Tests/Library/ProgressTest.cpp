// What callbacks of runs are told, and how they stop a run.
#include "Tests/Library/ExtractionTest.h"
#include "Tests/Library/SystemFaults.h"
#include "Tests/Support/FolderTree.h"

#include <thread>

// How far tests are is told in entries, too; the last word is that all have been looked at.
TEST(Progress, OfTestsCountsEntries) {
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
TEST(Progress, CountsTheBytesOfEachFile) {
    const std::string bytes =
        Archive({{.path = "a", .bytes = "1"}, {.path = "b", .bytes = "22"}, {.path = "c", .bytes = "333"}});
    zarvo::archive archive = OpenBytes(bytes);
    std::atomic<bool> isWaiting = false, isSeen = false;
    uint64_t seen = 0;
    zarvo::run_options run;
    run.progress = [&](const zarvo_progress& progress) {
        if (isWaiting && !isSeen) {
            seen = progress.bytes;
            isSeen = true;
            isSeen.notify_all();
        }
        return true;
    };
    zarvo::visit_options visit;
    visit.bytes = [&](uint64_t index, uint64_t, std::span<const std::byte>) {
        if (index != 2) return;
        isWaiting = true;
        isSeen.wait(false);
    };
    EXPECT_EQ(ZARVO_OK, archive.visit(run, visit).error.code());
    EXPECT_EQ(3u, seen);
}

#ifndef VARNEX_UNDER_SANITIZERS
// Without threads, the calling one works, and looks up from it.
TEST(Progress, StopsARunWithoutThreads) {
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

// The run waits for its first look at the progress, which stops it: nothing is half there.
TEST(Progress, StopsTheRun) {
    auto source = std::make_unique<CountingSource>(BuildArchive({.entries = ManyFiles(1)}).bytes);
    std::atomic<bool> isHeld = false;
    source->beforeRead = [&] { isHeld.wait(true); };
    zarvo::archive archive = *zarvo::archive::open(std::move(source));
    isHeld = true;
    zarvo::run_options run;
    run.progress = [&](const zarvo_progress&) {
        isHeld = false;
        isHeld.notify_all();
        return false;
    };
    const TemporaryFolder folder;
    EXPECT_EQ(ZARVO_ERROR_STOPPED, archive.extract(folder / "out", run).error.code());
    for (const auto& [name, text] : ReadFolderTree(folder / "out"))
        EXPECT_EQ(std::string::npos, name.find(".zarvo-")) << name;
}

// What a callback of C++ throws ends the run, and comes out of the call, also from other threads.
TEST(Callbacks, ExceptionsOfCallbacksAreThrownAgain) {
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

TEST(Callbacks, NothingIsCalledAfterAnException) {
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
TEST(Progress, OfAStoppedRunTellsWhatWasUnderWay) {
    const std::string text = SampleText(1'500'000);
    const std::string bytes = Archive({{.path = "a", .bytes = text.substr(0, 10)}, {.path = "b", .bytes = text}});
    zarvo::archive archive = OpenBytes(bytes);
    std::atomic<int> looks = 0;
    zarvo::run_options run = {.threads = 2};
    run.progress = [&](const zarvo_progress&) {
        ++looks;
        looks.notify_all();
        return false;
    };
    std::string reports;
    zarvo::visit_options visit;
    visit.bytes = [&](uint64_t index, uint64_t, std::span<const std::byte>) {
        // The other thread has ended by the third look, or soon after.
        for (int seen = 0; index == 0 && seen < 3; seen = looks)
            looks.wait(seen);
    };
    visit.report = [&](const zarvo_report& report) { reports += std::to_string(report.index) + report.text + "\n"; };
    EXPECT_EQ(ZARVO_ERROR_STOPPED, archive.visit(run, visit).error.code());
    EXPECT_EQ("0\n", reports);
}
