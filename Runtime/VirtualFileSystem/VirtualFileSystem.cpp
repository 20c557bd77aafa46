#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Threads/ReadWriteLock.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemHandler.h"

#include <cstring>

using core::string_ref;

constinit FileSystem* gFileSystem = nullptr;

FileSystem* GetFileSystem() {
    if (gFileSystem == nullptr) gFileSystem = RequireMemory(New<FileSystem>(kMemLabelFileSystem, kMemLabelFileSystem));
    return gFileSystem;
}

FileSystem::FileSystem(MemLabelId label)
    : localHandler(RequireMemory(CreateLocalFileSystem(label))),
      handlers(label),
      handlersLock(RequireMemory(New<ReadWriteLock>(label))) {
    defaultHandler = localHandler;
}

FileSystemHandler* FileSystem::GetHandlerForPath(string_ref path) const {
    ReadWriteLock::AutoShared lock(*handlersLock);
    for (size_t index = handlers.size(); index != 0; --index)
        if (handlers[index - 1]->CanHandle(path)) return handlers[index - 1];
    return defaultHandler;
}

core::string FileSystem::ToAbsolute(string_ref path) const {
    {
        ReadWriteLock::AutoShared lock(*handlersLock);
        for (size_t index = handlers.size(); index != 0; --index) {
            const FileSystemHandler& handler = *handlers[index - 1];
            if (handler.IsAbsoluteFilePath(path)) return core::string(path, kMemLabelGeneral);
            if (handler.CanConvertToAbsolutePath(path)) return handler.ToAbsolute(path);
        }
    }
    return localHandler->ToAbsolute(path);
}

core::string FileSystem::SetCurrentDirectory(string_ref path) {
    return LocalFileSystemHandler::SetCurrentDirectory(path);
}

core::string FileSystem::CurrentDirectory() const {
    return core::string(LocalFileSystemHandler::currentDirectory, kMemLabelGeneral);
}

bool FileSystem::Delete(string_ref path, bool recursive) const {
    FileSystemEntry entry(path);
    return entry.handler != nullptr && entry.handler->Delete(entry, recursive);
}

bool FileSystem::Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                           FileEnumerationFlag flags) const {
    FileEntryData entry; // its destructor undoes the binding
    strcpy_truncate(entry.path, path, sizeof(entry.path), strlen(path));
    GetHandlerForPath(path)->InitializeFileEntry(entry);
    void* handlerData = nullptr;
    return entry.handler != nullptr && entry.handler->Enumerate(entry.path, out, recursive, &handlerData, flags);
}

core::string FileSystem::LastErrorMessage() const { return localHandler->LastErrorMessage(); }

void FileSystem::RegisterHandler(FileSystemHandler* handler) {
    ReadWriteLock::AutoExclusive lock(*handlersLock);
    handlers.push_back(handler);
}

void FileSystem::UnregisterHandler(FileSystemHandler* handler) {
    ReadWriteLock::AutoExclusive lock(*handlersLock);
    size_t kept = 0;
    for (FileSystemHandler* registered : handlers)
        if (registered != handler) handlers[kept++] = registered;
    handlers.truncate(kept);
}

// Undoes a binding. The path is left for the caller to overwrite.
static void Unbind(FileEntryData& entry) {
    if (entry.handler != nullptr) entry.handler->DestroyFileEntry(entry);
    entry.handler = nullptr;
    entry.accessorHandler = nullptr;
    entry.handlerState = nullptr;
    entry.lastError = kFileSystemErrorNone;
}

// Binds an unbound entry to the path and handlers of another. An open file is not copied.
static void CopyBinding(FileEntryData& entry, const FileEntryData& other) {
    strcpy_truncate(entry.path, other.path, sizeof(entry.path), strlen(other.path));
    entry.handler = other.handler;
    entry.accessorHandler = other.accessorHandler;
    if (entry.handler != nullptr) entry.handler->InitializeFileEntry(entry);
}

FileSystemEntry::FileSystemEntry(string_ref entryPath) { Set(entryPath); }
FileSystemEntry::FileSystemEntry(const FileEntryData& other) { CopyBinding(*this, other); }
FileSystemEntry::FileSystemEntry(const FileSystemEntry& other) : FileEntryData() { CopyBinding(*this, other); }

