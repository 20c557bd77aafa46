#include "Runtime/Utilities/FileUtilities.h"

#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

using core::string_ref;

core::string PathToAbsolutePath(string_ref path) { return GetFileSystem()->ToAbsolute(path); }

bool IsDirectoryCreated(string_ref path) { return FileSystemEntry(PathToAbsolutePath(path)).FolderExists(); }
bool IsFileCreated(string_ref path) { return !path.empty() && FileSystemEntry(PathToAbsolutePath(path)).IsFile(); }
bool IsPathCreated(string_ref path) { return !path.empty() && FileSystemEntry(PathToAbsolutePath(path)).Exists(); }

bool CreateDirectory(string_ref path) {
    // Bits that mean something to the engine alone; the back ends here ignore them.
    constexpr UInt32 kNewFolderFlagsMask = 0x0B;
    constexpr UInt32 kNewFolderFlags = 0x02;

    const core::string absolute = PathToAbsolutePath(path);
    if (absolute.empty()) return true;
    FileSystemEntry entry(absolute);
    FileEntryInfo info;
    const FileEntryInfoQueryFlags answer =
        entry.GetFileEntryInfo(info, kFileEntryQueryExists | kFileEntryQueryDirectory);
    if ((answer & kFileEntryQueryExists) != 0) return (info.flags & kFileEntryIsDirectory) != 0;

    if (entry.CreateAsDir()) {
        (void)entry.SetFlags(kNewFolderFlagsMask, kNewFolderFlags); // the folder exists either way
        return true;
    }
    const core::string error = GetFileSystem()->LastErrorMessage(); // now: the next call may change it
    // Another process may have made it meanwhile.
    if (entry.lastError == kFileSystemErrorAlreadyExists && entry.IsDir()) return true;
    printf_console("CreateDirectory '%s' failed: %s (current dir: %s)\n", absolute.c_str(), error.c_str(),
                   GetFileSystem()->CurrentDirectory().c_str());
    return false;
}

bool CreateDirectoryRecursive(string_ref path) {
    if (!path.empty()) {
        const string_ref parent = DeleteLastPathNameComponent(path);
        if (!IsDirectoryCreated(parent) && !CreateDirectoryRecursive(parent)) return false;
    }
    return CreateDirectory(path);
}

bool DeleteFileOrDirectory(string_ref path) {
    const core::string absolute = PathToAbsolutePath(path);
    // A longer path would be cut, and name something else.
    return absolute.size() <= kMaxPathLength && GetFileSystem()->Delete(absolute, true);
}

bool IsFileOrDirectoryInUse(string_ref path) { return FileSystemEntry(path).IsLocked(); }

bool GetFolderContentsAtPath(string_ref path, FileEnumerationFlag flags, FolderContents& out,
                             FolderContentsPathMode mode, const core::string& base, bool recursive) {
    FileSystemEntry entry(PathToAbsolutePath(path));
    dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
    (void)GetFileSystem()->Enumerate(entry.Path(), &list, recursive,
                                     flags); // a failed listing counts as far as it went
    const core::string currentDirectory = GetFileSystem()->CurrentDirectory();
    for (size_t index = 0; index < list.size(); ++index) {
        const string_ref listed(list[index].path);
        if (mode == kFolderContentsAbsolute)
            out.insert(core::string(listed, kMemLabelGeneral));
        else if (mode == kFolderContentsRelativeToBase)
            out.insert(core::string(SkipPathPrefix(listed, base, true, kCaseSensitive), kMemLabelGeneral));
        else if (mode == kFolderContentsRelativeToCurrentDirectory)
            out.insert(core::string(SkipPathPrefix(listed, currentDirectory, true, kCaseSensitive), kMemLabelGeneral));
    }
    return true;
}

bool GetFolderContentsAtPath(string_ref path, FolderContents& out, FolderContentsPathMode mode,
                             const core::string& base, bool recursive) {
    return GetFolderContentsAtPath(path, kFileEnumerationAll, out, mode, base, recursive);
}
