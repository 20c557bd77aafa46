// Questions about files and folders, and changes to them, in one call each. Paths are made absolute through the
// registry and served by the handler that claims them. Any thread, once the registry exists.
#pragma once

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include <functional>
#include <set>

// What the paths that GetFolderContentsAtPath collects are relative to; other values collect nothing.
enum FolderContentsPathMode : SInt32 {
    kFolderContentsRelativeToCurrentDirectory = 0, // the file system's, not the process's
    kFolderContentsRelativeToBase = 1,
    kFolderContentsAbsolute = 2,
};

using FolderContents =
    std::set<core::string, std::less<core::string>, stl_allocator<core::string, kMemLabelGeneral, 16>>;

core::string PathToAbsolutePath(core::string_ref path);

// An empty path names the current directory for IsDirectoryCreated, and nothing for the other two.
bool IsDirectoryCreated(core::string_ref path);
bool IsFileCreated(core::string_ref path);
bool IsPathCreated(core::string_ref path);

// True when the folder exists afterwards, and for a path whose absolute form is empty. If the folder can't be created,
// one message is printed, except when a file is in the way.
[[nodiscard]] bool CreateDirectory(core::string_ref path);

// The same for a folder and its missing parents, outermost first. Recurses once per component, so path must be short
// enough for an entry (kMaxPathLength).
[[nodiscard]] bool CreateDirectoryRecursive(core::string_ref path);

// Deletes a file, or a folder with its contents. False for a path above kMaxPathLength, which would be cut.
[[nodiscard]] bool DeleteFileOrDirectory(core::string_ref path);

// Whether the file, or one directly in the folder, is locked or can't be opened. path is not made absolute.
bool IsFileOrDirectoryInUse(core::string_ref path);

// Adds the paths of the folder's contents to out. Always true: what can't be listed is missing from out. Only
// kFolderContentsRelativeToBase uses base.
bool GetFolderContentsAtPath(core::string_ref path, FileEnumerationFlag flags, FolderContents& out,
                             FolderContentsPathMode mode, const core::string& base, bool recursive);
bool GetFolderContentsAtPath(core::string_ref path, FolderContents& out, FolderContentsPathMode mode,
                             const core::string& base, bool recursive);
