#include "Runtime/VirtualFileSystem/IFile.h"

#include "Runtime/Allocator/Allocator.h"

static IFile* GetOpenFile(const FileEntryData& entry) { return static_cast<IFile*>(entry.handlerState); }

IFileAdapter::IFileAdapter(IFile* servedFile, MemLabelId memLabel, bool owns)
    : file(servedFile), label(memLabel), ownsFile(owns) {}

// The permission is ignored: the file keeps the one that it was made with.
bool IFileAdapter::Open(FileEntryData& entry, FilePermission, FileAutoBehavior) {
    if (!file->IsOpen()) return false;
    entry.handlerState = file;
    return true;
}

// After a failed Open, FileAccessor still forwards calls: handlerState is null then.
bool IFileAdapter::Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
                        FileReadFlags flags) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->Read(position, size, buffer, actual, flags);
}

bool IFileAdapter::Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->Read(size, buffer, actual, flags);
}

bool IFileAdapter::Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer,
                         UInt64* written) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->Write(position, size, buffer, written);
}

bool IFileAdapter::Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->Write(size, buffer, written);
}

bool IFileAdapter::Close(FileEntryData& entry) {
    bool answer = true;
    if (ownsFile) {
        answer = file->Close();
        Delete(file, label);
    }
    entry.handlerState = nullptr;
    entry.accessorHandler = nullptr;
    Delete(this, label);
    return answer;
}

bool IFileAdapter::Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->Seek(offset, origin);
}

VFS::FileSize IFileAdapter::Position(const FileEntryData& entry) const {
    const IFile* const opened = GetOpenFile(entry);
    return opened != nullptr ? opened->Position() : VFS::FileSize();
}

bool IFileAdapter::SetLength(FileEntryData& entry, VFS::FileSize length) {
    IFile* const opened = GetOpenFile(entry);
    return opened != nullptr && opened->SetLength(length);
}

VFS::FileSize IFileAdapter::Size(const FileEntryData& entry) const {
    const IFile* const opened = GetOpenFile(entry);
    return opened != nullptr ? opened->Size() : VFS::FileSize();
}
