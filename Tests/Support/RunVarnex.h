// Runs the command as its users do, in a process of its own, and keeps everything that it says.
//
//   EXPECT_EQ(RunVarnex({"missing.zarvo"}, {.workingDirectory = folder}),
//             (Transcript{.status = 1, .output = "Extracting file 'missing.zarvo'...\n..."}));
//
// VARNEX_BINARY is the path of the program. Any thread.
#pragma once

#include <ostream>
#include <string>
#include <utility>
#include <vector>

// Statuses that no program returns.
constexpr int kStatusOfSignal = 1'000; // plus the signal that ended the program
constexpr int kStatusTimedOut = 2'000; // and was ended for it

struct Transcript {
    int status = 0;          // exit status, or one of those above
    std::string output = {}; // everything on standard output
    std::string error = {};  // everything on standard error

    bool operator==(const Transcript&) const = default;
};

// For failure messages: everything, with bytes that can't be printed escaped and what is very long cut in its middle.
std::ostream& operator<<(std::ostream& stream, const Transcript& transcript);

struct RunOptions {
    std::string workingDirectory = {}; // empty: the caller's
    std::vector<int> closedDescriptors = {};
    std::vector<std::pair<std::string, std::string>> environment = {}; // added to the caller's
    std::string outputFile = {};                                       // standard output goes there; none is collected
    bool readsOutput = true;       // false: nobody reads standard output, and the pipe's other end is closed
    long long largestFile = -1;    // bytes that a file may grow to; writes past it fail
    bool unprivileged = false;     // as another user when the caller is root, whom no permission stops
    long* peakKilobytes = nullptr; // gets the most memory that the program had at once
    int timeoutSeconds = 120;
};

// Runs a program. A program that can't be started has the status 127.
Transcript RunProgram(const char* program, const std::vector<std::string>& arguments, const RunOptions& options);

#ifdef VARNEX_BINARY
inline Transcript RunVarnex(const std::vector<std::string>& arguments, const RunOptions& options = {}) {
    return RunProgram(VARNEX_BINARY, arguments, options);
}
#endif