FileSystemEntry& FileSystemEntry::operator=(const FileSystemEntry& other) {
    if (this == &other) return *this;
    Unbind(*this);
    CopyBinding(*this, other);
    return *this;
}

void FileSystemEntry::Set(string_ref newPath) {
    // Asked before the path is overwritten: newPath may be part of it.
    FileSystemHandler* const newHandler = GetFileSystem()->GetHandlerForPath(newPath);
    Unbind(*this);
    strcpy_truncate(path, newPath.data(), sizeof(path), newPath.size());
    ConvertSeparatorsToZarvo(path);
    newHandler->InitializeFileEntry(*this);
}

bool FileSystemEntry::Exists() const { return handler != nullptr && handler->Exists(*this); }
bool FileSystemEntry::IsDir() const { return handler != nullptr && handler->IsDir(*this); }
bool FileSystemEntry::IsFile() const { return handler != nullptr && handler->IsFile(*this); }
bool FileSystemEntry::IsLocked() { return handler != nullptr && handler->IsLocked(*this); }
bool FileSystemEntry::CreateAsDir() { return handler != nullptr && handler->CreateAsDir(*this); }
bool FileSystemEntry::SetFlags(UInt32 mask, UInt32 flags) {
    return handler != nullptr && handler->SetFlags(*this, mask, flags);
}
FileEntryInfoQueryFlags FileSystemEntry::GetFileEntryInfo(FileEntryInfo& info, FileEntryInfoQueryFlags query) const {
    return handler != nullptr ? handler->GetFileEntryInfo(*this, info, query) : kFileEntryQueryNone;
}
DateTime FileSystemEntry::LastModified() const {
    return handler != nullptr ? handler->LastModified(*this) : DateTime();
}

bool FileSystemEntry::FolderExists() const {
    FileEntryInfo info;
    (void)GetFileEntryInfo(info, kFileEntryQueryExists | kFileEntryQueryDirectory); // unfilled, the flags are 0
    return (info.flags & kFileEntryIsDirectory) != 0;
}

FileAccessor::~FileAccessor() {
    (void)Close(); // a caller that needs the answer closes before
}

bool FileAccessor::Open(FileSystemEntry& target, FilePermission permission, FileAutoBehavior behavior) {
    Unbind(entry);
    CopyBinding(entry, target);
    entry.handlerState = nullptr;
    opened = true;
    openSucceeded = entry.accessorHandler != nullptr && entry.accessorHandler->Open(entry, permission, behavior);
    return openSucceeded;
}

bool FileAccessor::Open(const char* path, FilePermission permission, FileAutoBehavior behavior) {
    FileSystemEntry target{string_ref(path)};
    return Open(target, permission, behavior);
}

bool FileAccessor::Read(UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) {
    return entry.accessorHandler != nullptr && entry.accessorHandler->Read(entry, size, buffer, actual, flags);
}

bool FileAccessor::Read(VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) {
    return entry.accessorHandler != nullptr &&
           entry.accessorHandler->Read(entry, position, size, buffer, actual, flags);
}

bool FileAccessor::Write(UInt64 size, const void* data, UInt64* written) {
    return entry.accessorHandler != nullptr && entry.accessorHandler->Write(entry, size, data, written);
}

bool FileAccessor::Seek(VFS::FileOffset offset, FileOrigin origin) {
    return entry.accessorHandler != nullptr && entry.accessorHandler->Seek(entry, offset, origin);
}

VFS::FileSize FileAccessor::Position() const {
    return entry.accessorHandler != nullptr ? entry.accessorHandler->Position(entry) : VFS::FileSize();
}

VFS::FileSize FileAccessor::Size() const {
    return entry.accessorHandler != nullptr ? entry.accessorHandler->Size(entry) : VFS::FileSize();
}

bool FileAccessor::Close() {
    if (!opened) return true;
    openSucceeded = false;
    return entry.accessorHandler != nullptr && entry.accessorHandler->Close(entry);
}
