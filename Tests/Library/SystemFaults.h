// Lets system calls of the library fail in a test: this program's own functions of their names come before the C
// library's, and call the system unless a fault is wanted. One test's; any thread may call them meanwhile.
//
//   const SystemFault fault({.call = "openat", .number = 3, .error = EMFILE});   // the third openat from now on fails
//   const SystemFault fault({.call = "O_TMPFILE", .error = EOPNOTSUPP});         // every one fails
#pragma once

#include "Runtime/Core/NonCopyable.h"

#include <cerrno>
#include <gtest/gtest.h>
#include <sys/resource.h>

// The sanitizers have some of the functions themselves, and a program must not replace those.
#if defined(__has_feature)
#if __has_feature(thread_sanitizer) || __has_feature(address_sanitizer)
#define VARNEX_UNDER_SANITIZERS
#endif
#endif

struct FaultDescription {
    const char* call = ""; // openat, fstatat, mkdir, mkdirat, linkat, renameat2, pread, pwrite, fsync, flock,
                           // pthread_create (not under sanitizers); or a kind of one: O_TMPFILE, AT_EMPTY_PATH,
                           // RENAME_NOREPLACE, "link of a name", "/proc", "fsync of a folder"; or "end of a file",
                           // which a pread meets
    int number = 0;        // which call from now on, from 1; 0: every one
    int error = EIO;
};

class SystemFault : private NonCopyable {
public:
    explicit SystemFault(const FaultDescription& fault); // several may be there at once
    ~SystemFault();

    bool HasStruck() const;

private:
    int m_Index;
};

// While it is there, the process may have so many descriptors open.
class FewDescriptors : private NonCopyable {
public:
    explicit FewDescriptors(rlim_t count) {
        EXPECT_EQ(0, getrlimit(RLIMIT_NOFILE, &m_Before));
        const rlimit few = {count, m_Before.rlim_max};
        EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &few));
    }
    ~FewDescriptors() { EXPECT_EQ(0, setrlimit(RLIMIT_NOFILE, &m_Before)); }

private:
    rlimit m_Before = {};
};
