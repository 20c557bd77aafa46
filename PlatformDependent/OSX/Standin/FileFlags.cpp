// File flags, which this system does not have. They are stored in an extended attribute of the file, as decimal digits.
// Where that can't be written (pipes, devices, disks without extended attributes, read-only files), a table holds them
// until the process ends. The table is looked up first.
#include "PlatformDependent/OSX/Standin/FileFlags.h"

#include "PlatformDependent/OSX/Standin/Faults.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <map>
#include <mutex>
#include <string>
#include <sys/xattr.h>
#include <tuple>
#include <unistd.h>

namespace {

constexpr char kAttribute[] = "user.zarvo.flags";

// Device, inode and time of birth, which tells apart files that get the same inode one after the other.
using FileIdentity = std::tuple<uint32_t, uint32_t, uint64_t, int64_t, uint32_t>;

std::mutex gTableLock;
std::map<FileIdentity, uint32_t> gTable; // guarded by gTableLock

bool IdentityOf(const char* path, FileIdentity* identity) {
    struct statx status;
    if (statx(AT_FDCWD, path, 0, STATX_INO | STATX_BTIME, &status) != 0) return false;
    *identity = {status.stx_dev_major, status.stx_dev_minor, status.stx_ino, status.stx_btime.tv_sec,
                 status.stx_btime.tv_nsec};
    return true;
}

} // namespace

uint32_t FileFlagsOf(const char* path) {
    const int errorBefore = errno;
    const std::lock_guard lock(gTableLock);
    FileIdentity identity;
    uint32_t flags = 0;
    char digits[16] = {};
    if (!gTable.empty() && IdentityOf(path, &identity) && gTable.count(identity) != 0)
        flags = gTable[identity];
    else if (getxattr(path, kAttribute, digits, sizeof(digits) - 1) > 0)
        flags = static_cast<uint32_t>(strtoul(digits, nullptr, 10));
    errno = errorBefore;
    return flags;
}

int PlatformStat(const char* path, PlatformStatus* status) {
    if (stat(path, status) != 0) return -1;
    status->st_flags = FileFlagsOf(path);
    return 0;
}

int chflags(const char* path, uint32_t flags) {
    struct stat status;
    FileIdentity identity;
    if (stat(path, &status) != 0 || !IdentityOf(path, &identity)) return -1;
    const bool allowed = geteuid() == 0 || geteuid() == status.st_uid;
    if (gStandinFaults.chflagsError != 0 || !allowed) {
        errno = gStandinFaults.chflagsError != 0 ? gStandinFaults.chflagsError : EPERM;
        return -1;
    }

    const std::lock_guard lock(gTableLock);
    gTable.erase(identity);
    const std::string digits = std::to_string(flags);
    const bool isStored = flags == 0 ? removexattr(path, kAttribute) == 0 || errno == ENODATA
                                     : setxattr(path, kAttribute, digits.data(), digits.size(), 0) == 0;
    if (!isStored) gTable[identity] = flags; // even 0: the attribute still holds the old flags
    return 0;
}
