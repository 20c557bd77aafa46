// Runs a command and prints what it cost: Measure COMMAND [ARGUMENT...]
//
// Prints one line: wall, user and system seconds, the peak of resident memory in KiB, and the exit status. The
// command's output is discarded. A small program measures this because a process's reported peak is at least that of
// the process that it was forked from.
#include <cstdio>
#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

static double Seconds(const timeval& time) { return double(time.tv_sec) + double(time.tv_usec) / 1e6; }

static double Now() {
    timespec time;
    clock_gettime(CLOCK_MONOTONIC, &time);
    return double(time.tv_sec) + double(time.tv_nsec) / 1e9;
}

int main(int argumentCount, char** arguments) {
    if (argumentCount < 2) return 2;
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 1, "/dev/null", O_WRONLY, 0);
    posix_spawn_file_actions_addopen(&actions, 2, "/dev/null", O_WRONLY, 0);

    const double start = Now();
    pid_t child;
    int status;
    rusage usage;
    if (posix_spawnp(&child, arguments[1], &actions, nullptr, arguments + 1, environ) != 0 ||
        wait4(child, &status, 0, &usage) != child) {
        fprintf(stderr, "Measure: can't run %s\n", arguments[1]);
        return 1;
    }
    const double wall = Now() - start;
    printf("%.6f %.6f %.6f %ld %d\n", wall, Seconds(usage.ru_utime), Seconds(usage.ru_stime), usage.ru_maxrss,
           WIFEXITED(status) ? WEXITSTATUS(status) : -1);
    return 0;
}
