// The POSIX back end's contents: opening, reading, writing and seeking.
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"

#include "PlatformDependent/Linux/FileDescriptor.h"
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"

#include <sys/stat.h>
#include <unistd.h>

FileSystemError FileSystemErrorFromErrno(int error) {
    switch (error) {
    case 0: return kFileSystemErrorNone;
    case ENOENT: return kFileSystemErrorNotFound;
    case EEXIST: return kFileSystemErrorAlreadyExists;
    case EPERM:
    case EACCES: return kFileSystemErrorAccessDenied;
    case EXDEV: return kFileSystemErrorCrossDevice;
    default: return kFileSystemErrorUnknown;
    }
}

int GetDescriptor(const FileEntryData& entry) {
    const int* const cell = static_cast<const int*>(entry.handlerState);
    return cell != nullptr ? *cell : FileDescriptor::kNone;
}

static int GetOpenFlags(FilePermission permission) {
    switch (permission) {
    case kFilePermissionWrite: return O_WRONLY | O_CREAT | O_TRUNC;
    case kFilePermissionReadWrite: return O_RDWR;
    case kFilePermissionAppend: return O_WRONLY | O_CREAT | O_APPEND;
    default: return O_RDONLY;
    }
}

bool LocalFileSystemPosix::Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior) {
    entry.handler = this;
    entry.accessorHandler = this;
    int opened = PlatformOpen(entry.path, GetOpenFlags(permission), kNewFileMode);
    if (opened == FileDescriptor::kNone && permission == kFilePermissionReadWrite)
        opened = PlatformOpen(entry.path, O_RDWR | O_CREAT | O_TRUNC, kNewFileMode);
    entry.lastError = FileSystemErrorFromErrno(opened == FileDescriptor::kNone ? errno : 0);
    // Appending writes at the end wherever the position is; the seek is for Position.
    if (opened != FileDescriptor::kNone && permission == kFilePermissionAppend)
        (void)RepeatOnInterrupt([&] { return lseek(opened, 0, SEEK_END); });
    entry.handlerState = RequireMemory(New<int>(kMemLabelFileSystem, opened));
    return opened != FileDescriptor::kNone;
}

bool LocalFileSystemPosix::Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
                                FileReadFlags flags) {
    return Seek(entry, VFS::FileOffset(position), kFileOriginBegin) && Read(entry, size, buffer, actual, flags);
}

bool LocalFileSystemPosix::Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags) {
    const int descriptor = GetDescriptor(entry);
    if (descriptor == FileDescriptor::kNone) return false;
    const ssize_t count = RepeatOnInterrupt([&] { return read(descriptor, buffer, size); });
    *actual = count > 0 ? static_cast<UInt64>(count) : 0;
    if (count < 0) entry.lastError = FileSystemErrorFromErrno(errno);
    return count > 0;
}

bool LocalFileSystemPosix::Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer,
                                 UInt64* written) {
    return Seek(entry, VFS::FileOffset(position), kFileOriginBegin) && Write(entry, size, buffer, written);
}

bool LocalFileSystemPosix::Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) {
    constexpr UInt64 kMaxPieceSize = 0x7FFFFFFF; // one call takes no more
    const int descriptor = GetDescriptor(entry);
    if (descriptor == FileDescriptor::kNone) return false;
    const char* from = static_cast<const char*>(buffer);
    UInt64 total = 0;
    for (bool isLast = false; !isLast;) {
        isLast = size - total <= kMaxPieceSize;
        const size_t piece = static_cast<size_t>(isLast ? size - total : kMaxPieceSize);
        const ssize_t count = RepeatOnInterrupt([&] { return write(descriptor, from + total, piece); });
        if (count < 0) {
            *written = 0;
            entry.lastError = FileSystemErrorFromErrno(errno);
            return false;
        }
        total += static_cast<UInt64>(count);
    }
    *written = total;
    return true;
}

bool LocalFileSystemPosix::Close(FileEntryData& entry) {
    if (entry.handlerState == nullptr) return true;
    const int descriptor = GetDescriptor(entry);
    ::Delete(static_cast<int*>(entry.handlerState), kMemLabelFileSystem);
    entry.handlerState = nullptr;
    if (descriptor == FileDescriptor::kNone) return true;
    const int result = PlatformClose(descriptor);
    entry.lastError = FileSystemErrorFromErrno(result == 0 ? 0 : errno);
    return entry.lastError == kFileSystemErrorNone;
}

static int GetSeekBase(FileOrigin origin) {
    switch (origin) {
    case kFileOriginBegin: return SEEK_SET;
    case kFileOriginCurrent: return SEEK_CUR;
    case kFileOriginEnd: return SEEK_END;
    }
    AssertImplementation(0, "Runtime/VirtualFileSystem/LocalFileSystemPosix", __LINE__, -1, "unknown file origin enum");
    return SEEK_SET;
}

bool LocalFileSystemPosix::Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) {
    const int descriptor = GetDescriptor(entry);
    if (descriptor == FileDescriptor::kNone) return false;
    const int base = GetSeekBase(origin);
    const SInt64 distance = offset.Cast<SInt64>();
    return RepeatOnInterrupt([&] { return lseek(descriptor, distance, base); }) >= 0;
}

VFS::FileSize LocalFileSystemPosix::Position(const FileEntryData& entry) const {
    const int descriptor = GetDescriptor(entry);
    if (descriptor == FileDescriptor::kNone) return 0;
    return static_cast<UInt64>(RepeatOnInterrupt([&] { return lseek(descriptor, 0, SEEK_CUR); }));
}

bool LocalFileSystemPosix::SetLength(FileEntryData& entry, VFS::FileSize length) {
    const SInt64 bytes = VFS::FileOffset(length).Cast<SInt64>();
    return RepeatOnInterrupt([&] { return truncate(entry.path, bytes); }) == 0;
}

VFS::FileSize LocalFileSystemPosix::Size(const FileEntryData& entry) const {
    struct stat status;
    return GetStatus(entry.path, &status) ? static_cast<UInt64>(status.st_size) : 0;
}
