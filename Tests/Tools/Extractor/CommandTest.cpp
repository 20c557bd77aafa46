// The command and the world around it: its arguments, what stands where it writes, and who listens.
#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <csignal>
#include <fcntl.h>
#include <sys/resource.h>

namespace {

const std::string kThree = "a:r150000 folder| b/c:text";

Transcript Unread(const std::string& path, const std::string& reason) {
    return {1, "Extracting file '" + path + "'...\n" + Say(reason + ":" + path + " unread")};
}

bool DuplicateTo(int descriptor, int from) { return dup2(from, descriptor) == descriptor; }

TEST(Command, WithoutAnArgumentShowsItsUsage) {
    EXPECT_EQ(Transcript(1, "Usage: Varnex <zarvowebfile>\n"), RunVarnex({}));
}

TEST(Command, LooksAtItsFirstArgumentOnly) {
    const TemporaryFolder folder;
    EXPECT_EQ(Unread("", "unopened"), RunVarnex({""}, folder.Path()));
    EXPECT_EQ(Unread("no", "unopened"), RunVarnex({"no", "--help", ""}, folder.Path()));
    EXPECT_EQ(Unread(".", "noheader"), RunVarnex({"."}, folder.Path()));
    EXPECT_EQ(FolderTree(), ReadFolderTree(folder.Path()));
}

TEST(Command, RunsAgainWithTheSameResult) {
    const TemporaryFolder folder;
    Expect({.archive = kThree, .folder = folder.Path()});
    Expect({.archive = kThree, .folder = folder.Path()});
}

TEST(Command, OverwritesItsFilesAndLeavesOthers) {
    const TemporaryFolder folder;
    fs::create_directories(folder / "a.zarvo_data/b");
    WriteFile(folder / "a.zarvo_data/a", "cut short by an interruption");
    WriteFile(folder / "a.zarvo_data/b/c", "longer than what it becomes");
    WriteFile(folder / "a.zarvo_data/other", "other");
    Expect({.archive = kThree, .output = kThree + " other:other", .folder = folder.Path()});
}

TEST(Command, FollowsLinksThatAreThere) {
    const TemporaryFolder folder, other;
    fs::create_directory(folder / "a.zarvo_data");
    fs::create_directory_symlink(other.Path(), folder / "a.zarvo_data/b");
    Expect({.archive = kThree, .output = "a:r150000 folder| b:" + other.Path(), .folder = folder.Path()});
    EXPECT_EQ("text", ReadFile(other / "c"));
}

// In the next three, the last file fails: its message is printed while the file is open, and must not land in it.
const Case kUnheard = {
    .archive = kThree + " past: node[3].size=1",
    .messages = "data:past",
    .isHeard = false,
};

TEST(Command, ExtractsThoughTheOutputIsAFullDisk) {
    Case run = kUnheard;
    run.prepare = [] { return DuplicateTo(STDOUT_FILENO, open("/dev/full", O_WRONLY)); };
    Expect(run);
}

TEST(Command, ExtractsThoughNobodyReadsItsPipe) {
    Case run = kUnheard;
    run.prepare = [] {
        int ends[2];
        if (pipe(ends) != 0) return false;
        close(ends[0]);
        return DuplicateTo(STDOUT_FILENO, ends[1]);
    };
    Expect(run);
}

TEST(Command, ExtractsWithDescriptorsClosed) {
    for (unsigned closed = 1; closed < 8; ++closed) {
        SCOPED_TRACE(testing::Message() << "closed descriptors: bits of " << closed);
        Case run = kUnheard;
        run.isHeard = (closed >> STDOUT_FILENO & 1) == 0;
        run.prepare = [closed] {
            for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
                if ((closed >> descriptor & 1) != 0) close(descriptor);
            return true;
        };
        Expect(run);
    }
}

TEST(Command, ReportsWhatStandsInTheirPlace) {
    const TemporaryFolder whole, parts;
    WriteFile(whole / "a.zarvo_data", "file");
    Expect({.archive = kThree,
            .messages = "folder: file:a folder:folder folder:b file:b/c",
            .output = ":file",
            .folder = whole.Path()});
    fs::create_directories(parts / "a.zarvo_data/a");
    WriteFile(parts / "a.zarvo_data/b", "file");
    Expect({.archive = kThree,
            .messages = "file:a folder:b file:b/c",
            .output = "a| folder| b:file",
            .folder = parts.Path()});
}

TEST(Command, ReportsAFullDisk) {
    const TemporaryFolder folder;
    fs::create_directory(folder / "a.zarvo_data");
    fs::create_symlink("/dev/full", folder / "a.zarvo_data/a");
    Expect(
        {.archive = kThree, .messages = "write:a", .output = "a:/dev/full folder| b/c:text", .folder = folder.Path()});
}

TEST(Command, ReportsAFileThatGrowsPastItsLimit) {
    for (const rlim_t limit : {rlim_t{100'000}, rlim_t{149'999}})
        Expect({.archive = kThree,
                .messages = "write:a",
                .output = "a:r" + std::to_string(limit) + " folder| b/c:text",
                .prepare = [limit] {
                    const rlimit limits = {limit, limit};
                    return setrlimit(RLIMIT_FSIZE, &limits) == 0;
                }});
}

// Runs the command as a user who is bound by permissions, which root is not: from a copy, because that user may be kept
// out of the build folder.
class CommandPermissions : public testing::Test {
protected:
    static bool BecomeBound() {
        constexpr uid_t kNobody = 65'534;
        return geteuid() != 0 || (setgid(kNobody) == 0 && setuid(kNobody) == 0);
    }

