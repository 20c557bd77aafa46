// What the files of the POSIX back end, and of the back end that derives from it, share. Private to them.
#pragma once

#include "PlatformDependent/Linux/RepeatOnInterrupt.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include <sys/stat.h>

constexpr mode_t kNewFileMode = 0666; // before the umask
constexpr mode_t kModeBits = 07777;   // the part of st_mode that chmod takes

// GetStatus follows links; GetLinkStatus describes a link itself. On failure both answer false and set errno.
inline bool GetStatus(const char* path, struct stat* status) {
    return RepeatOnInterrupt([&] { return stat(path, status); }) == 0;
}
inline bool GetLinkStatus(const char* path, struct stat* status) {
    return RepeatOnInterrupt([&] { return lstat(path, status); }) == 0;
}

// The entry's descriptor; -1 when the entry is closed, or its open failed.
int GetDescriptor(const FileEntryData& entry);

// A folder that a recursive listing is inside, linked to the one it was reached from.
struct OpenFolder {
    dev_t device;
    ino_t inode;
    const OpenFolder* outer; // null for the first one

    // Whether status is that of this folder or of one outside it. A listing that entered it again would not end.
    bool IsInside(const struct stat& status) const {
        for (const OpenFolder* folder = this; folder != nullptr; folder = folder->outer)
            if (folder->device == status.st_dev && folder->inode == status.st_ino) return true;
        return false;
    }
};
