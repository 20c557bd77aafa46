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

// The threads of a run call its archive's source, so their exceptions have to find the run.
TEST(Callbacks, ExceptionsOfSourcesComeOutOfRuns) {
    const std::string bytes = Archive(ManyFiles(11));
    const TemporaryFolder folder;
    const std::pair<const char*, std::function<zarvo::run_result(zarvo::archive&, const zarvo::run_options&)>> kRuns[] =
        {
            {"extract", [&](auto& archive, auto& run) { return archive.extract(folder / "out", run); }},
            {"test", [](auto& archive, auto& run) { return archive.test(run); }},
            {"visit", [](auto& archive, auto& run) { return archive.visit(run, {.bytes = [](auto&&...) {}}); }},
        };
    for (const auto& [name, run] : kRuns)
        for (const uint32_t threads : {1u, 2u}) {
            auto owned = std::make_unique<CountingSource>(bytes);
            CountingSource* const source = owned.get();
            zarvo::archive archive = *zarvo::archive::open(std::move(owned));
            source->beforeRead = [] { throw std::runtime_error("from the source"); };
            EXPECT_THROW((void)run(archive, {.threads = threads}), std::runtime_error) << name << ", " << threads;
            source->beforeRead = nullptr;
            EXPECT_EQ(ZARVO_OK, run(archive, {.threads = threads}).error.code()) << "after " << name << ", " << threads;
        }
}

// Entries that failed because the source threw are not reported as failures of their own.
TEST(Callbacks, NothingIsReportedAfterASourceThrows) {
    auto owned = std::make_unique<CountingSource>(Archive({{.path = "a", .bytes = "1"}}));
    CountingSource* const source = owned.get();
    zarvo::archive archive = *zarvo::archive::open(std::move(owned));
    source->beforeRead = [] { throw std::runtime_error("from the source"); };
    size_t reports = 0;
    zarvo::visit_options what;
    what.bytes = [](auto&&...) {};
    what.report = [&](const zarvo_report&) { ++reports; };
    EXPECT_THROW((void)archive.visit({.threads = 1}, what), std::runtime_error);
    EXPECT_EQ(0u, reports);
}

// A read in a callback of the run throws what its source threw, and the run goes on.
TEST(Callbacks, ExceptionOfAReadLeavesTheRunAlone) {
    auto owned = std::make_unique<CountingSource>(Archive({{.path = "a", .bytes = "1"}}));
    CountingSource* const source = owned.get();
    zarvo::archive archive = *zarvo::archive::open(std::move(owned), {.cache_bytes = 1});
    source->beforeRead = [caller = std::this_thread::get_id()] {
        if (std::this_thread::get_id() == caller) throw std::runtime_error("from the source");
    };
    size_t reports = 0;
    zarvo::visit_options what;
    what.bytes = [](auto&&...) {};
    what.report = [&](const zarvo_report& report) {
        EXPECT_THROW((void)Read(archive, report.index, 0, 1), std::runtime_error);
        ++reports;
    };
    EXPECT_EQ(ZARVO_OK, archive.visit({.threads = 1}, what).error.code());
    EXPECT_EQ(1u, reports);
}

TEST(Callbacks, ExceptionOfALogComesOutOfTheRun) {
    const std::string bytes =
        BuildArchive({.entries = {{.path = "a", .bytes = "1234"}},
                      .blocks = {{.size = 4, .type = static_cast<CompressionType>(7), .stored = "????"}}})
            .bytes;
    zarvo::open_options options;
    options.log = [](std::string_view) { throw std::runtime_error("from the log"); };
    zarvo::archive archive = OpenBytes(bytes, std::move(options));
    EXPECT_THROW((void)archive.test(), std::runtime_error);
}

// If it went on to the end, the run would read hundreds of times.
TEST(Callbacks, ExceptionOfASourceStopsTheRun) {
    const std::string text = SampleText(3'000'000);
    auto owned = std::make_unique<CountingSource>(
        BuildArchive({.entries = {{.path = "a", .bytes = text}}, .chunkSize = 30'000, .type = kCompressionLz4}).bytes);
    CountingSource* const source = owned.get();
    zarvo::archive archive = *zarvo::archive::open(std::move(owned));
    int calls = 0;
    source->beforeRead = [&] {
        ++calls;
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        throw std::runtime_error("from the source");
    };
    EXPECT_THROW((void)archive.test({.threads = 1}), std::runtime_error);
    EXPECT_GT(30, calls);
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
