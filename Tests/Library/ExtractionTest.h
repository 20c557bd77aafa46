// What the tests of runs over whole archives share: archives of many files, and extractions with all that they report.
//
//   EXPECT_EQ((Outcome{.reports = "a\nb: File exists\n", .files = 1, .failures = 1}),
//             Extract(Archive({{.path = "a"}, {.path = "b"}}), folder / "out", {.overwrite = ZARVO_OVERWRITE_FAIL}));
#pragma once

#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <random>

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

inline Outcome Extract(const std::string& bytes, const std::string& folder, zarvo::extract_options how = {},
                       const zarvo::run_options& run = {.threads = 2}) {
    zarvo::archive archive = OpenBytes(bytes);
    Outcome outcome;
    how.report = [&](const zarvo_report& report) {
        const char* const words[] = {"", " kept", ": ", " broken: "};
        outcome.reports += std::string(archive.entries()[report.index].path()) + words[report.outcome] + report.text;
        outcome.reports += "\n";
    };
    const zarvo::run_result result = archive.extract(folder, run, how);
    outcome.code = result.error.code();
    outcome.files = result.summary.files;
    outcome.failures = result.summary.failures;
    return outcome;
}

inline std::string Archive(std::vector<ArchiveEntry> entries, CompressionType type = kCompressionLz4) {
    return BuildArchive({.entries = std::move(entries), .type = type}).bytes;
}

// Files of all sizes, in folders, with the units' size in reach; some are empty, some hold several units.
inline std::vector<ArchiveEntry> ManyFiles(unsigned seed) {
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
