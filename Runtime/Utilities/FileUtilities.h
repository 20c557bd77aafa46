// One-call questions and changes to folders and files. Paths are made absolute through the registry and reach the
// handler that claims them. Any thread, once the registry exists.
#pragma once

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include <functional>
#include <set>

// How GetFolderContentsAtPath writes the paths that it collects; other values collect nothing.
enum FolderContentsPathMode : SInt32 {
    kFolderContentsRelativeToCurrentDirectory = 0, // the file system's, not the process's
    kFolderContentsRelativeToBase = 1,
    kFolderContentsAbsolute = 2,
};

using FolderContents =
    std::set<core::string, std::less<core::string>, stl_allocator<core::string, kMemLabelGeneral, 16>>;

core::string PathToAbsolutePath(core::string_ref path);

// An empty path stands for the current directory as a folder, and for nothing as a file or path.
bool IsDirectoryCreated(core::string_ref path);
bool IsFileCreated(core::string_ref path);
bool IsPathCreated(core::string_ref path);

// True when the folder is there afterwards, and for a path that a handler makes nothing of. A failed creation prints
// one message; a file in the way does not.
bool CreateDirectory(core::string_ref path);

// The same for a folder and every folder above it that is missing, outermost first. Recurses once a component: the path
// must be of a length that an entry can hold.
bool CreateDirectoryRecursive(core::string_ref path);

// A folder with all that it holds. False for a path longer than an entry can hold, which would be cut.
bool DeleteFileOrDirectory(core::string_ref path);

// Whether somebody holds a lock on the file, or on one in the folder. The path is taken as given.
bool IsFileOrDirectoryInUse(core::string_ref path);

// Adds what the folder holds to out. Always true: what can't be listed is just missing. base matters to
// kFolderContentsRelativeToBase alone.
bool GetFolderContentsAtPath(core::string_ref path, FileEnumerationFlag flags, FolderContents& out,
                             FolderContentsPathMode mode, const core::string& base, bool recursive);
bool GetFolderContentsAtPath(core::string_ref path, FolderContents& out, FolderContentsPathMode mode,
                             const core::string& base, bool recursive);
