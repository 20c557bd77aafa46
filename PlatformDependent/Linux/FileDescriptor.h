// Opening and closing of descriptors, each with this system's rule for interruptions. Any thread.
#pragma once

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

// open, repeated while a signal interrupts it. The descriptor is not handed on to programs that this one starts.
// mode is used when flags create a file. -1 and errno on failure.
inline int PlatformOpen(const char* path, int flags, int mode) {
    int descriptor;
    do
        descriptor = ::open(path, flags | O_CLOEXEC, mode);
    while (descriptor == -1 && errno == EINTR);
    return descriptor;
}

// close, where an interrupted close is a success: the descriptor is gone by then, and a second close could meet one
// that another thread has just opened. -1 and errno on any other failure.
inline int PlatformClose(int descriptor) {
    const int result = ::close(descriptor);
    return result == -1 && errno == EINTR ? 0 : result;
}
