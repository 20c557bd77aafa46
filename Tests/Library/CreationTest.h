// What the tests of making archives share: runs that say how they went, the forms of archives, and a folder to pack.
#pragma once

#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

#include <functional>
#include <random>
#include <set>

namespace fs = std::filesystem;

// How the making of an archive went: a line for each entry that was left out or failed, and what it comes to.
struct Made {
    std::string reports = {};
    zarvo_code code = ZARVO_OK;
    uint64_t files = 0;
    std::string text = {}; // of the error

    friend bool operator==(const Made&, const Made&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Made& made) {
        return out << "code " << made.code << " (" << made.text << "), " << made.files << " files\n" << made.reports;
    }
};

using Write = std::function<zarvo::run_result(const zarvo::run_options&, const zarvo::create_options&)>;

inline Made Report(const Write& write, zarvo::create_options how, const zarvo::run_options& options) {
    Made made;
    how.report = [&](const zarvo_create_report& report) {
        if (report.outcome == ZARVO_OUTCOME_DONE) return;
        made.reports += std::string(report.path) + (report.outcome == ZARVO_OUTCOME_FAILED ? " failed: " : ": ") +
                        report.text + "\n";
    };
    const zarvo::run_result result = write(options, how);
    made.code = result.error.code();
    made.text = result.error.text();
    made.files = result.summary.files;
    return made;
}

inline Made Create(const std::string& path, const std::string& folder, const zarvo::create_options& how = {},
                   const zarvo::run_options& options = {}) {
    return Report([&](const zarvo::run_options& run,
                      const zarvo::create_options& form) { return zarvo::create(path, folder, run, form); },
                  how, options);
}

// The entries that a dry run would put into an archive, a line each.
inline std::string List(const std::string& folder, zarvo::create_options how = {},
                        const zarvo::run_options& options = {}) {
    std::string paths;
    how.dry_run = true;
    how.report = [&](const zarvo_create_report& report) {
        if (report.outcome == ZARVO_OUTCOME_DONE) paths += std::string(report.path) + "\n";
    };
    EXPECT_EQ(ZARVO_OK, zarvo::create("unused", folder, options, how).error.code());
    return paths;
}

struct Form {
    const char* name;
    zarvo::create_options how;
    bool hasFolders = true;
};

inline std::vector<Form> AllForms() {
    std::vector<Form> forms = {
        {"default", {}},
        {"none", {.compression = ZARVO_KIND_NONE}},
        {"lz4", {.compression = ZARVO_KIND_LZ4}},
        {"lz4hc 1", {.level = 1}},
        {"lz4hc 12", {.level = 12}},
        {"lzma", {.compression = ZARVO_KIND_LZMA}},
        {"lzma 0", {.compression = ZARVO_KIND_LZMA, .level = 0, .block_size = 4'096}},
        {"lzma 9", {.compression = ZARVO_KIND_LZMA, .level = 9, .block_size = 200'000}},
        {"streamed", {.is_streamed = true}},
        {"streamed none", {.compression = ZARVO_KIND_NONE, .is_streamed = true}},
        {"web", {.layout = ZARVO_LAYOUT_WEB}, false},
        {"web 0", {.layout = ZARVO_LAYOUT_WEB, .level = 0}, false},
        {"raw", {.layout = ZARVO_LAYOUT_RAW}, false},
        {"archive", {.layout = ZARVO_LAYOUT_ARCHIVE}},
        {"archive streamed", {.layout = ZARVO_LAYOUT_ARCHIVE, .is_streamed = true, .block_size = 5'000}},
    };
    return forms;
}

inline std::string NoiseText(size_t size) {
    std::mt19937 random(7);
    std::string text(size, '\0');
    for (char& byte : text)
        byte = static_cast<char>(random());
    return text;
}

class Creation : public testing::Test {
protected:
    void Put(const std::string& path, const std::string& text) {
        fs::create_directories(fs::path(m_Folder / ("in/" + path)).parent_path());
        WriteFile(m_Folder / "in/" + path, text);
    }

    // Files of many sizes and names.
    void PutManyFiles() {
        Put("empty", "");
        Put("text", SampleText(100'000));
        Put("noise", NoiseText(150'000)); // does not shrink
        Put("a/b/c.assets", "c");
        Put("a-b", "sorts before a/b");
        Put("a/b.txt", SampleText(65'536));
        for (int byte = 1; byte < 256; ++byte)
            if (byte != '/' && byte != '\\') Put("names/" + std::string(1, 'n') + static_cast<char>(byte), "n");
    }

    std::string In() const { return m_Folder / "in"; }
    std::string Archive() const { return m_Folder / "a.zarvo"; }

    // The names beside the input.
    std::set<std::string> Names() const {
        std::set<std::string> names;
        for (const auto& entry : fs::directory_iterator(m_Folder.Path()))
            names.insert(entry.path().filename());
        names.erase("in");
        return names;
    }

    // How two folders differ.
    static std::string Compare(const std::string& a, const std::string& b) {
        return RunProgram("/usr/bin/diff", {"-r", a, b}).second;
    }

    const TemporaryFolder m_Folder;
};
