// The command and the world around it: its arguments, what stands where it writes, and who listens.
#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <csignal>
#include <fcntl.h>
#include <sys/resource.h>

static const std::string kThree = "a:r150000 folder| b/c:text";

TEST(Command, LooksAtItsFirstArgumentOnly) {
    const TemporaryFolder folder;
    const auto failed = [](const std::string& path, const std::string& reason) {
        return Transcript(1, "Extracting file '" + path + "'...\n" + Say(reason + ":" + path + " unread"));
    };
    EXPECT_EQ(Transcript(1, "Usage: Varnex <zarvowebfile>\n"), RunVarnex({}, folder.Path()));
    EXPECT_EQ(failed("", "unopened"), RunVarnex({""}, folder.Path()));
    EXPECT_EQ(failed("no", "unopened"), RunVarnex({"no", "--help", ""}, folder.Path()));
    EXPECT_EQ(failed(".", "noheader"), RunVarnex({"."}, folder.Path()));
    EXPECT_TRUE(fs::is_empty(folder.Path()));
}

TEST(Command, RewritesWhatIsThereAndLeavesTheRest) {
    const TemporaryFolder folder, other;
    Case run{.archive = kThree, .folder = folder.Path(), .path = folder / "a.zarvo"};
    Expect(run);
    // As after a run that was interrupted, and with something else in the folder.
    WriteFile(folder / "a.zarvo_data/a", "cut");
    WriteFile(folder / "a.zarvo_data/b/c", "longer");
    WriteFile(folder / "a.zarvo_data/other", "other");
    run.output = kThree + " other:other";
    Expect(run);
    // Links are followed.
    fs::remove_all(folder / "a.zarvo_data/b");
    fs::create_directory_symlink(other.Path(), folder / "a.zarvo_data/b");
    run.output = "a:r150000 folder| other:other b:" + other.Path();
    Expect(run);
    EXPECT_EQ("text", ReadFile(other / "c"));
}

// The last file fails while it is open, which is when a message could land in it. The standard output is a full disk, a
// pipe that nobody reads from, or closed; so may the other descriptors be.
TEST(Command, GoesOnWhoeverListens) {
    constexpr int kFull = 8, kPipe = 9; // else a bit for each that is closed
    for (int how = 1; how <= kPipe; ++how) {
        Case run{kThree + " past: node[3].size=1", "data:past"};
        run.isHeard = how < kFull && (how & 2) == 0;
        run.prepare = [how] {
            int ends[2];
            for (const int descriptor : {0, 1, 2})
                if (how < kFull && (how >> descriptor & 1) != 0) close(descriptor);
            if (how == kFull) return dup2(open("/dev/full", O_WRONLY), STDOUT_FILENO) >= 0;
            return how < kFull || (pipe(ends) == 0 && close(ends[0]) == 0 && dup2(ends[1], STDOUT_FILENO) >= 0);
        };
        Expect(run);
    }
}

TEST(Command, SaysWhatStandsInItsWay) {
    const TemporaryFolder folder;
    const std::string output = folder / "a.zarvo_data";
    WriteFile(output, "file");
    Expect({kThree, "folder: file:a folder:folder folder:b file:b/c", ":file", {}, folder.Path()});
    fs::remove(output);
    fs::create_directories(output + "/a");
    WriteFile(output + "/b", "file");
    Expect({kThree, "file:a folder:b file:b/c", "a| folder| b:file", {}, folder.Path()});
    // A disk that is full from the start, or when a file has grown so far.
    fs::remove_all(output);
    fs::create_directory(output);
    fs::create_symlink("/dev/full", output + "/a");
    Expect({kThree, "write:a", "a:/dev/full folder| b/c:text", {}, folder.Path()});
    for (const rlim_t largest : {rlim_t{100'000}, rlim_t{149'999}}) {
        Case run{kThree, "write:a", "a:r" + std::to_string(largest) + " folder| b/c:text"};
        run.prepare = [largest] {
            const rlimit limits = {largest, largest};
            return signal(SIGXFSZ, SIG_IGN) != SIG_ERR && setrlimit(RLIMIT_FSIZE, &limits) == 0;
        };
        Expect(run);
    }
}

// As another user when this one is not stopped by any permission, with a copy of the program, as that user may be kept
// out of the build folder.
TEST(Command, RespectsPermissions) {
    const TemporaryFolder folder, programs;
    const std::string path = folder.Path(), output = path + "/a.zarvo_data";
    Case run{kThree, "file:a", "a:kept folder| b/c:text", {}, path};
    run.prepare = [] { return geteuid() != 0 || (setgid(65'534) == 0 && setuid(65'534) == 0); };
    run.program = programs / "Varnex";
    fs::copy_file(VARNEX_BINARY, run.program);
    for (const std::string& open : {path, programs.Path(), run.program})
        fs::permissions(open, fs::perms::all);
    if (RunProgram(run.program.c_str(), {}, path, run.prepare).first != 1)
        GTEST_SKIP() << "another user can't run a program in " << programs.Path();
    // A file that can't be written; then no output folder can be made; then the archive can't be read.
    fs::create_directory(output);
    WriteFile(output + "/a", "kept");
    fs::permissions(output, fs::perms::all);
    fs::permissions(output + "/a", fs::perms(0444));
    Expect(run);
    fs::remove_all(output);
    fs::permissions(path, fs::perms(0555));
    const std::string refused = "refused:" + output + " folder:";
    run.messages = refused + " file:a " + refused + "folder " + refused + "b file:b/c";
    run.output = "none";
    Expect(run);
    fs::permissions(path + "/a.zarvo", fs::perms::none);
    const std::string unread = "Extracting file 'a.zarvo'...\n" + Say("unopened:a.zarvo unread");
    EXPECT_EQ(Transcript(1, unread), RunProgram(run.program.c_str(), {"a.zarvo"}, path, run.prepare));
}
