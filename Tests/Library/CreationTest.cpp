#include "Tests/Library/LibraryTest.h"
#include "Tests/Library/SystemFaults.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

#include <fcntl.h>
#include <functional>
#include <random>
#include <set>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

namespace {

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

Made Report(const Write& write, zarvo::create_options how, const zarvo::run_options& options) {
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

Made Create(const std::string& path, const std::string& folder, const zarvo::create_options& how = {},
            const zarvo::run_options& options = {}) {
    return Report([&](const zarvo::run_options& run,
                      const zarvo::create_options& form) { return zarvo::create(path, folder, run, form); },
                  how, options);
}

// The entries that a dry run would put into an archive, a line each.
std::string List(const std::string& folder, zarvo::create_options how = {}, const zarvo::run_options& options = {}) {
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

std::vector<Form> AllForms() {
    std::vector<Form> forms = {
        {"default", {}},
        {"none", {.compression = ZARVO_KIND_NONE}},
        {"lz4", {.compression = ZARVO_KIND_LZ4}},
        {"lz4hc 1", {.level = 1}},
        {"lz4hc 12", {.level = 12}},
        {"lzma", {.compression = ZARVO_KIND_LZMA}},
        {"lzma 0", {.compression = ZARVO_KIND_LZMA, .level = 0, .block_size = 4'096}},
        {"lzma 9", {.compression = ZARVO_KIND_LZMA, .level = 9, .block_size = 1'000'000}},
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

std::string NoiseText(size_t size) {
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
        Put("text", SampleText(300'000));
        Put("noise", NoiseText(340'000)); // does not shrink
        Put("a/b/c.assets", "c");
        Put("a-b", "sorts before a/b");
        Put("a/b.txt", SampleText(131'072));
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

TEST_F(Creation, ComesBackFromEveryReader) {
    PutManyFiles();
    for (const Form& form : AllForms()) {
        SCOPED_TRACE(form.name);
        ASSERT_EQ((Made{.files = 259}), Create(Archive(), In(), form.how));
        zarvo::archive archive = *zarvo::archive::open(Archive());
        EXPECT_FALSE(archive.extract(m_Folder / "out").error);
        EXPECT_EQ("", Compare(In(), m_Folder / "out"));
        EXPECT_EQ(0, RunProgram(VARNEX_BINARY, {"a.zarvo"}, m_Folder.Path()).first);
        EXPECT_EQ("", Compare(In(), m_Folder / "a.zarvo_data"));
        for (const char* const name : {"a.zarvo", "out", "a.zarvo_data"})
            fs::remove_all(m_Folder / name);
    }
}

TEST_F(Creation, GivesTheSameBytesForAnyThreadsAndOrder) {
    PutManyFiles();
    // The same files, in another order on the disk.
    fs::create_directory(m_Folder / "other");
    for (const std::string name : {"text", "names", "noise", "empty", "a-b", "a"})
        fs::copy(In() + "/" + name, m_Folder / ("other/" + name), fs::copy_options::recursive);
    for (const Form& form : AllForms()) {
        SCOPED_TRACE(form.name);
        zarvo::create_options how = form.how;
        how.force = true;
        EXPECT_EQ(ZARVO_OK, Create(Archive(), In(), how, {.threads = 1}).code);
        const std::string bytes = ReadFile(Archive());
        for (const uint32_t threads : {2u, 7u}) {
            EXPECT_EQ(ZARVO_OK, Create(Archive(), m_Folder / "other", how, {.threads = threads}).code);
            EXPECT_EQ(true, bytes == ReadFile(Archive())) << threads << " threads";
        }
    }
}

TEST_F(Creation, IsAsItsOptionsSay) {
    PutManyFiles();
    const zarvo::create_options how = {.compression = ZARVO_KIND_LZMA,
                                       .is_streamed = true,
                                       .block_size = 100'000,
                                       .engine_version = "z 1",
                                       .engine_revision = ""};
    ASSERT_EQ(ZARVO_OK, Create(Archive(), In(), how).code);
    const zarvo::archive archive = *zarvo::archive::open(Archive());
    const zarvo_info info = archive.info();
    EXPECT_EQ(std::string("z 1"), info.engine_version);
    EXPECT_EQ(std::string(""), info.engine_revision);
    EXPECT_EQ(100'000u, info.largest_block);
    EXPECT_EQ(info.file_size, info.recorded_size);
    EXPECT_EQ(6u, info.blocks_lzma);
    EXPECT_EQ(2u, info.blocks_none); // of the noise
    EXPECT_EQ(info.block_count, info.blocks_lzma + info.blocks_none);
}

TEST_F(Creation, SortsEntriesByTheBytesOfTheirPaths) {
    for (const char* const path : {"b", "a/z", "a.b", "a/\xFF", "B", "a-/x"})
        Put(path, "");
    EXPECT_EQ("B\na\na-\na-/x\na.b\na/z\na/\xFF\nb\n", List(In()));
}

TEST_F(Creation, LeavesOutWhatPatternsMatch) {
    for (const char* const path : {"b", "a/z", "c/d/e", "c/d.txt"})
        Put(path, "");
    zarvo::patterns excluded;
    for (const char* const pattern : {"c/d", "**/z", "nothing"})
        EXPECT_FALSE(excluded.add(pattern));
    EXPECT_EQ("a\nb\nc\nc/d.txt\n", List(In(), {}, {.excluded = &excluded}));
}

TEST_F(Creation, LeavesOutAllButFilesAndFolders) {
    Put("a", "x");
    fs::create_symlink("a", In() + "/link");
    fs::create_directory_symlink(".", In() + "/ring");
    ASSERT_EQ(0, mkfifo((In() + "/pipe").c_str(), 0600));
    sockaddr_un address = {.sun_family = AF_UNIX, .sun_path = ""};
    const int socketFile = socket(AF_UNIX, SOCK_STREAM, 0);
    snprintf(address.sun_path, sizeof(address.sun_path), "%s/socket", In().c_str());
    ASSERT_EQ(0, bind(socketFile, reinterpret_cast<sockaddr*>(&address), sizeof(address)));
    close(socketFile);
    EXPECT_EQ((Made{.reports = "link: left out: a link\npipe: left out: a pipe\nring: left out: a link\n"
                               "socket: left out: a socket\n",
                    .files = 1}),
              Create(Archive(), In()));
    EXPECT_EQ(1u, zarvo::archive::open(Archive())->entries().size());
}

TEST_F(Creation, LeavesOutFoldersWhereTheLayoutHasNone) {
    Put("a/b/c", "x");
    fs::create_directories(In() + "/a/empty");
    fs::create_directories(In() + "/none/at/all");
    for (const int32_t layout : {ZARVO_LAYOUT_WEB, ZARVO_LAYOUT_RAW})
        EXPECT_EQ((Made{.reports = "a/empty: left out: the layout has no folders\n"
                                   "none: left out: the layout has no folders\n"
                                   "none/at: left out: the layout has no folders\n"
                                   "none/at/all: left out: the layout has no folders\n",
                        .files = 1}),
                  Create(Archive(), In(), {.layout = layout, .force = true}));
}

TEST_F(Creation, MakesArchivesOfNothing) {
    fs::create_directory(In());
    for (const Form& form : AllForms()) {
        SCOPED_TRACE(form.name);
        EXPECT_EQ(Made{}, Create(Archive(), In(), form.how));
        EXPECT_EQ(0u, zarvo::archive::open(Archive())->entries().size());
        EXPECT_EQ(0, RunProgram(VARNEX_BINARY, {"a.zarvo"}, m_Folder.Path()).first);
        fs::remove(Archive());
    }
}

// A folder inside the other 200 times, with paths that no system call takes.
TEST_F(Creation, TakesPathsOfAnyLength) {
    const std::string name(200, 'n');
    fs::create_directory(In());
    int folder = open(In().c_str(), O_PATH | O_DIRECTORY);
    for (int depth = 0; depth < 200; ++depth) {
        ASSERT_EQ(0, mkdirat(folder, name.c_str(), 0700));
        const int inner = openat(folder, name.c_str(), O_PATH | O_DIRECTORY);
        close(std::exchange(folder, inner));
    }
    const int file = openat(folder, "file", O_WRONLY | O_CREAT, 0600);
    EXPECT_EQ(4, write(file, "text", 4));
    close(file);
    close(folder);
    for (const char* const form : {"fs", "raw"}) {
        const int32_t layout = form == std::string("raw") ? ZARVO_LAYOUT_RAW : ZARVO_LAYOUT_FS;
        ASSERT_EQ((Made{.files = 1}), Create(Archive(), In(), {.layout = layout, .force = true}));
        zarvo::archive archive = *zarvo::archive::open(Archive());
        EXPECT_EQ(200u * 201 + 4, archive.entries()[archive.entries().size() - 1].path().size());
        EXPECT_FALSE(archive.extract(m_Folder / form).error);
        EXPECT_EQ((Made{.files = 1}), Create(m_Folder / "again", m_Folder / form, {.layout = layout, .force = true}));
        EXPECT_EQ(true, ReadFile(Archive()) == ReadFile(m_Folder / "again"));
    }
    for (const char* const made : {"in", "fs", "raw"})
        EXPECT_EQ(0, RunProgram("/bin/rm", {"-r", made}, m_Folder.Path()).first);
}

TEST_F(Creation, NeverPacksItself) {
    Put("a", "x");
    const std::string inside = In() + "/self.zarvo";
    EXPECT_EQ((Made{.files = 1}), Create(inside, In()));
    EXPECT_EQ((Made{.files = 1}), Create(In() + "/../in/self.zarvo", In(), {.force = true}));
    WriteFile(In() + "/.self.zarvo.zarvo-part", "left by a killed run");
    EXPECT_EQ((Made{.files = 1}), Create(inside, In(), {.force = true}));
    EXPECT_EQ((Made{.files = 2}), Create(Archive(), In())); // for another one it is a file like others
}

TEST_F(Creation, KeepsWhatIsThereUnlessForced) {
    Put("a", "x");
    fs::create_directory(m_Folder / "folder");
    WriteFile(m_Folder / "file", "old");
    fs::create_symlink("file", m_Folder / "link");
    for (const char* const name : {"file", "link", "folder"}) {
        EXPECT_EQ(name == std::string("folder") ? "Is a directory" : "File exists", Create(m_Folder / name, In()).text);
        EXPECT_EQ("old", ReadFile(m_Folder / "file"));
    }
    EXPECT_EQ("Is a directory", Create(m_Folder / "folder", In(), {.force = true}).text);
    EXPECT_EQ(ZARVO_OK, Create(m_Folder / "link", In(), {.force = true}).code);
    EXPECT_EQ("old", ReadFile(m_Folder / "file"));
    EXPECT_EQ(ZARVO_OK, Create(m_Folder / "file", In(), {.force = true}).code);
    EXPECT_EQ(ReadFile(m_Folder / "link"), ReadFile(m_Folder / "file"));
    EXPECT_EQ((std::set<std::string>{"file", "folder", "link"}), Names());
}

// Every system call of a run fails once: then there is an archive that is whole, or none, and no part of one.
TEST_F(Creation, IsWholeOrMissingWhateverFails) {
    Put("a/b", SampleText(150'000));
    Put("c", NoiseText(100'000));
    Put("d/e/f", "f");
    Put("empty", "");
    for (const char* const call : {"openat", "pread", "pwrite", "fsync", "renameat2", "flock", "fstatat"})
        for (const int32_t layout : {ZARVO_LAYOUT_FS, ZARVO_LAYOUT_WEB}) {
            bool hasStruck = true;
            for (int number = 1; hasStruck; number += 1 + number / 8) {
                SCOPED_TRACE(std::string(call) + " " + std::to_string(number));
                ASSERT_LT(number, 10'000);
                Made made;
                {
                    const SystemFault fault({.call = call, .number = number, .error = EIO});
                    made = Create(Archive(), In(), {.layout = layout}, {.threads = 2});
                    hasStruck = fault.HasStruck();
                }
                EXPECT_EQ(made.code == ZARVO_OK ? "" : "Input/output error", made.text.substr(0, made.text.find(':')));
                EXPECT_EQ(true, hasStruck || made.code == ZARVO_OK);
                const bool hasName = made.code == ZARVO_OK || made.text.ends_with("may not be on the disk");
                EXPECT_EQ(hasName ? std::set<std::string>{"a.zarvo"} : std::set<std::string>{}, Names());
                fs::remove(Archive());
            }
        }
}

TEST_F(Creation, WorksWhereTheSystemLacksMuch) {
    Put("a", SampleText(300'000));
    for (const FaultDescription fault : {FaultDescription{.call = "flock", .error = ENOLCK},
                                         {.call = "RENAME_NOREPLACE", .error = EINVAL},
                                         {.call = "fsync of a folder", .error = EINVAL},
                                         {.call = "pthread_create"}}) {
        const SystemFault lack(fault);
        EXPECT_EQ((Made{.files = 1}), Create(Archive(), In())) << fault.call;
        EXPECT_EQ("File exists", Create(Archive(), In()).text) << fault.call;
        fs::remove(Archive());
    }
}

TEST_F(Creation, ReplacesThePartThatAKilledRunLeft) {
    Put("a", "x");
    WriteFile(m_Folder / ".a.zarvo.zarvo-part", std::string(100'000, 'p'));
    std::string remarks;
    EXPECT_EQ((Made{.files = 1}), Create(Archive(), In(), {.log = [&](std::string_view text) { remarks += text; }}));
    EXPECT_EQ("a part that an earlier run has left is replaced", remarks);
    EXPECT_EQ(std::set<std::string>{"a.zarvo"}, Names());
    EXPECT_EQ(1u, zarvo::archive::open(Archive())->entries().size());
}

TEST_F(Creation, LeavesThePartOfARunningRunAlone) {
    Put("a", "x");
    const std::string part = m_Folder / ".a.zarvo.zarvo-part";
    const int running = open(part.c_str(), O_RDWR | O_CREAT, 0600);
    ASSERT_EQ(0, flock(running, LOCK_EX));
    EXPECT_EQ("Device or resource busy: another run is making this archive", Create(Archive(), In()).text);
    EXPECT_TRUE(fs::exists(part));
    close(running);
}

TEST_F(Creation, ReplacesNothingThatIsNoPart) {
    Put("a", "x");
    const std::string part = m_Folder / ".a.zarvo.zarvo-part";
    WriteFile(m_Folder / "precious", "bytes");
    fs::create_symlink("precious", part);
    EXPECT_EQ(ZARVO_ERROR_SYSTEM, Create(Archive(), In()).code);
    EXPECT_EQ("bytes", ReadFile(m_Folder / "precious"));
    fs::remove(part);
    ASSERT_EQ(0, mkfifo(part.c_str(), 0600));
    EXPECT_EQ("File exists: something is in the unfinished file's place", Create(Archive(), In()).text);
}

// What happens to a file after it was listed; the remark on a part comes just then.
TEST_F(Creation, NamesAFileThatChangesMeanwhile) {
    const struct {
        const char* name;
        std::function<void(const std::string& path)> change;
        const char* text;
    } kCases[] = {
        {"grows", [](const std::string& path) { fs::resize_file(path, 200'001); },
         "the file has changed: it had 200000 bytes"},
        {"shrinks", [](const std::string& path) { fs::resize_file(path, 199'999); },
         "the file has changed: it had 200000 bytes"},
        {"vanishes", [](const std::string& path) { fs::remove(path); }, "No such file or directory"},
        {"becomes a link",
         [](const std::string& path) {
             fs::rename(path, path + "2");
             fs::create_symlink(path + "2", path);
         },
         "Too many levels of symbolic links: a link is in the place of a file"},
        {"becomes a pipe",
         [](const std::string& path) {
             fs::remove(path);
             EXPECT_EQ(0, mkfifo(path.c_str(), 0600));
         },
         "the file has changed: it had 200000 bytes"},
    };
    for (const auto& row : kCases) {
        SCOPED_TRACE(row.name);
        fs::remove_all(In());
        Put("d/file", SampleText(200'000));
        WriteFile(m_Folder / ".a.zarvo.zarvo-part", "");
        const Made made =
            Create(Archive(), In(), {.log = [&](std::string_view) { row.change(In() + "/d/file"); }}, {.threads = 2});
        EXPECT_EQ(std::string("d/file failed: ") + row.text + "\n", made.reports);
        EXPECT_EQ(row.text, made.text);
        EXPECT_EQ(std::set<std::string>{}, Names());
    }
}

TEST_F(Creation, NamesAnEmptyFileThatChangesMeanwhile) {
    const struct {
        const char* name;
        std::function<void(const std::string& path)> change;
        const char* text;
    } kCases[] = {
        {"grows", [](const std::string& path) { WriteFile(path, "x"); }, "the file has changed: it had 0 bytes"},
        {"vanishes", [](const std::string& path) { fs::remove(path); }, "No such file or directory"},
    };
    for (const auto& row : kCases)
        for (const char* const other : {"", "bytes"}) {
            SCOPED_TRACE(std::string(row.name) + " beside a file of " + std::to_string(strlen(other)) + " bytes");
            Put("d/empty", "");
            Put("other", other);
            WriteFile(m_Folder / ".a.zarvo.zarvo-part", "");
            const Made made =
                Create(Archive(), In(), {.log = [&](std::string_view) { row.change(In() + "/d/empty"); }});
            EXPECT_EQ(std::string("d/empty failed: ") + row.text + "\n", made.reports);
            EXPECT_EQ(row.text, made.text);
            EXPECT_EQ(std::set<std::string>{}, Names());
        }
}

// As files of /sys do. What is missing must not come from elsewhere in memory.
TEST_F(Creation, NamesAFileThatEndsBeforeItsSize) {
    Put("a", SampleText(200'000));
    const SystemFault fault({.call = "end of a file", .number = 2});
    EXPECT_EQ((Made{.reports = "a failed: the file ends after 131072 bytes\n",
                    .code = ZARVO_ERROR_CHANGED,
                    .text = "the file ends after 131072 bytes"}),
              Create(Archive(), In(), {}, {.threads = 1}));
    EXPECT_EQ(std::set<std::string>{}, Names());
}

TEST_F(Creation, RefusesWhatTheLayoutCannotHold) {
    Put("a", "x");
    const auto makeHole = [&](const std::string& path, uint64_t size) {
        Put(path, "");
        fs::resize_file(In() + "/" + path, size);
    };
    makeHole("big", 4'294'967'295);
    for (const int32_t layout : {ZARVO_LAYOUT_WEB, ZARVO_LAYOUT_RAW}) {
        const Made made = Create(Archive(), In(), {.layout = layout});
        const std::string start = "big failed: the file has 4294967295 bytes, and the layout has room for ";
        EXPECT_EQ(ZARVO_ERROR_LIMIT, made.code);
        EXPECT_EQ(start, made.reports.substr(0, start.size()));
    }
    fs::remove(In() + "/big");
    Put("b\\c", "x");
    EXPECT_EQ("b\\c failed: the name holds \"\\\", which separates folders in archives\n",
              Create(Archive(), In()).reports);
    EXPECT_EQ(std::set<std::string>{}, Names());
}

TEST_F(Creation, NamesAFolderThatCannotBeRead) {
    EXPECT_EQ(" failed: No such file or directory\n", Create(Archive(), m_Folder / "none").reports);
    WriteFile(m_Folder / "file", "");
    EXPECT_EQ(" failed: Not a directory\n", Create(Archive(), m_Folder / "file").reports);
    EXPECT_EQ("No such file or directory", Create(m_Folder / "none/a.zarvo", m_Folder.Path()).text);
}

TEST_F(Creation, RefusesOptionsThatMakeNoSense) {
    Put("a", "x");
    const zarvo::create_options kCases[] = {
        {.layout = 4},
        {.layout = -1},
        {.compression = 4},
        {.compression = -2},
        {.level = 0},
        {.level = 13},
        {.compression = ZARVO_KIND_LZMA, .level = 10},
        {.compression = ZARVO_KIND_LZ4, .level = 1},
        {.compression = ZARVO_KIND_NONE, .level = 1},
        {.compression = ZARVO_KIND_LZ4, .is_streamed = true},
        {.block_size = 4'095},
        {.block_size = (uint64_t{1} << 30) + 1},
        {.layout = ZARVO_LAYOUT_WEB, .compression = ZARVO_KIND_LZMA},
        {.layout = ZARVO_LAYOUT_WEB, .block_size = 131'072},
        {.layout = ZARVO_LAYOUT_RAW, .level = 5},
        {.layout = ZARVO_LAYOUT_RAW, .is_streamed = true},
    };
    for (size_t index = 0; index < std::size(kCases); ++index)
        EXPECT_EQ(ZARVO_ERROR_ARGUMENT, Create(Archive(), In(), kCases[index]).code) << index;
    zarvo::patterns wanted;
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, Create(Archive(), In(), {}, {.wanted = &wanted}).code);
}

TEST_F(Creation, KeepsWithinItsMemory) {
    Put("a", SampleText(3'000'000));
    const zarvo::create_options how = {.block_size = 1'000'000, .force = true};
    ASSERT_EQ(ZARVO_OK, Create(Archive(), In(), how).code);
    const std::string bytes = ReadFile(Archive());
    EXPECT_EQ(ZARVO_OK, Create(Archive(), In(), how, {.threads = 8, .memory = 2'500'000}).code);
    EXPECT_EQ(true, bytes == ReadFile(Archive()));
    EXPECT_EQ("to compress takes 2262200 bytes of memory, and the limit is 1000000",
              Create(Archive(), In(), how, {.memory = 1'000'000}).text);
    EXPECT_EQ(ZARVO_ERROR_LIMIT,
              Create(Archive(), In(), {.layout = ZARVO_LAYOUT_WEB, .force = true}, {.memory = 1'000'000}).code);
}

TEST_F(Creation, IsStoppedByItsProgress) {
    Put("a", NoiseText(16'000'000));
    for (const Form& form :
         {Form{"blocks", {.level = 12, .block_size = 1 << 16}}, Form{"web", {.layout = ZARVO_LAYOUT_WEB}}})
        for (const int callsBefore : {0, 1, 2}) {
            int calls = 0;
            const Made made = Create(Archive(), In(), form.how,
                                     {.progress = [&](const zarvo_progress&) { return calls++ < callsBefore; }});
            EXPECT_EQ(ZARVO_ERROR_STOPPED, made.code) << form.name;
            EXPECT_EQ(std::set<std::string>{}, Names()) << form.name;
        }
}

// A large tree takes a while, and so may the only folder of a slow disk.
TEST_F(Creation, IsStoppedWhileItListsFolders) {
    Put("a", "x");
    const Made made =
        Create(Archive(), In(), {.dry_run = true}, {.progress = [](const zarvo_progress&) { return false; }});
    EXPECT_EQ((Made{.code = ZARVO_ERROR_STOPPED, .text = "stopped"}), made);
}

TEST_F(Creation, TellsAllProgressInTheEnd) {
    PutManyFiles();
    zarvo_progress last = {};
    ASSERT_EQ(ZARVO_OK, Create(Archive(), In(), {},
                               {.progress =
                                    [&](const zarvo_progress& progress) {
                                        last = progress;
                                        return true;
                                    }})
                            .code);
    EXPECT_EQ(zarvo::archive::open(Archive())->info().data_size, last.bytes);
    EXPECT_EQ(last.bytes_total, last.bytes);
    EXPECT_EQ(last.files_total, last.files);
}

// ---- entries from memory and callbacks ----

class Writer : public Creation {
protected:
    Made WriteAll(zarvo::writer& writer, zarvo::create_options how = {}) {
        how.force = true;
        return Report([&](const zarvo::run_options& run,
                          const zarvo::create_options& form) { return writer.write(Archive(), run, form); },
                      how, {.threads = 3});
    }
};

TEST_F(Writer, MakesWhatAFolderOfTheSameFilesMakes) {
    const std::string text = SampleText(400'000), noise = NoiseText(200'000);
    Put("b/text", text);
    Put("b-", noise);
    fs::create_directory(In() + "/empty");
    for (const Form& form : AllForms()) {
        SCOPED_TRACE(form.name);
        ASSERT_EQ(form.hasFolders ? 0 : 1, Create(m_Folder / "folder", In(), form.how).reports.size() != 0);
        zarvo::writer writer;
        EXPECT_FALSE(writer.add_folder("empty"));
        EXPECT_FALSE(writer.add("b/text", std::make_unique<CountingSource>(text)));
        EXPECT_FALSE(writer.add_folder("b"));
        EXPECT_FALSE(writer.add("b-", BytesOf(noise)));
        EXPECT_EQ(2u, WriteAll(writer, form.how).files);
        EXPECT_EQ(true, ReadFile(m_Folder / "folder") == ReadFile(Archive()));
        EXPECT_EQ(2u, WriteAll(writer, form.how).files); // once more
        EXPECT_EQ(true, ReadFile(m_Folder / "folder") == ReadFile(Archive()));
        fs::remove(m_Folder / "folder");
    }
}

TEST_F(Writer, RefusesPathsThatWouldNotComeBack) {
    zarvo::writer writer;
    using namespace std::string_view_literals;
    for (const std::string_view path :
         {""sv, "/"sv, "/a"sv, "a/"sv, "a//b"sv, "./a"sv, "a/."sv, ".."sv, "a/../b"sv, "a\\b"sv, "a\0b"sv}) {
        EXPECT_EQ(ZARVO_ERROR_REFUSED, writer.add(path, BytesOf("")).code()) << path;
        EXPECT_EQ(ZARVO_ERROR_REFUSED, writer.add_folder(path).code()) << path;
    }
    EXPECT_EQ(Made{}, WriteAll(writer));
}

TEST_F(Writer, RefusesEntriesThatCannotBeTogether) {
    const std::vector<const char*> kCases[] = {{"a", "b", "a"}, {"a", "a-", "a/b"}, {"x", "a/b/c/d", "a/b"}};
    for (const std::vector<const char*>& paths : kCases) {
        zarvo::writer writer;
        for (const char* const path : paths)
            EXPECT_FALSE(writer.add(path, BytesOf("")));
        EXPECT_EQ(ZARVO_ERROR_REFUSED, WriteAll(writer).code) << paths[2];
    }
}

TEST_F(Writer, NamesTheSourceThatFails) {
    for (const bool isShort : {false, true}) {
        zarvo::writer writer;
        auto source = std::make_unique<CountingSource>(SampleText(300'000));
        if (isShort)
            source->claimedSize = 300'001;
        else
            source->failingRead = 2;
        EXPECT_FALSE(writer.add("d/bad", std::move(source)));
        EXPECT_FALSE(writer.add("good", BytesOf("x")));
        EXPECT_EQ(isShort ? "d/bad failed: the source ends too early\n" : "d/bad failed: Connection timed out\n",
                  WriteAll(writer).reports);
        EXPECT_EQ(std::set<std::string>{}, Names());
    }
}

TEST_F(Writer, ClosesItsSources) {
    struct Closing final : zarvo::source {
        explicit Closing(int* count) : closed(count) {}
        ~Closing() override { ++*closed; }
        int64_t read_at(std::span<std::byte>, uint64_t) override { return 0; }
        int64_t size() override { return 0; }
        int* closed;
    };
    int closed = 0;
    {
        zarvo::writer writer;
        EXPECT_FALSE(writer.add("a", std::make_unique<Closing>(&closed)));
        EXPECT_EQ(0, closed);
        EXPECT_TRUE(writer.add("..", std::make_unique<Closing>(&closed)));
        EXPECT_EQ(1, closed);
    }
    EXPECT_EQ(2, closed);
}

} // namespace
