#include "Tests/Library/CreationTest.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>

namespace {

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
        EXPECT_EQ(ZARVO_OK, Create(Archive(), m_Folder / "other", how, {.threads = 3}).code);
        EXPECT_EQ(true, bytes == ReadFile(Archive()));
    }
}

TEST_F(Creation, IsAsItsOptionsSay) {
    PutManyFiles();
    const zarvo::create_options how = {.compression = ZARVO_KIND_LZMA,
                                       .is_streamed = true,
                                       .block_size = 50'000,
                                       .engine_version = "z 1",
                                       .engine_revision = ""};
    ASSERT_EQ(ZARVO_OK, Create(Archive(), In(), how).code);
    const zarvo::archive archive = *zarvo::archive::open(Archive());
    const zarvo_info info = archive.info();
    EXPECT_EQ(std::string("z 1"), info.engine_version);
    EXPECT_EQ(std::string(""), info.engine_revision);
    EXPECT_EQ(50'000u, info.largest_block);
    EXPECT_EQ(info.file_size, info.recorded_size);
    EXPECT_EQ(5u, info.blocks_lzma);
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

TEST_F(Creation, CountsEmptyFilesWhenTheyAreChecked) {
    Put("a", "");
    Put("b", "");
    std::vector<uint64_t> files; // since all are known
    ASSERT_EQ(ZARVO_OK, Create(Archive(), In(), {},
                               {.progress =
                                    [&](const zarvo_progress& progress) {
                                        if (progress.files_total == 2) files.push_back(progress.files);
                                        return true;
                                    }})
                            .code);
    EXPECT_EQ(0u, files.front());
    EXPECT_EQ(2u, files.back());
}

// The last progress that is told.
zarvo_progress TellLast(const std::string& archive, const std::string& folder, const zarvo::create_options& how) {
    zarvo_progress last = {};
    const auto keep = [&](const zarvo_progress& progress) {
        last = progress;
        return true;
    };
    EXPECT_EQ(ZARVO_OK, Create(archive, folder, how, {.progress = keep}).code);
    return last;
}

TEST_F(Creation, TellsAllProgressInTheEnd) {
    PutManyFiles();
    const zarvo_progress last = TellLast(Archive(), In(), {});
    EXPECT_EQ(zarvo::archive::open(Archive())->info().data_size, last.bytes);
    EXPECT_EQ(last.bytes_total, last.bytes);
    EXPECT_EQ(last.files_total, last.files);
}

TEST_F(Creation, TellsInTheEndThatADryRunHasLookedAtAll) {
    Put("folder/a", "");
    Put("folder/b", "x");
    const zarvo_progress last = TellLast(Archive(), In(), {.dry_run = true});
    EXPECT_EQ(3u, last.files_total);
    EXPECT_EQ(3u, last.files);
}

} // namespace
