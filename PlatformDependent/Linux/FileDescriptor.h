// Opens and closes descriptors by this system's rules for interrupted calls, and owns one:
//
//   const FileDescriptor file(PlatformOpen(path, O_RDONLY, 0));
//   if (!file.IsOpen()) return false; // errno says why
//   read(file.Get(), buffer, size);   // closed on every way out
//
// The functions may be called from any thread; an owner belongs to one thread at a time.
#pragma once

#include "Runtime/Core/NonCopyable.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

// open, repeated while a signal interrupts it. Programs started later don't inherit the descriptor. mode applies when
// flags create a file. Returns -1 and sets errno on failure.
inline int PlatformOpen(const char* path, int flags, int mode) {
    int descriptor;
    do
        descriptor = ::open(path, flags | O_CLOEXEC, mode);
    while (descriptor == -1 && errno == EINTR);
    return descriptor;
}

// close, where an interrupted close is a success: the descriptor is gone by then, and a second close could hit one that
// another thread has just opened. Returns -1 and sets errno on any other failure.
inline int PlatformClose(int descriptor) {
    const int result = ::close(descriptor);
    return result == -1 && errno == EINTR ? 0 : result;
}

// Owns a descriptor and closes it when destroyed.
class FileDescriptor : private NonCopyable {
public:
    static constexpr int kNone = -1;

    // Takes over value; kNone, as a failed PlatformOpen returns it, owns nothing.
    explicit FileDescriptor(int value) : m_Value(value) {}

    // The result of this close is lost: an owner that must know it calls Release and PlatformClose.
    ~FileDescriptor() {
        if (IsOpen()) (void)PlatformClose(m_Value);
    }

    bool IsOpen() const { return m_Value != kNone; }
    int Get() const { return m_Value; }

    // Hands the descriptor to the caller, who must close it.
    [[nodiscard]] int Release() {
        const int value = m_Value;
        m_Value = kNone;
        return value;
    }

private:
    int m_Value;
};
