// The POSIX back end's paths: absolute paths, parents, and the folders of the application and the user.
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <cstdlib>
#include <cstring>
#include <pwd.h>
#include <sys/statvfs.h>
#include <unistd.h>

using core::string_ref;

LocalFileSystemPosix::LocalFileSystemPosix() : m_HomeFolder(kMemLabelPathString) {
    const char* home = getenv("HOME");
    if (home == nullptr)
        if (const passwd* user = getpwuid(getuid())) home = user->pw_dir;
    if (home == nullptr) return;
    RequireMemory(m_HomeFolder.grow(strlen(home)));
    m_HomeFolder = home;
}

core::string LocalFileSystemPosix::ToAbsolute(string_ref path) const {
    const bool isAbsolute = IsAbsoluteFilePath(path);
    const bool isBelowHome = !isAbsolute && path.starts_with("~");
    string_ref base;
    if (isBelowHome) base = m_HomeFolder;
    if (!isAbsolute && !isBelowHome) {
        (void)GetFileSystem(); // the current directory belongs to it
        base = currentDirectory;
    }
    core::string absolute(isBelowHome ? m_HomeFolder.get_memory_label() : MemLabelId(kMemLabelGeneral));
    RequireMemory(absolute.grow(base.size() + 1 + path.size())); // part of a path would name something else
    if (isBelowHome) {
        absolute += base;
        absolute += path.substr(1); // "~x" is the home folder's own path followed by "x"
    } else {
        AppendPathNameImpl(base, path, '/', absolute);
    }
    return absolute;
}

bool LocalFileSystemPosix::Parent(const FileEntryData& entry, core::string& parent) const {
    char path[kPathBufferSize];
    strcpy_truncate(path, entry.path, sizeof(path), strlen(entry.path));
    ConvertSeparatorsToZarvo(path);
    string_ref rest(path);
    while (!rest.empty() && rest.back() == '/')
        rest = rest.substr(0, rest.size() - 1);
    const size_t separator = rest.rfind('/');
    if (separator == string_ref::npos) return false;
    RequireMemory(parent.grow(separator));
    parent = rest.substr(0, separator);
    return true;
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
        // Fails when ".config" is missing; writing to the folder then fails too.
        (void)RepeatOnInterrupt([&] { return mkdir(folder.c_str(), kConfigFolderMode); });
    }
    return folder;
}

core::string LocalFileSystemPosix::GetUserAppDataFolder() const { return GetUserConfigFolder(); }

core::string LocalFileSystemPosix::GetUserAppCacheFolder() const {
    core::string folder = GetUserAppDataFolder();
    if (folder.empty()) return folder;
    folder = AppendPathName(folder, "Caches");
    (void)CreateDirectory(folder); // prints its own failure
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
