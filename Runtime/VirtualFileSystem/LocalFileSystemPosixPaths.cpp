// The POSIX back end's paths and listings: absolute paths, folders of the application and the user, enumeration.
#include "Footing/Process.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <pwd.h>
#include <sys/statvfs.h>
#include <unistd.h>

using core::string_ref;

LocalFileSystemPosix::LocalFileSystemPosix() : m_HomeFolder(kMemLabelPathString) {
    const char* home = getenv("HOME");
    if (home == nullptr)
        if (const passwd* user = getpwuid(getuid())) home = user->pw_dir;
    if (home == nullptr) return;
    m_HomeFolder = home;
    // Without it "~/x" would be "/x".
    if (m_HomeFolder != home) C99Api::Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode_OutOfMemory);
}

core::string LocalFileSystemPosix::ToAbsolute(string_ref path) const {
    if (IsAbsoluteFilePath(path)) return core::string(path, kMemLabelGeneral);
    if (!path.empty() && path[0] == '~') {
        core::string expanded(m_HomeFolder.get_memory_label());
        // Half a path would name something else.
        if (expanded.grow(m_HomeFolder.size() + path.size()) == nullptr) return expanded;
        expanded += m_HomeFolder;
        expanded += path.substr(1);
        return expanded;
    }
    core::string absolute(kMemLabelGeneral);
    (void)GetFileSystem(); // which the folder belongs to
    AppendPathNameImpl(currentDirectory, path, '/', absolute);
    return absolute;
}

bool LocalFileSystemPosix::Parent(const FileEntryData& entry, core::string& parent) const {
    core::string path(entry.path, kMemLabelPathString);
    for (size_t index = 0; index < path.size(); ++index)
        if (path[index] == '\\') path[index] = '/';
    string_ref rest = path;
    while (!rest.empty() && rest[rest.size() - 1] == '/')
        rest = rest.substr(0, rest.size() - 1);
    const size_t separator = rest.rfind('/');
    if (separator == string_ref::npos) return false;
    parent = rest.substr(0, separator);
    return parent.size() == separator;
}

const char* LocalFileSystemPosix::Filename(const FileEntryData& entry) const {
    for (char separator : {'/', '\\'})
        if (const char* last = strrchr(entry.path, separator)) return last + 1;
    return entry.path;
}

core::string LocalFileSystemPosix::GetApplicationPath() const { return core::string(applicationPath); }

core::string LocalFileSystemPosix::GetApplicationFolder() const {
    return core::string(DeleteLastPathNameComponent(GetApplicationPath()));
}

core::string LocalFileSystemPosix::GetApplicationContentsPath() const {
    return AppendPathName(GetApplicationFolder(), "Data");
}

core::string LocalFileSystemPosix::GetApplicationManagedPath() const {
    return AppendPathName(GetApplicationContentsPath(), "Managed");
}

core::string LocalFileSystemPosix::GetUserConfigFolder() const {
    constexpr mode_t kConfigFolderMode = 0700;
    const char* home = getenv("HOME");
    const core::string homeFolder(home != nullptr ? home : "");
    if (homeFolder.empty()) return core::string();
    core::string folder = AppendPathName(homeFolder, ".config/zarvo3d");
    if (!IsDirectoryCreated(folder)) {
        printf_console("Creating user config folder: %s\n", folder.c_str());
        // Without ".config" there is none, and whoever writes there sees it.
        (void)RepeatOnInterrupt([&] { return mkdir(folder.c_str(), kConfigFolderMode); });
    }
    return folder;
}

core::string LocalFileSystemPosix::GetUserAppDataFolder() const { return GetUserConfigFolder(); }

core::string LocalFileSystemPosix::GetUserAppCacheFolder() const {
    core::string folder = GetUserAppDataFolder();
    if (folder.empty()) return folder;
    folder = AppendPathName(folder, "Caches");
    (void)CreateDirectory(folder); // it says itself when it fails
    return folder;
}

bool LocalFileSystemPosix::GetAvailableDiskSpace(const char* path, UInt64& bytes) const {
    struct statvfs status;
    if (RepeatOnInterrupt([&] { return statvfs(path, &status); }) != 0) {
        printf_console("statvfs failed with errno=%d; path was %s\n", errno, path);
        return false;
    }
    bytes = UInt64{status.f_frsize} * UInt64{status.f_bavail};
    return true;
}

bool FlaggedAsSkipped(bool isDirectory, bool isHidden, string_ref name, FileEnumerationFlag flags) {
    constexpr size_t kTemporaryLength = 4;
    const UInt32 byKind = isHidden ? (isDirectory ? kFileEnumerationSkipHiddenFolders : kFileEnumerationSkipHiddenFiles)
                                   : (isDirectory ? kFileEnumerationSkipFolders : kFileEnumerationSkipFiles);
    if ((flags & byKind) != 0) return true;
    if ((flags & kFileEnumerationSkipByName) != 0) {
        if (!name.empty() && (name[0] == '.' || name[name.size() - 1] == '~')) return true;
        if (name.compare("cvs", kCaseInsensitive) == 0) return true;
    }
    return (flags & kFileEnumerationSkipTemporary) != 0 && !isDirectory && name.size() >= kTemporaryLength &&
           name.substr(name.size() - kTemporaryLength).compare(".tmp", kCaseInsensitive) == 0;
}

