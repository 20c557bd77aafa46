#include "Tools/Zarvo/MountSession.h"
#include "Tools/Zarvo/MountedArchive.h"
#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <new>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace {

constexpr int kNotMounted = 2;

// Why a folder can't take a mount; empty where it can.
std::string FindObstacle(const std::string& folder) {
    DIR* const opened = opendir(folder.c_str());
    if (opened == nullptr) return strerror(errno);
    size_t count = 0;
    while (readdir(opened) != nullptr)
        ++count;
    closedir(opened);
    if (count > 2) return strerror(ENOTEMPTY); // there are "." and ".."

    constexpr const char* kDevice = "/dev/fuse";
    const int device = open(kDevice, O_RDWR | O_CLOEXEC);
    if (device < 0) return std::string(kDevice) + ": " + strerror(errno);
    close(device);
    return "";
}

// The options that every mount has, and those that were given. Where they contradict, the last counts.
std::vector<std::string> GetOptions(const Run& run) {
    char* const resolved = realpath(run.GetOperands()[0].c_str(), nullptr);
    std::string source;
    for (const char letter : std::string(resolved != nullptr ? resolved : ""))
        source += letter == ',' || letter == '\\' ? std::string("\\") + letter : std::string(1, letter);
    free(resolved);
    std::vector<std::string> options = {"default_permissions,subtype=zarvo"};
    if (!source.empty()) options.push_back("fsname=" + source);
    for (std::string& given : run.arguments.FindAll(kMountOptions))
        options.push_back(std::move(given));
    options.push_back("ro,max_read=" + std::to_string(MountedArchive::kMaxRead));
    return options;
}

// Whether the mount is to be writable, which libfuse would not mind.
bool AsksForWriting(const Run& run) {
    for (const std::string& given : run.arguments.FindAll(kMountOptions))
        if (("," + given + ",").find(",rw,") != std::string::npos) return true;
    return false;
}

// Mounts, and answers until the mount ends. mounted is called in between.
int Serve(const Run& run, MountSession& session, MountedArchive& archive, unsigned threads,
          const std::function<void()>& mounted) {
    const std::string& folder = run.GetOperands()[1];
    char* const resolved = realpath(folder.c_str(), nullptr); // in the background, the current folder is another one
    std::string reason = resolved == nullptr ? strerror(errno) : "";
    const bool isMounted = resolved != nullptr && session.Mount(resolved, &reason);
    free(resolved);
    if (!isMounted) {
        archive.Say(folder, reason);
        return kNotMounted;
    }
    mounted();
    const int ended = session.Run(threads, [&] { return run.output.HasSignal(); });
    if (ended < 0) archive.Say(folder, strerror(-ended));
    run.done = "unmounting " + folder;
    if (ended > 0) (void)raise(ended); // as if it had come now
    return ended < 0 ? kSomethingWrong : kAllDone;
}

// The process that stays, once it has left the terminal. ready: where it writes a byte when the mount answers.
int ServeInBackground(const Run& run, MountSession& session, MountedArchive& archive, unsigned threads, int ready) {
    archive.SetReady([ready] {
        const char byte = 0;
        (void)!write(ready, &byte, 1);
        close(ready);
    });
    return Serve(run, session, archive, threads, [&] {
        archive.GoToBackground();
        (void)setsid();
        (void)!chdir("/");
        const int null = open("/dev/null", O_RDWR);
        for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO})
            dup2(null, descriptor);
        if (null > STDERR_FILENO) close(null);
    });
}

// Returns when the mount answers, or has failed.
int GoToBackground(const Run& run, MountSession& session, MountedArchive& archive, unsigned threads) {
    const std::string& folder = run.GetOperands()[1];
    int ready[2];
    if (pipe2(ready, O_CLOEXEC) != 0) {
        run.console.Say(folder, strerror(errno));
        return kNotMounted;
    }
    const pid_t process = fork();
    if (process == 0) {
        int status = kNotMounted;
        try {
            status = ServeInBackground(run, session, archive, threads, ready[1]);
        } catch (const std::bad_alloc&) {
            archive.Say(folder, strerror(ENOMEM));
        }
        _exit(status);
    }
    if (process < 0) run.console.Say(folder, strerror(errno));
    close(ready[1]);
    char byte;
    ssize_t count;
    do
        count = process > 0 ? read(ready[0], &byte, 1) : 0;
    while (count < 0 && errno == EINTR && !run.output.HasSignal());
    close(ready[0]);
    if (process > 0 && run.output.HasSignal()) { // which has not come to the other process, or too early to end it
        kill(process, SIGTERM);
        waitpid(process, nullptr, 0);
        run.done = "unmounting " + folder;
    }
    return count == 1 ? kAllDone : kNotMounted;
}

} // namespace

int RunMount(const Run& run) {
    const std::string& folder = run.GetOperands()[1];
    unsigned threads = std::max(std::thread::hardware_concurrency(), 1u);
    if (const std::string* const given = run.arguments.Find(kThreads))
        threads = static_cast<unsigned>(std::stoul(*given));
    MountedArchive archive(run, run.GetOperands()[0]);
    MountSession session(MountedArchive::kOperations, &archive,
                         [&](std::string_view text) { archive.Say(folder, text); });
    std::string complaint = "rw";
    if (AsksForWriting(run) || !session.Open(GetOptions(run), &complaint))
        return RefuseUsage(run.console, kMount,
                           MakeMessage("%: '%' is no option of a mount", {DescribeOption(kMountOptions), complaint}));
    if (!archive.Open(&threads)) return kNoArchive;
    if (const std::string obstacle = FindObstacle(folder); !obstacle.empty()) {
        run.console.Say(folder, obstacle);
        return kNotMounted;
    }
    if (run.output.HasSignal()) {
        run.done = "opening " + run.GetOperands()[0];
        return kSomethingWrong;
    }
    if (run.arguments.Has(kForeground)) return Serve(run, session, archive, threads, [] {});
    return GoToBackground(run, session, archive, threads);
}
