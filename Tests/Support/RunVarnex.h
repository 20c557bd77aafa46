// Runs the command as its users do, in a process of its own, and keeps everything that it says.
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

// The exit status, and what was printed to standard output and error together. A program that a signal has ended has
// 1,000 and the signal as its status, one that can't be started 127. Two minutes are ended by SIGALRM.
using Transcript = std::pair<int, std::string>;

// Runs a program in a folder. In the new process, prepare is called before the program; false: it is not run.
inline Transcript RunProgram(const char* program, const std::vector<std::string>& arguments,
                             const std::string& folder = ".", const std::function<bool()>& prepare = {}) {
    constexpr int kStatusNotStarted = 127, kStatusOfSignal = 1'000;
    std::vector<char*> list = {const_cast<char*>("Varnex")};
    for (const std::string& argument : arguments)
        list.push_back(const_cast<char*>(argument.c_str()));
    list.push_back(nullptr);

    FILE* const output = tmpfile();
    const pid_t process = fork();
    if (process == 0) {
        alarm(120);
        if (dup2(fileno(output), STDOUT_FILENO) >= 0 && dup2(STDOUT_FILENO, STDERR_FILENO) >= 0 &&
            chdir(folder.c_str()) == 0 && (prepare == nullptr || prepare()))
            execv(program, list.data());
        _exit(kStatusNotStarted);
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

inline Transcript RunVarnex(const std::vector<std::string>& arguments, const std::string& folder = ".",
                            const std::function<bool()>& prepare = {}) {
    return RunProgram(VARNEX_BINARY, arguments, folder, prepare);
}
