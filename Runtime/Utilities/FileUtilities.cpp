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
    // Bits of the embedding application; the back ends here give them no meaning.
    constexpr UInt32 kNewFolderFlagsMask = 0x0B;
    constexpr UInt32 kNewFolderFlags = 0x02;

    bool isLocal;
    const core::string absolute = GetFileSystem()->ToAbsolute(path, &isLocal);
    // Of any other path the local back end leaves nothing only when memory is refused.
    if (absolute.empty()) return !isLocal || path.empty() || path == "~";
    FileSystemEntry entry(absolute);
    FileEntryInfo info;
    const FileEntryInfoQueryFlags answer =
        entry.GetFileEntryInfo(info, kFileEntryQueryExists | kFileEntryQueryDirectory);
    if ((answer & kFileEntryQueryExists) != 0) return (info.flags & kFileEntryIsDirectory) != 0;

    if (entry.CreateAsDir()) {
        (void)entry.SetFlags(kNewFolderFlagsMask, kNewFolderFlags); // the folder is there all the same
        return true;
    }
    const core::string error = GetFileSystem()->LastErrorMessage(); // of this call: the next may change it
    // Somebody else may have made it meanwhile.
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
    // Cut, the path would name something else.
    return absolute.size() <= kMaxPathLength && GetFileSystem()->Delete(absolute, true);
}

bool IsFileOrDirectoryInUse(string_ref path) { return FileSystemEntry(path).IsLocked(); }

bool GetFolderContentsAtPath(string_ref path, FileEnumerationFlag flags, FolderContents& out,
                             FolderContentsPathMode mode, const core::string& base, bool recursive) {
    FileSystemEntry entry(PathToAbsolutePath(path));
    dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
    (void)GetFileSystem()->Enumerate(entry.Path(), &list, recursive, flags); // what could be listed is taken
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
