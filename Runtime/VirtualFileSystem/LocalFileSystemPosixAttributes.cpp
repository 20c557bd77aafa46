// The POSIX back end's attributes: kinds, times, rights and the query for several of them.
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"

#include <cstdio>
#include <unistd.h>
#include <utime.h>

constexpr mode_t kAllWriteBits = S_IWUSR | S_IWGRP | S_IWOTH;

bool LocalFileSystemPosix::Exists(const FileEntryData& entry) const {
    return RepeatOnInterrupt([&] { return access(entry.path, F_OK); }) == 0;
}

bool LocalFileSystemPosix::IsDir(const FileEntryData& entry) const {
    struct stat status;
    return GetStatus(entry.path, &status) && S_ISDIR(status.st_mode);
}

bool LocalFileSystemPosix::IsFile(const FileEntryData& entry) const {
    struct stat status;
    return GetStatus(entry.path, &status) && !S_ISDIR(status.st_mode);
}

bool LocalFileSystemPosix::IsHidden(const FileEntryData&) const { return false; }

bool LocalFileSystemPosix::IsSymLink(const FileEntryData& entry) const {
    struct stat status;
    return GetLinkStatus(entry.path, &status) && S_ISLNK(status.st_mode);
}

bool LocalFileSystemPosix::IsReadOnly(const FileEntryData& entry) const {
    struct stat status;
    return GetLinkStatus(entry.path, &status) && (status.st_mode & S_IWUSR) == 0;
}

DateTime LocalFileSystemPosix::LastModified(const FileEntryData& entry) const {
    DateTime time;
    struct stat status;
    if (GetStatus(entry.path, &status)) UnixTimeToZarvoTime(status.st_mtime, time);
    return time;
}

bool LocalFileSystemPosix::SetFlags(FileEntryData&, UInt32, UInt32) { return true; }

bool LocalFileSystemPosix::SetReadOnly(FileEntryData& entry, bool readOnly) {
    struct stat status;
    if (!GetLinkStatus(entry.path, &status)) return false;
    const mode_t old = status.st_mode & kModeBits;
    const mode_t mode = readOnly ? old & ~kAllWriteBits : old | S_IWUSR;
    return RepeatOnInterrupt([&] { return chmod(entry.path, mode); }) == 0;
}

bool LocalFileSystemPosix::Touch(FileEntryData& entry) {
    return RepeatOnInterrupt([&] { return utime(entry.path, nullptr); }) == 0;
}

bool LocalFileSystemPosix::SetFileTimeStamp(FileEntryData& entry, const DateTime& time) {
    long seconds;
    ZarvoTimeToUnixTime(time, seconds);
    const utimbuf times{seconds, seconds};
    return RepeatOnInterrupt([&] { return utime(entry.path, &times); }) == 0;
}

FileEntryInfoQueryFlags LocalFileSystemPosix::GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                                               FileEntryInfoQueryFlags query) const {
    constexpr UInt32 kStatusQueries = kFileEntryQuerySize | kFileEntryQueryDirectory | kFileEntryQuerySymLink |
                                      kFileEntryQueryLastModified | kFileEntryQueryReadOnly;
    static_assert(kStatusQueries == 0x334);

    const bool isExistenceAsked = (query & kFileEntryQueryExists) != 0;
    if (isExistenceAsked && !Exists(entry)) return kFileEntryQueryNone;
    // Always answered: POSIX has no hidden files.
    info.flags = static_cast<UInt8>(info.flags & ~kFileEntryIsHidden);
    const FileEntryInfoQueryFlags base =
        kFileEntryQueryHidden | (isExistenceAsked ? kFileEntryQueryExists : kFileEntryQueryNone);
    struct stat status;
    if ((query & kStatusQueries) == 0 || !GetStatus(entry.path, &status)) return base;
    return base | GetFileEntryInfo(entry, status, info, query);
}

static void SetFlag(FileEntryInfo& info, FileEntryFlags flag, bool isSet) {
    info.flags = static_cast<UInt8>(isSet ? info.flags | flag : info.flags & ~flag);
}

FileEntryInfoQueryFlags LocalFileSystemPosix::GetFileEntryInfo(const FileEntryData& entry, const struct stat& status,
                                                               FileEntryInfo& info,
                                                               FileEntryInfoQueryFlags query) const {
    FileEntryInfoQueryFlags answer = kFileEntryQueryDirectory | kFileEntryQuerySize | kFileEntryQueryLastModified;
    SetFlag(info, kFileEntryIsDirectory, S_ISDIR(status.st_mode));
    const bool isLinkAsked = (query & kFileEntryQuerySymLink) != 0;
    const bool isReadOnlyAsked = (query & kFileEntryQueryReadOnly) != 0;
    struct stat linkStatus;
    if ((isLinkAsked || isReadOnlyAsked) && GetLinkStatus(entry.path, &linkStatus)) {
        if (isLinkAsked) {
            SetFlag(info, kFileEntryIsSymLink, S_ISLNK(linkStatus.st_mode));
            answer = answer | kFileEntryQuerySymLink;
        }
        if (isReadOnlyAsked) {
            SetFlag(info, kFileEntryIsReadOnly, (status.st_mode & S_IWUSR) == 0);
            answer = answer | kFileEntryQueryReadOnly;
        }
    }
    UnixTimeToZarvoTime(status.st_mtime, info.lastModified);
    info.size = static_cast<UInt64>(status.st_size);
    return answer;
}
