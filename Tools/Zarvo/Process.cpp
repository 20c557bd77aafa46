#include "Tools/Zarvo/Process.h"

#include "Tools/Zarvo/Command.h"

#include <atomic>
#include <csignal>
#include <unistd.h>

namespace {

std::atomic<int> g_Signal = 0;
static_assert(std::atomic<int>::is_always_lock_free); // a signal handler stores it

// The first signal asks the run to end, and a second one ends the process at once. One that was ignored stays so.
void CatchSignals() {
    struct sigaction action = {};
    action.sa_handler = [](int signal) { g_Signal = signal; };
    action.sa_flags = static_cast<int>(SA_RESETHAND); // without SA_RESTART: a write that waits returns
    for (int signal : {SIGINT, SIGTERM}) {
        struct sigaction before = {};
        if (sigaction(signal, nullptr, &before) == 0 && before.sa_handler != SIG_IGN)
            sigaction(signal, &action, nullptr);
    }
}

} // namespace

int RunProcess(int argumentCount, char** arguments) {
    CatchSignals();
    // So that writes that can go no further return: to a pipe that nobody reads, or past the limit of a file's size.
    const bool isPipeSignalIgnored = signal(SIGPIPE, SIG_IGN) == SIG_IGN;
    (void)signal(SIGXFSZ, SIG_IGN);

    World world;
    if (argumentCount > 0) world.arguments.assign(arguments + 1, arguments + argumentCount);
    world.input = STDIN_FILENO;
    world.output = STDOUT_FILENO;
    world.error = STDERR_FILENO;
    world.isOutputTerminal = isatty(STDOUT_FILENO) == 1;
    world.isErrorTerminal = isatty(STDERR_FILENO) == 1;
    world.signal = &g_Signal;
    const Ending ending = RunZarvo(world);

    if (ending.signal != 0 && !(ending.signal == SIGPIPE && isPipeSignalIgnored)) {
        signal(ending.signal, SIG_DFL);
        raise(ending.signal);
    }
    return ending.status;
}
