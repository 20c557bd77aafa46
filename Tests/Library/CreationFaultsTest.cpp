// The archive's place, and what becomes of it when something goes wrong.
#include "Tests/Library/CreationTest.h"
#include "Tests/Library/SystemFaults.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>

namespace {

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

// A device such as /dev/null would be lost for everybody.
TEST_F(Creation, ReplacesNothingThatIsNoFileOrLink) {
    Put("a", "x");
    ASSERT_EQ(0, mkfifo(Archive().c_str(), 0600));
    EXPECT_EQ("File exists: a device, pipe or socket is not replaced", Create(Archive(), In(), {.force = true}).text);
    EXPECT_EQ(true, fs::is_fifo(Archive()));
}

TEST_F(Creation, FailsInADryRunAsItWouldWithoutOne) {
    Put("a", "x");
    fs::create_symlink("a", In() + "/link");
    WriteFile(m_Folder / "file", "old");
    fs::create_directory(m_Folder / "folder");
    fs::create_directory(m_Folder / "sealed");
    fs::permissions(m_Folder / "sealed", fs::perms::others_read | fs::perms::others_exec);
    fs::permissions(m_Folder.Path(), fs::perms::all);
    const OrdinaryUser user;
    const struct {
        std::string name;
        const char* text;
    } kCases[] = {
        {"a.zarvo", ""},
        {"file", "File exists"},
        {"folder", "Is a directory"},
        {"folder/", "Is a directory"},
        {"none/a.zarvo", "No such file or directory"},
        {"file/a.zarvo", "Not a directory"},
        {"sealed/a.zarvo", "Permission denied"},
        {std::string(256, 'n'), "File name too long"},
    };
    for (const auto& [name, text] : kCases) {
        const Made dry = Create(m_Folder / name, In(), {.dry_run = true});
        EXPECT_EQ(text, dry.text) << name;
        EXPECT_EQ((std::set<std::string>{"file", "folder", "sealed"}), Names()) << name;
        EXPECT_EQ(dry, Create(m_Folder / name, In())) << name;
        fs::remove(Archive());
    }
    const Made narrow = Create(Archive(), In(), {.dry_run = true}, {.memory = 1});
    EXPECT_EQ("to compress takes ", narrow.text.substr(0, 18));
    EXPECT_EQ(narrow, Create(Archive(), In(), {}, {.memory = 1}));
}

TEST_F(Creation, NamesAFileThatCannotBeReadInADryRun) {
    Put("d/a", "x");
    Put("d/b", "x");
    Put("empty", "");
    fs::permissions(m_Folder.Path(), fs::perms::all);
    for (const std::string path : {"d/b", "empty"}) { // one more each time; empty files are the first to be opened
        fs::permissions(In() + "/" + path, fs::perms::none);
        const OrdinaryUser user;
        const Made dry = Create(Archive(), In(), {.dry_run = true});
        EXPECT_EQ(path + " failed: Permission denied\n", dry.reports);
        EXPECT_EQ(dry, Create(Archive(), In()));
    }
}

TEST_F(Creation, NamesAFolderThatCannotBeRead) {
    EXPECT_EQ(" failed: No such file or directory\n", Create(Archive(), m_Folder / "none").reports);
    WriteFile(m_Folder / "file", "");
    EXPECT_EQ(" failed: Not a directory\n", Create(Archive(), m_Folder / "file").reports);
    EXPECT_EQ("No such file or directory", Create(m_Folder / "none/a.zarvo", m_Folder.Path()).text);
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

// Fewer than the folders that each thread would keep open.
TEST_F(Creation, NeedsFewDescriptors) {
    std::string path;
    for (int folder = 0; folder < 30; ++folder) {
        const std::string name = std::to_string(folder);
        Put(name + "/a", "x");
        Put((path += name + "/") + "b", "x");
    }
    const FewDescriptors few(16);
    EXPECT_EQ((Made{.files = 60}), Create(Archive(), In(), {}, {.threads = 4}));
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
        {"becomes a folder",
         [](const std::string& path) {
             fs::remove(path);
             fs::create_directory(path);
         },
         "the file has changed: it had 200000 bytes"},
    };
    for (const auto& row : kCases)
        for (const int32_t layout : {ZARVO_LAYOUT_FS, ZARVO_LAYOUT_WEB}) {
            SCOPED_TRACE(std::string(row.name) + ", layout " + std::to_string(layout));
            fs::remove_all(In());
            Put("d/file", SampleText(200'000));
            WriteFile(m_Folder / ".a.zarvo.zarvo-part", "");
            const auto change = [&](std::string_view) { row.change(In() + "/d/file"); };
            const Made made = Create(Archive(), In(), {.layout = layout, .log = change}, {.threads = 2});
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

// That of a single thread, which looks at the empty files first. With several, the others fail before it does.
TEST_F(Creation, NamesTheSameFailureForAnyThreads) {
    for (int number = 100; number < 700; ++number)
        Put("empty/" + std::to_string(number), "");
    for (const char* const block : {"0", "1", "2"}) {
        Put(std::string("full/") + block, NoiseText(4'000'000));
        Put(std::string("full/") + block + "+", NoiseText(96'304));
    }
    const std::vector<std::string> kCases[] = {
        {"empty/355", "empty/356", "empty/357"},
        {"empty/699", "full/0", "full/1"},
        {"full/0+", "full/1", "full/2"},
    };
    for (const std::vector<std::string>& vanishing : kCases)
        for (const uint32_t threads : {1u, 2u, 3u}) {
            WriteFile(m_Folder / ".a.zarvo.zarvo-part", "");
            zarvo::create_options how = {.compression = ZARVO_KIND_NONE, .block_size = 4'096'304};
            how.log = [&](std::string_view) {
                for (const std::string& path : vanishing)
                    fs::rename(In() + "/" + path, m_Folder / fs::path(path).filename());
            };
            EXPECT_EQ(vanishing[0] + " failed: No such file or directory\n",
                      Create(Archive(), In(), how, {.threads = threads}).reports)
                << threads;
            for (const std::string& path : vanishing)
                fs::rename(m_Folder / fs::path(path).filename(), In() + "/" + path);
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

} // namespace
