// The POSIX back end's operations on whole files and folders: creation, deletion, locks, moves and copies.
#include "PlatformDependent/Linux/FileDescriptor.h"
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

using core::string_ref;

constexpr mode_t kNewFolderMode = 0755;

bool LocalFileSystemPosix::CreateAsDir(FileEntryData& entry) {
    const int result = RepeatOnInterrupt([&] { return mkdir(entry.path, kNewFolderMode); });
    entry.lastError = FileSystemErrorFromErrno(result == 0 ? 0 : errno);
    return result == 0;
}

bool LocalFileSystemPosix::CreateAsFile(FileEntryData& entry) {
    if (Exists(entry)) return false;
    return FileDescriptor(PlatformOpen(entry.path, O_WRONLY | O_CREAT | O_TRUNC, kNewFileMode)).IsOpen();
}

static bool IsSameFile(const char* a, const char* b) {
    struct stat statusA;
    struct stat statusB;
    return GetStatus(a, &statusA) && GetStatus(b, &statusB) && statusA.st_dev == statusB.st_dev &&
           statusA.st_ino == statusB.st_ino;
}

namespace {

// Tells whether an entry made from a listed path still names a child of the folder. It may not: a listing can spell the
// folder's path differently or cut it, and an entry turns backslashes into separators, so a file named "..\x" would
// lead out of the folder.
class ChildTest {
public:
    explicit ChildTest(const char* folder) : m_Folder(folder) {}

    // The text of path must stay valid until the next call.
    bool IsChild(string_ref path) {
        const size_t nameStart = path.rfind('/') + 1; // 0 without a "/"
        const string_ref name = path.substr(nameStart);
        const string_ref parent = path.substr(0, nameStart);
        if (name.empty() || name.find('\\') != string_ref::npos) return false;
        // All children of a listing have the same parent: ask the disk once.
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
    string_ref m_Parent; // compared last
    bool m_IsParentFolder = false;
};

} // namespace

bool LocalFileSystemPosix::Delete(FileEntryData& entry, bool recursive) {
    if (!IsDir(entry)) return RepeatOnInterrupt([&] { return unlink(entry.path); }) == 0;
    // The system follows a link to a folder when the path ends in "/": look at the path without it.
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
        // The next Lock would take the failed open's cell for an open file.
        (void)Close(entry);
        return false;
    }
    if (RepeatOnInterrupt([&] { return flock(GetDescriptor(entry), mode | LOCK_NB); }) == 0) return true;
    (void)Close(entry); // the lock failed either way
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
    bool isLocked = true; // a file that can't be opened counts as in use
    if (Open(copy, kFilePermissionRead, kFileAutoBehaviorNone)) {
        const int descriptor = GetDescriptor(copy);
        isLocked = RepeatOnInterrupt([&] { return flock(descriptor, LOCK_EX | LOCK_NB); }) != 0;
        (void)RepeatOnInterrupt([&] { return flock(descriptor, LOCK_UN | LOCK_NB); }); // Close unlocks too
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
    // Opening the target empties it: the source must be another file.
    if (IsSameFile(from.path, to.path)) return false;
    FileSystemEntry sourceEntry{string_ref(from.path)};
    FileAccessor source;
    FileAccessor target;
    if (!source.Open(sourceEntry, kFilePermissionRead)) return false;
    if (!target.Open(to.path, kFilePermissionWrite)) return false;

    const UInt64 size = source.Size().Cast<UInt64>();
    dynamic_array<UInt8> buffer(kMemLabelGeneral);
    if (!buffer.resize_uninitialized(static_cast<size_t>(std::min(size, kTransferSize)), kResizeExact)) return false;
    UInt64 total = 0;
    while (total < size) {
        UInt64 count = 0;
        UInt64 written = 0;
        if (!source.Read(buffer.size(), buffer.data(), &count)) return false;
        if (!target.Write(count, buffer.data(), &written) || written != count) return false;
        total += written;
    }
    return total == size && SynchronizeMode(from, to); // more than size: the source grew meanwhile
}
