/* The process is the same after the library as before it, and has printed nothing: Untouched SAMPLES LIBRARY */
#include "Exercise.h"

#include <fcntl.h>
#include <locale.h>
#include <signal.h>
#include <stdbool.h>
#include <sys/stat.h>
#include <unistd.h>

enum { kDescriptors = 256 };

struct Process {
    struct {
        void (*handler)(int);
        int flags;
        bool isBlocked;
    } signals[NSIG];
    char locale[1000];
    char folder[4096];
    char* variables[1000];
    char values[100000]; /* of the variables */
    mode_t mask;
    int descriptors[kDescriptors];
};

static struct Process* Look(void) {
    struct Process* const process = (struct Process*)calloc(1, sizeof(*process));
    sigset_t blocked;
    CHECK(sigprocmask(SIG_SETMASK, NULL, &blocked) == 0);
    for (int signal = 1; signal < NSIG; ++signal) {
        struct sigaction action;
        if (sigaction(signal, NULL, &action) != 0) continue; /* the C library's own */
        process->signals[signal].handler = action.sa_handler;
        process->signals[signal].flags = action.sa_flags;
        process->signals[signal].isBlocked = sigismember(&blocked, signal) == 1;
    }
    snprintf(process->locale, sizeof(process->locale), "%s", setlocale(LC_ALL, NULL));
    CHECK(getcwd(process->folder, sizeof(process->folder)) != NULL);
    size_t length = 0;
    for (int index = 0; environ[index] != NULL; ++index) {
        CHECK(index < 1000 && strlen(environ[index]) < sizeof(process->values) - length);
        process->variables[index] = environ[index];
        length += (size_t)sprintf(process->values + length, "%s", environ[index]) + 1;
    }
    process->mask = umask(0);
    umask(process->mask);
    for (int descriptor = 0; descriptor < kDescriptors; ++descriptor)
        process->descriptors[descriptor] = fcntl(descriptor, F_GETFL);
    return process;
}

static int s_Errors;    /* the standard error that was */
static FILE* s_Printed; /* what goes to both outputs instead */

static void ShowPrinted(void) {
    char text[4096];
    rewind(s_Printed);
    text[fread(text, 1, sizeof(text) - 1, s_Printed)] = '\0';
    dprintf(s_Errors, "%s", text);
}

static void CatchOutput(void) {
    s_Errors = dup(STDERR_FILENO);
    s_Printed = tmpfile();
    CHECK(s_Printed != NULL && atexit(ShowPrinted) == 0);
    CHECK(dup2(fileno(s_Printed), STDOUT_FILENO) == STDOUT_FILENO);
    CHECK(dup2(fileno(s_Printed), STDERR_FILENO) == STDERR_FILENO);
}

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 3);
    CHECK(setlocale(LC_ALL, "C.UTF-8") != NULL);
    CHECK(signal(SIGPIPE, SIG_IGN) != SIG_ERR);
    CatchOutput();
    struct Process* const before = Look();

    const struct Library library = Load(dlopen(arguments[2], RTLD_NOW));
    ExerciseAll(&library, arguments[1]);
    CHECK(dlclose(library.loaded) == 0);

    struct Process* const after = Look();
    fflush(NULL);
    struct stat printed;
    CHECK(fstat(STDOUT_FILENO, &printed) == 0);
    CHECK(printed.st_size == 0);
    CHECK(memcmp(before->signals, after->signals, sizeof(before->signals)) == 0);
    CHECK(strcmp(before->locale, after->locale) == 0);
    CHECK(strcmp(before->folder, after->folder) == 0);
    CHECK(memcmp(before->variables, after->variables, sizeof(before->variables)) == 0);
    CHECK(memcmp(before->values, after->values, sizeof(before->values)) == 0);
    CHECK(before->mask == after->mask);
    CHECK(memcmp(before->descriptors, after->descriptors, sizeof(before->descriptors)) == 0);
    free(before);
    free(after);
    return 0;
}
