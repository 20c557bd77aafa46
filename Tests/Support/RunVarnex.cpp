#include "Tests/Support/RunVarnex.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

namespace {

constexpr int kStatusNotStarted = 127;
constexpr unsigned kOtherUser = 65'534;

long long NowInMilliseconds() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * 1'000LL + now.tv_nsec / 1'000'000;
}

// The other end of a pipe, as a descriptor of the program.
struct Pipe {
    int readEnd = -1;
    int writeEnd = -1;

    bool Open() {
        int ends[2];
        if (pipe2(ends, O_CLOEXEC) != 0) return false;
        readEnd = ends[0];
        writeEnd = ends[1];
        return true;
    }
};

// Everything between fork and exec. Returns only when the program can't be started.
void BecomeProgram(const char* program, const std::vector<char*>& arguments, const RunOptions& options,
                   int outputDescriptor, int errorDescriptor) {
    // The pipe's ends may be 0 to 2 themselves when the caller has those closed, so they move away first.
    const int output = fcntl(outputDescriptor, F_DUPFD_CLOEXEC, 10);
    const int error = fcntl(errorDescriptor, F_DUPFD_CLOEXEC, 10);
    if (dup2(output, STDOUT_FILENO) < 0 || dup2(error, STDERR_FILENO) < 0) return;

    if (!options.workingDirectory.empty() && chdir(options.workingDirectory.c_str()) != 0) return;
    for (const auto& [name, value] : options.environment)
        setenv(name.c_str(), value.c_str(), 1);
    if (options.largestFile >= 0) {
        const rlim_t limit = static_cast<rlim_t>(options.largestFile);
        const rlimit limits = {limit, limit};
        if (setrlimit(RLIMIT_FSIZE, &limits) != 0) return;
        signal(SIGXFSZ, SIG_IGN); // so that the write fails instead
    }
    if (options.unprivileged && geteuid() == 0 && (setgid(kOtherUser) != 0 || setuid(kOtherUser) != 0)) return;
    for (const int descriptor : options.closedDescriptors)
        close(descriptor);
    execv(program, arguments.data());
}

// Reads both pipes until both are closed. False when the time is over before.
bool CollectOutput(int outputEnd, int errorEnd, long long deadline, Transcript* transcript) {
    pollfd waits[2] = {{outputEnd, POLLIN, 0}, {errorEnd, POLLIN, 0}};
    std::string* const texts[2] = {&transcript->output, &transcript->error};
    while (waits[0].fd >= 0 || waits[1].fd >= 0) {
        const long long left = deadline - NowInMilliseconds();
        if (left <= 0) return false;
        if (poll(waits, 2, static_cast<int>(left)) < 0 && errno != EINTR) return false;
        for (int index = 0; index < 2; ++index) {
            if (waits[index].fd < 0 || waits[index].revents == 0) continue;
            char piece[65'536];
            const ssize_t count = read(waits[index].fd, piece, sizeof(piece));
            if (count > 0)
                texts[index]->append(piece, static_cast<size_t>(count));
            else if (count == 0 || errno != EINTR)
                waits[index].fd = -1;
        }
    }
    return true;
}

int StatusOf(int waitStatus) {
    return WIFSIGNALED(waitStatus) ? kStatusOfSignal + WTERMSIG(waitStatus) : WEXITSTATUS(waitStatus);
}

// A program that closes its output early is waited for until the time is over, and ended then.
int WaitForEnd(pid_t process, long long deadline, long* peakKilobytes) {
    int waitStatus = 0;
    rusage usage = {};
    for (;;) {
        const pid_t ended = wait4(process, &waitStatus, WNOHANG, &usage);
        if (ended == process) {
            if (peakKilobytes) *peakKilobytes = usage.ru_maxrss;
            return StatusOf(waitStatus);
        }
        if (NowInMilliseconds() >= deadline) {
            kill(process, SIGKILL);
            waitpid(process, &waitStatus, 0);
            return kStatusTimedOut;
        }
        const timespec pause = {0, 1'000'000};
        nanosleep(&pause, nullptr);
    }
}

void PrintText(std::ostream& stream, const std::string& text) {
    constexpr size_t kShown = 2'000;
    for (size_t index = 0; index < text.size(); ++index) {
        if (text.size() > 2 * kShown && index == kShown) {
            stream << "\n[... " << text.size() - 2 * kShown << " bytes ...]\n";
            index = text.size() - kShown;
        }
        const unsigned char byte = static_cast<unsigned char>(text[index]);
        const char* const digits = "0123456789abcdef";
        if (byte == '\n' || (byte >= 0x20 && byte < 0x7F))
            stream << text[index];
        else
            stream << "\\x" << digits[byte >> 4] << digits[byte & 15];
    }
}

} // namespace

Transcript RunProgram(const char* program, const std::vector<std::string>& arguments, const RunOptions& options) {
    Transcript transcript{.status = kStatusNotStarted};
    std::vector<char*> list = {const_cast<char*>("Varnex")};
    for (const std::string& argument : arguments)
        list.push_back(const_cast<char*>(argument.c_str()));
    list.push_back(nullptr);

    Pipe output, error;
    if (!output.Open() || !error.Open()) return transcript;
    if (!options.outputFile.empty()) {
        close(output.writeEnd);
        output.writeEnd = open(options.outputFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    }
    if (!options.readsOutput) {
        close(output.readEnd);
        output.readEnd = -1;
    }

    const pid_t process = fork();
    if (process == 0) {
        BecomeProgram(program, list, options, output.writeEnd, error.writeEnd);
        _exit(kStatusNotStarted);
    }
    close(output.writeEnd);
    close(error.writeEnd);
    if (process > 0) {
        const long long deadline = NowInMilliseconds() + options.timeoutSeconds * 1'000LL;
        CollectOutput(output.readEnd, error.readEnd, deadline, &transcript);
        transcript.status = WaitForEnd(process, deadline, options.peakKilobytes);
    }
    if (output.readEnd >= 0) close(output.readEnd);
    close(error.readEnd);
    return transcript;
}

std::ostream& operator<<(std::ostream& stream, const Transcript& transcript) {
    stream << "status " << transcript.status << ", output:\n";
    PrintText(stream, transcript.output);
    if (transcript.error.empty()) return stream;
    stream << "standard error:\n";
    PrintText(stream, transcript.error);
    return stream;
}
