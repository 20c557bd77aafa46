#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"

#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"

MemoryFile::MemoryFile(MemLabelId memLabel, MemoryFileData* contents, FilePermission filePermission)
    : data(contents), permission(filePermission), label(memLabel) {
    if (data != nullptr)
        data->AddRef();
    else
        data =
            RequireMemory(New<MultiBlocksMemoryFileData>(label, label, MultiBlocksMemoryFileData::kDefaultBlockSize));
}

MemoryFile::~MemoryFile() {
    if (data != nullptr) data->Release();
}

FileSystemEntry MemoryFile::CreateFileSystemEntry(MemLabelId memLabel, FilePermission filePermission, void* data,
                                                  size_t size, bool takeOwnership) {
    MemoryFileData* const contents =
        RequireMemory(New<SingleBlockMemoryFileData>(memLabel, memLabel, data, size, takeOwnership));
    auto* const file = RequireMemory(New<MemoryFile>(memLabel, memLabel, contents, filePermission));
    contents->Release(); // the file holds the other reference
    FileEntryData entry;
    entry.accessorHandler = RequireMemory(New<IFileAdapter>(memLabel, file, memLabel, true));
    return FileSystemEntry(entry);
}

bool MemoryFile::IsOpen() const { return data != nullptr; }

bool MemoryFile::Close() {
    if (data != nullptr) data->Release();
    data = nullptr;
    return true;
}

bool MemoryFile::Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags) {
    if (!IsReadable()) Report(FixedReports::kMemoryFileRead);
    if (data == nullptr || !IsReadable()) return false;
    const UInt64 count = data->Read(from, size, out);
    if (actual != nullptr) *actual = count;
    if (count == 0) return from <= data->Size();
    position = from.Cast<UInt64>() + count;
    return true;
}

bool MemoryFile::Read(UInt64 size, void* out, UInt64* actual, FileReadFlags flags) {
    return Read(VFS::FileSize(position), size, out, actual, flags);
}

bool MemoryFile::Write(VFS::FileSize from, UInt64 size, const void* in, UInt64* written) {
    if (!IsWritable()) Report(FixedReports::kMemoryFileWrite);
    if (data == nullptr || !IsWritable()) return false;
    const UInt64 count = data->Write(from, size, in);
    position = from.Cast<UInt64>() + count;
    if (written != nullptr) *written = count;
    return true;
}

bool MemoryFile::Write(UInt64 size, const void* in, UInt64* written) {
    return Write(VFS::FileSize(position), size, in, written);
}

bool MemoryFile::Seek(VFS::FileOffset offset, FileOrigin origin) {
    if (data == nullptr) return false;
    const UInt64 end = data->Size().Cast<UInt64>();
    UInt64 target = 0;
    bool isPosition = false; // stays false when the sum wraps
    if (origin == kFileOriginBegin) {
        target = offset.Cast<UInt64>();
        isPosition = true;
    } else if (origin == kFileOriginCurrent) {
        isPosition = !__builtin_add_overflow(position, offset.Cast<SInt64>(), &target);
    } else if (origin == kFileOriginEnd) {
        isPosition = !__builtin_sub_overflow(end, offset.Cast<SInt64>(), &target);
    }
    if (!isPosition || target > end) return false;
    position = target;
    return true;
}

VFS::FileSize MemoryFile::Position() const { return position; }

bool MemoryFile::SetLength(VFS::FileSize length) {
    if (!IsWritable()) Report(FixedReports::kMemoryFileSetLength);
    if (data == nullptr || !IsWritable()) return false;
    data->SetLength(length);
    return true;
}

VFS::FileSize MemoryFile::Size() const { return data != nullptr ? data->Size() : VFS::FileSize(); }

bool MemoryFile::Flush() { return true; }
