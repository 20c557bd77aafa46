// The POSIX back end's operations on whole files and folders: attributes, deletion, locks, moves, copies.
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sys/file.h>
#include <unistd.h>
#include <utime.h>

using core::string_ref;

constexpr mode_t kAllWriteBits = S_IWUSR | S_IWGRP | S_IWOTH;
constexpr mode_t kModeBits = 07777;

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
    // No file is hidden here, which is told unasked.
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

static bool IsSameFile(const char* a, const char* b) {
    struct stat statusA;
    struct stat statusB;
    return GetStatus(a, &statusA) && GetStatus(b, &statusB) && statusA.st_dev == statusB.st_dev &&
           statusA.st_ino == statusB.st_ino;
}

namespace {

// Tells whether a listed path names something in the folder, also after an entry has taken it over: a listing may write
// the folder's path in another way or cut it, and an entry takes a backslash for a separator, so that the name "..\x"
// would lead out.
class ChildTest {
public:
    explicit ChildTest(const char* folder) : m_Folder(folder) {}

    // path must stay as it is until the next call.
    bool IsChild(string_ref path) {
        const size_t nameStart = path.rfind('/') + 1; // 0 without a "/"
        const string_ref name = path.substr(nameStart);
        const string_ref parent = path.substr(0, nameStart);
        if (name.empty() || name.find('\\') != string_ref::npos) return false;
        // A listing writes the same parent for all that it lists: the disk is asked once.
        if (!m_IsKnown || m_Parent != parent) {
            m_IsKnown = true;
            m_Parent = parent;
            m_IsParentFolder =
                IsSameFile(parent.empty() ? "." : core::string(parent, kMemLabelGeneral).c_str(), m_Folder);
        }
        return m_IsParentFolder;
    }

private:
    const char* m_Folder;
    bool m_IsKnown = false;
    string_ref m_Parent; // the one that was compared last
    bool m_IsParentFolder = false;
};

} // namespace

bool LocalFileSystemPosix::Delete(FileEntryData& entry, bool recursive) {
    if (!IsDir(entry)) return RepeatOnInterrupt([&] { return unlink(entry.path); }) == 0;
    // With a slash at its end, the system takes a link to a folder for the folder.
    size_t length = strlen(entry.path);
    while (length > 1 && entry.path[length - 1] == '/')
        --length;
    const FileSystemEntry bare(string_ref(entry.path, length));
    if (IsSymLink(bare)) return RepeatOnInterrupt([&] { return unlink(bare.path); }) == 0;
    if (recursive) {
        dynamic_block_array<FileEntryInfo, 32> children(kMemLabelFileList);
        (void)Enumerate(entry.path, &children, false, nullptr, kFileEnumerationAll); // rmdir tells what is left
        ChildTest test(entry.path);
        for (size_t index = 0; index < children.size(); ++index) {
            const string_ref path(children[index].path);
            if (!test.IsChild(path)) continue;
            FileSystemEntry child(path);
            (void)child.handler->Delete(child, true); // rmdir tells what is left
        }
    }
    return RepeatOnInterrupt([&] { return rmdir(entry.path); }) == 0;
}

bool LocalFileSystemPosix::Target(const FileEntryData& entry, FileSystemEntry& target) const {
    constexpr size_t kMaxTargetLength = 1023;
    char* resolved = realpath(entry.path, nullptr);
    if (resolved == nullptr) return false;
    const bool fits = strlen(resolved) <= kMaxTargetLength;
    if (fits) target.Set(resolved);
    free(resolved);
    return fits;
}

bool LocalFileSystemPosix::Lock(FileEntryData& entry, FileLockMode mode) {
    if (mode == kFileLockUnlock) {
        if (entry.handlerState == nullptr) return false;
        if (RepeatOnInterrupt([&] { return flock(GetDescriptor(entry), LOCK_UN); }) != 0) return false;
        return Close(entry);
    }
    if (entry.handlerState == nullptr && !Open(entry, kFilePermissionReadWrite, kFileAutoBehaviorLock)) {
        // The cell of the failed open would be taken for an open file at the next try.
        (void)Close(entry);
        return false;
    }
    if (RepeatOnInterrupt([&] { return flock(GetDescriptor(entry), mode | LOCK_NB); }) == 0) return true;
    (void)Close(entry); // the lock is not had, whatever this says
    return false;
}

bool LocalFileSystemPosix::IsLocked(const FileEntryData& entry) {
    if (IsDirectoryCreated(entry.path)) {
        FolderContents contents;
        GetFolderContentsAtPath(entry.path, kFileEnumerationAll, contents, kFolderContentsRelativeToCurrentDirectory,
                                core::string(kMemLabelPathString), false);
        return std::any_of(contents.begin(), contents.end(),
                           [](const core::string& path) { return IsFileOrDirectoryInUse(path); });
    }
    if (!IsFileCreated(entry.path)) return false;

    FileSystemEntry copy(entry);
    bool isLocked = true; // what can't be opened counts as in use
    if (Open(copy, kFilePermissionRead, kFileAutoBehaviorNone)) {
        const int descriptor = GetDescriptor(copy);
        isLocked = RepeatOnInterrupt([&] { return flock(descriptor, LOCK_EX | LOCK_NB); }) != 0;
        (void)RepeatOnInterrupt([&] { return flock(descriptor, LOCK_UN | LOCK_NB); }); // closing would do it too
    }
    (void)Close(copy); // opened for reading: nothing is lost
    return isLocked;
}

bool LocalFileSystemPosix::AtomicMove(FileEntryData& from, FileEntryData& to) {
    const core::string oldPath = ToAbsolute(from.path);
    const core::string newPath = ToAbsolute(to.path);
    const int result = RepeatOnInterrupt([&] { return rename(oldPath.c_str(), newPath.c_str()); });
    from.lastError = FileSystemErrorFromErrno(result == 0 ? 0 : errno);
    return result == 0;
}

bool LocalFileSystemPosix::SynchronizeMode(const FileEntryData& from, const FileEntryData& to) {
    struct stat status;
    if (!GetStatus(from.path, &status)) {
        from.lastError = FileSystemErrorFromErrno(errno);
        return false;
    }
    if (RepeatOnInterrupt([&] { return chmod(to.path, status.st_mode & kModeBits); }) != 0) {
        to.lastError = FileSystemErrorFromErrno(errno);
        return false;
    }
    return true;
}

bool LocalFileSystemPosix::Copy(FileEntryData& from, FileEntryData& to) {
    constexpr UInt64 kTransferSize = 65'536;
    // Opened to write, the file would be emptied before it is read.
    if (IsSameFile(from.path, to.path)) return false;
    FileSystemEntry sourceEntry{string_ref(from.path)};
    FileAccessor source;
    FileAccessor target;
    if (!source.Open(sourceEntry, kFilePermissionRead)) return false;
    if (!target.Open(to.path, kFilePermissionWrite)) return false;

    const UInt64 size = source.Size().Cast<UInt64>();
    dynamic_array<UInt8> buffer(kMemLabelGeneral);
    buffer.resize_uninitialized(static_cast<size_t>(std::min(size, kTransferSize)), kResizeExact);
    UInt64 total = 0;
    while (total < size) {
        UInt64 count = 0;
        UInt64 written = 0;
        if (!source.Read(buffer.size(), buffer.data(), &count)) return false;
        if (!target.Write(count, buffer.data(), &written) || written != count) return false;
        total += written;
    }
    return total == size && SynchronizeMode(from, to); // not if it grew meanwhile
}