    void SetUp() override {
        fs::copy_file(VARNEX_BINARY, m_Run.program);
        for (const std::string& path : {m_Folder.Path(), m_Programs.Path(), m_Run.program})
            fs::permissions(path, fs::perms::all);
        if (RunProgram(m_Run.program.c_str(), {}, m_Folder.Path(), BecomeBound).first != 1)
            GTEST_SKIP() << "another user can't run a program in " << m_Programs.Path();
    }

    static constexpr fs::perms kReadOnly = fs::perms(0444), kNoNewEntries = fs::perms(0555);
    const TemporaryFolder m_Folder, m_Programs;
    const std::string m_Output = m_Folder / "a.zarvo_data";
    Case m_Run = {
        .archive = kThree,
        .folder = m_Folder.Path(),
        .prepare = BecomeBound,
        .program = m_Programs / "Varnex",
    };
};

TEST_F(CommandPermissions, KeepAFileFromBeingWritten) {
    fs::create_directory(m_Output);
    fs::permissions(m_Output, fs::perms::all);
    WriteFile(m_Output + "/a", "kept");
    fs::permissions(m_Output + "/a", kReadOnly);
    m_Run.messages = "file:a";
    m_Run.output = "a:kept folder| b/c:text";
    Expect(m_Run);
}

TEST_F(CommandPermissions, KeepTheOutputFolderFromBeingMade) {
    WriteFile(m_Folder / "a.zarvo", "");
    fs::permissions(m_Folder.Path(), kNoNewEntries);
    const std::string refused = "refused:" + m_Output + " folder:";
    m_Run.messages = refused + " file:a " + refused + "folder " + refused + "b file:b/c";
    m_Run.output = "none";
    Expect(m_Run);
}

TEST_F(CommandPermissions, KeepTheArchiveFromBeingRead) {
    WriteFile(m_Folder / "a.zarvo", "");
    fs::permissions(m_Folder / "a.zarvo", fs::perms::none);
    EXPECT_EQ(Unread("a.zarvo", "unopened"),
              RunProgram(m_Run.program.c_str(), {"a.zarvo"}, m_Folder.Path(), BecomeBound));
}

} // namespace
