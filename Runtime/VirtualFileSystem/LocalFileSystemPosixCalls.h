// How the POSIX back end, and the one that derives from it, make system calls. Private to their files.
#pragma once

#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include <cerrno>
#include <sys/stat.h>

// Makes a call that answers -1 and EINTR when a signal interrupts it, until it is not interrupted.
template <typename Call>
auto RepeatOnInterrupt(Call call) {
    auto result = call();
    while (result == -1 && errno == EINTR)
        result = call();
    return result;
}

// The status of what path leads to, and of path itself.
inline bool GetStatus(const char* path, struct stat* status) {
    return RepeatOnInterrupt([&] { return stat(path, status); }) == 0;
}
inline bool GetLinkStatus(const char* path, struct stat* status) {
    return RepeatOnInterrupt([&] { return lstat(path, status); }) == 0;
}

// The entry's open descriptor, or -1.
int GetDescriptor(const FileEntryData& entry);
