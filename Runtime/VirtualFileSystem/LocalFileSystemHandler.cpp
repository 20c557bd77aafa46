#include "Runtime/VirtualFileSystem/LocalFileSystemHandler.h"

#include "Runtime/Allocator/Allocator.h"

#include <cstring>

using core::string_ref;

constinit char LocalFileSystemHandler::currentDirectory[kPathBufferSize] = {};
constinit char LocalFileSystemHandler::applicationPath[kPathBufferSize] = {};

bool LocalFileSystemHandler::CanHandle(string_ref) const { return true; }
bool LocalFileSystemHandler::CanConvertToAbsolutePath(string_ref) const { return true; }
bool LocalFileSystemHandler::IsAbsoluteFilePath(string_ref path) const { return !path.empty() && path[0] == '/'; }

void LocalFileSystemHandler::InitializeFileEntry(FileEntryData& entry) {
    entry.handler = this;
    entry.accessorHandler = this;
}

void LocalFileSystemHandler::DestroyFileEntry(FileEntryData&) {}

const char* LocalFileSystemHandler::Name() { return "Local"; }

bool LocalFileSystemHandler::MakeLocal(FileEntryData& entry, bool flag) { return !flag && Exists(entry); }

bool LocalFileSystemHandler::ToLocal(const FileEntryData& entry, core::string& path, VFS::FileSize& offset,
                                     VFS::FileSize& size) const {
    if (!Exists(entry)) return false;
    RequireMemory(path.grow(strlen(entry.path)));
    path = entry.path;
    offset = 0;
    size = Size(entry);
    return true;
}

core::string LocalFileSystemHandler::GetExecutablePath() const { return GetApplicationPath(); }
core::string LocalFileSystemHandler::GetSharedApplicationDataFolder() const { return core::string(); }
core::string LocalFileSystemHandler::LastErrorMessage() { return core::string(); }
int LocalFileSystemHandler::LastError() { return 0; }

core::string LocalFileSystemHandler::SetCurrentDirectory(string_ref path) {
    core::string previous(currentDirectory, kMemLabelGeneral);
    strcpy_truncate(currentDirectory, path.data(), sizeof(currentDirectory), path.size());
    return previous;
}