namespace {

// The folders that a recursive listing is inside, from the innermost out; on the stack of the recursion.
struct OpenFolder {
    dev_t device;
    ino_t inode;
    const OpenFolder* outer;

    bool Contains(const struct stat& status) const {
        for (const OpenFolder* folder = this; folder != nullptr; folder = folder->outer)
            if (folder->device == status.st_dev && folder->inode == status.st_ino) return true;
        return false;
    }
};

// Per thread: the virtual Enumerate that the recursion goes through can't carry it.
thread_local const OpenFolder* gInnermostFolder = nullptr;

// A folder's stream, closed when it goes, and the mark that the listing is inside it.
class FolderStream : private NonCopyable {
public:
    explicit FolderStream(const char* path) {
        do
            m_Stream = opendir(path);
        while (m_Stream == nullptr && errno == EINTR);
        struct stat status = {};
        if (m_Stream != nullptr) (void)fstat(dirfd(m_Stream), &status); // an open folder has a status
        m_Folder = {status.st_dev, status.st_ino, gInnermostFolder};
        gInnermostFolder = &m_Folder;
    }
    ~FolderStream() {
        gInnermostFolder = m_Folder.outer;
        if (m_Stream != nullptr) closedir(m_Stream);
    }

    bool IsOpen() const { return m_Stream != nullptr; }
    bool IsInside(const struct stat& status) const { return m_Folder.Contains(status); }

    // The next name but "." and ".."; null at the end.
    const char* Next() {
        while (const dirent* record = readdir(m_Stream)) {
            const char* name = record->d_name;
            if (strcmp(name, ".") != 0 && strcmp(name, "..") != 0) return name;
        }
        return nullptr;
    }

private:
    DIR* m_Stream;
    OpenFolder m_Folder;
};

// status is null for a dangling link, of which only the name is known.
void Describe(FileEntryInfo& info, string_ref path, const struct stat* status, bool isLink, bool isHidden) {
    strcpy_truncate(info.path, path.data(), sizeof(info.path), path.size());
    UInt32 flags = 0;
    if (isLink) flags |= kFileEntryIsSymLink;
    if (isHidden) flags |= kFileEntryIsHidden;
    if (status != nullptr) {
        info.size = static_cast<UInt64>(status->st_size);
        UnixTimeToZarvoTime(status->st_mtime, info.lastModified);
        if (S_ISDIR(status->st_mode)) flags |= kFileEntryIsDirectory;
        if ((status->st_mode & S_IWUSR) == 0) flags |= kFileEntryIsReadOnly;
    }
    info.flags = static_cast<UInt8>(flags);
}

void AddSize(void** handlerData, UInt64 size) {
    const bool hasCounter = handlerData != nullptr && *handlerData != nullptr;
    if (Check(hasCounter, "Assertion failed on expression: 'handlerData != NULL'"))
        *static_cast<UInt64*>(*handlerData) += size;
}

} // namespace

bool LocalFileSystemPosix::Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                                     void** handlerData, FileEnumerationFlag flags) const {
    constexpr size_t kMaxNameLength = 1024;
    const bool isSumming = (flags & kFileEnumerationSumSizes) != 0;
    if (isSumming)
        AssertImplementation(0, "Runtime/VirtualFileSystem/LocalFileSystemPosix", __LINE__, -1,
                             "Filesystem does not support storing size during enumeration outside of Zarvo Editor.");
    FolderStream folder(path);
    if (!folder.IsOpen()) return false;

    core::string working(kMemLabelGeneral);
    // All at once: where memory is refused later, half a path would be listed. Of a recursion, each folder takes its
    // own.
    if (working.grow(strlen(path) + 1 + kMaxNameLength) == nullptr) return false;
    working = path;
    if (working.back() != '/') working += '/';
    const size_t prefixLength = working.size();
    while (const char* name = folder.Next()) {
        working.resize(prefixLength);
        working.append(name, strnlen(name, kMaxNameLength));
        struct stat linkStatus;
        if (!GetLinkStatus(working.c_str(), &linkStatus)) continue; // removed meanwhile
        const bool isLink = S_ISLNK(linkStatus.st_mode);
        struct stat status = linkStatus;
        const bool hasStatus = !isLink || GetStatus(working.c_str(), &status);
        const bool isFolder = hasStatus && S_ISDIR(status.st_mode);
        const bool isHidden = name[0] == '.';
        if (FlaggedAsSkipped(isFolder, isHidden, name, flags)) continue;
        if (!isSumming)
            Describe(out->emplace_back(), working, hasStatus ? &status : nullptr, isLink, isHidden);
        else
            AddSize(handlerData, hasStatus && !isFolder ? static_cast<UInt64>(status.st_size) : 0);
        if (!isFolder || !recursive || folder.IsInside(status)) continue;
        if (!Enumerate(working.c_str(), out, true, handlerData, flags)) return false;
    }
    return true;
}
