// The command as a process: its standard descriptors, signals and terminals.
#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include "Tools/Zarvo/Output.h"

#include <atomic>
#include <csignal>
#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace {

class ZarvoProcess : public ZarvoTest {
protected:
    ZarvoProcess() { signal(SIGPIPE, SIG_DFL); }

    // Runs a line of shell with the command as $Z; standard output and error together.
    static Transcript Shell(const std::string& line) {
        return RunProgram("/bin/bash", {"-c", "Z='" VARNEX_BINARY "'; " + line});
    }
    // An archive whose list is larger than a pipe and the command's buffer.
    static void MakeLongArchive() {
        ArchiveDescription archive;
        for (int index = 0; index < 10'000; ++index)
            archive.entries.push_back({.path = "a folder/a file of number " + std::to_string(index)});
        MakeArchive("long.zarvo", archive);
    }
};

TEST_F(ZarvoProcess, FailsWhereItsDescriptorsDo) {
    MakeArchive("a.zarvo", Archive("a:x d|"));
    MakeArchive("empty.zarvo", {});
    const struct {
        const char* line;
        Transcript heard;
    } kCases[] = {
        {"$Z list a.zarvo >/dev/full", {1, "zarvo: standard output: No space left on device\n"}},
        {"$Z list a.zarvo >&-", {1, "zarvo: standard output: Bad file descriptor\n"}},
        {"$Z cat a.zarvo a >&-", {1, "zarvo: standard output: Bad file descriptor\n"}},
        {"$Z info a.zarvo <&- >/dev/full", {1, "zarvo: standard output: No space left on device\n"}},
        {"$Z extract -qv a.zarvo >/dev/full", {1, "zarvo: standard output: No space left on device\n"}},
        {"$Z extract -q a.zarvo >&-", {0, ""}},
        {"$Z sum a.zarvo >/dev/full", {1, "zarvo: standard output: No space left on device\n"}},
        {"$Z test a.zarvo >&-", {0, ""}},
        {"$Z --help >/dev/full", {1, "zarvo: standard output: No space left on device\n"}},
        {"$Z list --files-from=- a.zarvo <&-", {1, "zarvo: standard input: Bad file descriptor\n"}},
        {"$Z cat a.zarvo d >&-", {0, ""}},
        {"$Z list empty.zarvo >/dev/full", {0, ""}},
        {"$Z list none >/dev/full", {2, "zarvo: none: No such file or directory\n"}},
        {"$Z list none 2>&-", {2, ""}},
        {"$Z list none 2>/dev/full", {2, ""}},
    };
    for (const auto& [line, heard] : kCases)
        EXPECT_EQ(heard, Shell(line)) << line;
}

TEST_F(ZarvoProcess, NamesAListThatNeverEnds) {
    if (VARNEX_SANITIZED) GTEST_SKIP() << "sanitizers need more address space than the limit allows";
    MakeArchive("a.zarvo", Archive("a:x b:x"));
    EXPECT_EQ(Transcript(1, "zarvo: /dev/zero: Cannot allocate memory\na\n"),
              Shell("ulimit -v 500000; $Z list --files-from=/dev/zero a.zarvo a"));
}

TEST_F(ZarvoProcess, SurvivesALimitOfFileSizes) {
    MakeArchive("a.zarvo", Archive("large:z3000 small:x"));
    EXPECT_EQ(Transcript(1, "zarvo: a.zarvo: large: File too large\nsmall\n"),
              Shell("ulimit -f 1; $Z extract -qv a.zarvo"));
    EXPECT_EQ((FolderTree{{"small", "x"}}), ReadFolderTree("a.zarvo_data"));
    EXPECT_EQ(Transcript(1, "zarvo: standard output: File too large\n"),
              Shell("ulimit -f 1; $Z cat a.zarvo large >printed"));
}

TEST_F(ZarvoProcess, EndsSilentlyWhenNobodyReadsOn) {
    MakeLongArchive();
    for (const char* const subcommand : {"list", "sum", "extract --dry-run"})
        EXPECT_EQ(Transcript(141, ""),
                  Shell("$Z " + std::string(subcommand) + " long.zarvo | true; exit ${PIPESTATUS[0]}"))
            << subcommand;
    EXPECT_EQ(Transcript(1, ""), Shell("trap '' PIPE; $Z list long.zarvo | true; exit ${PIPESTATUS[0]}"));
}

// Called in the process of the command, before it: its results go to a pipe, and once that is full, the signal comes.
bool SignalWhenThePipeIsFull(int signal) {
    int pipe[2] = {};
    if (pipe2(pipe, O_CLOEXEC) != 0 || dup2(pipe[1], STDOUT_FILENO) < 0) return false;
    (void)::signal(signal, SIG_DFL); // a shell's background processes ignore SIGINT
    const pid_t command = getpid();
    if (fork() != 0) return true;
    const int size = fcntl(pipe[0], F_GETPIPE_SZ);
    for (int held = 0; held < size && getppid() == command; usleep(1'000))
        ioctl(pipe[0], FIONREAD, &held);
    kill(command, signal);
    while (getppid() == command)
        usleep(1'000); // keeps the pipe's end
    _exit(0);
}

TEST_F(ZarvoProcess, EndsByTheSignalThatEndsIt) {
    MakeLongArchive();
    fs::create_directory("folder");
    for (int index = 0; index < 2'000; ++index)
        WriteFile("folder/" + std::to_string(index) + std::string(200, 'n'), "");
    const struct {
        int signal;
        std::vector<std::string> command;
        const char* message;
    } kRuns[] = {
        {SIGINT, {"list", "long.zarvo"}, "zarvo: ended by SIGINT after 65536 bytes of results\n"},
        {SIGTERM, {"list", "long.zarvo"}, "zarvo: ended by SIGTERM after 65536 bytes of results\n"},
        {SIGINT, {"sum", "long.zarvo"}, "zarvo: ended by SIGINT after 65536 bytes of results\n"},
        {SIGINT,
         {"create", "--dry-run", "new.zarvo", "folder"},
         "zarvo: ended by SIGINT after 0 bytes; no archive is made\n"},
    };
    for (const auto& run : kRuns)
        EXPECT_EQ(Transcript(kStatusOfSignal + run.signal, run.message),
                  RunProgram(VARNEX_BINARY, run.command, ".", [&] { return SignalWhenThePipeIsFull(run.signal); }))
            << run.command[0];
}

TEST_F(ZarvoProcess, PutsOutAfterASignalWhatNeedNotWait) {
    int pipe[2] = {};
    ASSERT_EQ(0, pipe2(pipe, O_CLOEXEC));
    std::atomic<int> signal{0};
    OutputBuffer output(pipe[1], false, &signal);
    const std::string lines(100'000, 'l');
    output.Write(lines);
    signal = SIGINT;
    output.Flush(); // more than the pipe takes
    EXPECT_EQ(65'536u, output.GetWritten());
    EXPECT_EQ(0, output.GetError());
    close(pipe[0]);
    close(pipe[1]);
}

TEST_F(ZarvoProcess, EscapesWhatGoesToATerminal) {
    MakeArchive("a.zarvo", {.entries = {{.path = "a\x1b"}}});
    EXPECT_EQ(Transcript(0, "a\\x1b\r\n"), Shell("script -qec \"$Z list a.zarvo\" /dev/null </dev/null"));
}

TEST_F(ZarvoProcess, ShowsProgressOnATerminalAndWipesIt) {
    MakeArchive("a.zarvo", Archive("a:x"));
    // The reader waits before it takes the first bytes, so the run takes long enough.
    MakeArchive("big.zarvo", Archive("stored a:z1000000 b:z1000000 c:z1000000"));
    const std::string slowly = " | (sleep 0.5; cat >/dev/null)\" /dev/null </dev/null";
    const auto [status, text] = Shell("script -qec \"$Z cat big.zarvo '**'" + slowly);
    EXPECT_EQ(0, status);
    EXPECT_EQ(0u, text.find("\r\x1b[K")) << text;
    EXPECT_NE(std::string::npos, text.find(" files, ")) << text;
    EXPECT_TRUE(text.ends_with("\r\x1b[K")) << text;
    EXPECT_EQ(Transcript(0, ""), Shell("script -qec \"$Z cat -q big.zarvo '**'" + slowly));
    EXPECT_EQ(Transcript(0, ""), Shell("script -qec \"$Z cat --progress=never big.zarvo '**'" + slowly));
}

} // namespace
