#undef _FORTIFY_SOURCE // with it, headers define pread themselves
#include "Tests/Library/SystemFaults.h"

#include <atomic>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <pthread.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

struct Fault {
    std::atomic<const char*> call = nullptr;
    int number = 0;
    int error = 0;
    std::atomic<int> met = 0;
};
constinit Fault s_Faults[4];

// Whether a call is to fail, with errno set.
bool Fails(const char* call) {
    for (Fault& fault : s_Faults) {
        const char* const wanted = fault.call.load();
        if (wanted == nullptr || strcmp(wanted, call) != 0) continue;
        const int met = ++fault.met;
        if (fault.number != 0 && met != fault.number) continue;
        errno = fault.error;
        return true;
    }
    return false;
}

// Whoever started this program may have left descriptors open to it, which would count against FewDescriptors.
[[maybe_unused]] const int s_Closed = close_range(STDERR_FILENO + 1, ~0U, 0);

} // namespace

SystemFault::SystemFault(const FaultDescription& fault) : m_Index(0) {
    while (s_Faults[m_Index].call.load() != nullptr)
        if (++m_Index == 4) abort(); // more faults than a test needs
    s_Faults[m_Index].number = fault.number;
    s_Faults[m_Index].error = fault.error;
    s_Faults[m_Index].met = 0;
    s_Faults[m_Index].call = fault.call;
}

SystemFault::~SystemFault() { s_Faults[m_Index].call = nullptr; }

bool SystemFault::HasStruck() const { return s_Faults[m_Index].met.load() >= s_Faults[m_Index].number; }

extern "C" {

int openat(int folder, const char* path, int flags, ...) {
    mode_t mode = 0;
    va_list arguments;
    va_start(arguments, flags);
    if ((flags & (O_CREAT | O_TMPFILE)) != 0) mode = va_arg(arguments, mode_t);
    va_end(arguments);
    if (Fails((flags & O_TMPFILE) == O_TMPFILE ? "O_TMPFILE" : "openat")) return -1;
    return static_cast<int>(syscall(SYS_openat, folder, path, flags, mode));
}

int mkdir(const char* path, mode_t mode) {
    return Fails("mkdir") ? -1 : static_cast<int>(syscall(SYS_mkdirat, AT_FDCWD, path, mode));
}

int mkdirat(int folder, const char* path, mode_t mode) {
    return Fails("mkdirat") ? -1 : static_cast<int>(syscall(SYS_mkdirat, folder, path, mode));
}

int linkat(int from, const char* path, int to, const char* newPath, int flags) {
    const char* const kind = (flags & AT_EMPTY_PATH) != 0 ? "AT_EMPTY_PATH" : flags == 0 ? "link of a name" : "/proc";
    if (Fails(kind) || Fails("linkat")) return -1;
    return static_cast<int>(syscall(SYS_linkat, from, path, to, newPath, flags));
}

int renameat2(int from, const char* path, int to, const char* newPath, unsigned flags) {
    if ((flags != 0 && Fails("RENAME_NOREPLACE")) || Fails("renameat2")) return -1;
    return static_cast<int>(syscall(SYS_renameat2, from, path, to, newPath, flags));
}

ssize_t pwrite(int file, const void* bytes, size_t size, off_t offset) {
    return Fails("pwrite") ? -1 : syscall(SYS_pwrite64, file, bytes, size, offset);
}

ssize_t pread(int file, void* bytes, size_t size, off_t offset) {
    if (Fails("end of a file")) return 0;
    return Fails("pread") ? -1 : syscall(SYS_pread64, file, bytes, size, offset);
}

int fstatat(int folder, const char* path, struct stat* status, int flags) {
    return Fails("fstatat") ? -1 : static_cast<int>(syscall(SYS_newfstatat, folder, path, status, flags));
}

int fsync(int file) {
    struct stat status = {};
    const bool isFolder = fstat(file, &status) == 0 && S_ISDIR(status.st_mode);
    if ((isFolder && Fails("fsync of a folder")) || Fails("fsync")) return -1;
    return static_cast<int>(syscall(SYS_fsync, file));
}

// A structure has the same name, which the compiler warns of.
int FlockOrFail(int file, int operation) __asm__("flock");
int FlockOrFail(int file, int operation) {
    return Fails("flock") ? -1 : static_cast<int>(syscall(SYS_flock, file, operation));
}

#ifndef VARNEX_UNDER_SANITIZERS
int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*start)(void*), void* given) {
    static const auto s_Real = reinterpret_cast<decltype(&pthread_create)>(dlsym(RTLD_NEXT, "pthread_create"));
    return Fails("pthread_create") ? EAGAIN : s_Real(thread, attributes, start, given);
}
#endif
}
