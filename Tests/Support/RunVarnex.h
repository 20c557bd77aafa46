// Runs the command as its users do, in its own process, and returns everything that it prints.
//
//   EXPECT_EQ(Transcript(1, "Extracting file 'missing.zarvo'...\n..."), RunVarnex({"missing.zarvo"}, folder));
//
// VARNEX_BINARY is the path of the program.
#pragma once

#include <cstdio>
#include <functional>
#include <string>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

// The exit status, and what was printed to standard output and error together. A process that a signal has ended has
// kStatusOfSignal plus the signal as its status.
using Transcript = std::pair<int, std::string>;

constexpr int kStatusNotStarted = 127;
constexpr int kStatusOfSignal = 1'000;

// Runs body in a copy of this process, which ends with what body returns. SIGALRM ends it after two minutes.
inline Transcript RunForked(const std::function<int()>& body) {
    FILE* const output = tmpfile();
    fflush(stdout); // or the copy prints what is still buffered
    const pid_t process = fork();
    if (process == 0) {
        alarm(120);
        if (dup2(fileno(output), STDOUT_FILENO) < 0 || dup2(STDOUT_FILENO, STDERR_FILENO) < 0) _exit(kStatusNotStarted);
        const int status = body();
        fflush(stdout);
        _exit(status);
    }
    int status = kStatusNotStarted << 8;
    waitpid(process, &status, 0);
    Transcript transcript(WIFSIGNALED(status) ? kStatusOfSignal + WTERMSIG(status) : WEXITSTATUS(status), "");
    rewind(output);
    for (int byte; (byte = getc(output)) != EOF;)
        transcript.second += static_cast<char>(byte);
    fclose(output);
    return transcript;
}

// Runs a program in folder. prepare is called in the new process, before the program. When it returns false, or the
// program can't be started, the status is kStatusNotStarted.
inline Transcript RunProgram(const char* program, const std::vector<std::string>& arguments,
                             const std::string& folder = ".", const std::function<bool()>& prepare = {}) {
    std::vector<char*> list = {const_cast<char*>("Varnex")};
    for (const std::string& argument : arguments)
        list.push_back(const_cast<char*>(argument.c_str()));
    list.push_back(nullptr);
    return RunForked([&] {
        if (chdir(folder.c_str()) == 0 && (prepare == nullptr || prepare())) execv(program, list.data());
        return kStatusNotStarted;
    });
}

inline Transcript RunVarnex(const std::vector<std::string>& arguments, const std::string& folder = ".",
                            const std::function<bool()>& prepare = {}) {
    return RunProgram(VARNEX_BINARY, arguments, folder, prepare);
}
