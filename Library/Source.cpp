#include "Library/Source.h"

#include "PlatformDependent/Linux/RepeatOnInterrupt.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

zarvo_code Source::ReadAt(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const {
    *count = 0;
    if (position >= m_Size) return ZARVO_OK;
    size = static_cast<size_t>(std::min<UInt64>(size, m_Size - position));
    while (*count < size) {
        size_t got = 0;
        const zarvo_code code =
            ReadSome(m_Offset + position + *count, static_cast<UInt8*>(buffer) + *count, size - *count, &got, failure);
        if (code != ZARVO_OK) return code;
        if (got == 0) break;
        *count += got;
    }
    const zarvo_code code = CheckUnchanged(failure);
    if (code != ZARVO_OK) *count = 0; // they may be another file's
    return code;
}

static bool IsDamage(zarvo_code code, const Failure& failure) {
    return code == ZARVO_ERROR_SYSTEM && failure.systemCode == EIO;
}

zarvo_code Source::ReadBeforeDamage(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const {
    *count = 0;
    const UInt64 end = position + std::min<UInt64>(size, m_Size - std::min(position, m_Size));
    UInt64 at = position;
    UInt64 limit = end; // of the next reads: where one has failed, they are halved
    while (true) {
        size_t got = 0;
        Failure problem;
        const zarvo_code code =
            ReadAt(at, static_cast<UInt8*>(buffer) + (at - position), static_cast<size_t>(limit - at), &got, &problem);
        at += got;
        *count = static_cast<size_t>(at - position);
        if (code == ZARVO_OK) {
            if (at < limit || at == end) return ZARVO_OK;
            limit = end;
            continue;
        }
        const UInt64 pageEnd = PageEnd(at);
        if (!IsDamage(code, problem) || limit <= pageEnd) {
            *failure = problem;
            return code;
        }
        limit = std::max(pageEnd, PageBegin(at + (limit - at) / 2));
    }
}

UInt64 Source::FindEndOfDamage(UInt64 position, UInt64 end) const {
    UInt8 page[kPageSize];
    size_t count = 0;
    Failure failure;
    do
        position = PageEnd(position);
    while (position < end &&
           IsDamage(ReadAt(position, page, std::min(kPageSize, m_Size - position), &count, &failure), failure));
    return std::min(position, end);
}

zarvo_code Source::SetRange(UInt64 wholeSize, UInt64 offset, Failure* failure) {
    if (offset > wholeSize) return failure->Set(ZARVO_ERROR_NOT_AN_ARCHIVE, "the offset is past the end");
    m_Offset = offset;
    m_Size = wholeSize - offset;
    return ZARVO_OK;
}

namespace {

// An archive never takes the place of a standard stream that the program has closed.
constexpr int kFirstOrdinaryDescriptor = 3;

// Which file it is, and what changes with its contents.
struct Stamp {
    explicit Stamp(const struct stat& status)
        : device(status.st_dev),
          inode(status.st_ino),
          size(status.st_size),
          modified(status.st_mtim),
          changed(status.st_ctim),
          hasName(status.st_nlink != 0) {}

    // Whether the file has kept its contents. The time of change tells also of writers that set the other one back. Of
    // a file that has been deleted or replaced since, it is the time of that.
    bool IsKept(const struct stat& status) const {
        const Stamp now(status);
        const bool hasLostName = hasName && !now.hasName;
        return size == now.size && IsSame(modified, now.modified) && (hasLostName || IsSame(changed, now.changed));
    }
    static bool IsSame(const timespec& a, const timespec& b) { return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec; }

    dev_t device;
    ino_t inode;
    off_t size;
    timespec modified;
    timespec changed;
    bool hasName;
};

class FileSource final : public Source {
public:
    // Owns the descriptor.
    FileSource(int descriptor, const struct stat& status) : m_Descriptor(descriptor), m_Stamp(status) {}
    ~FileSource() override { close(m_Descriptor); }

    zarvo_code Begin(UInt64 wholeSize, UInt64 offset, Failure* failure) { return SetRange(wholeSize, offset, failure); }

    bool IsFile(dev_t device, ino_t inode) const override { return m_Stamp.device == device && m_Stamp.inode == inode; }

private:
    zarvo_code ReadSome(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const override {
        const ssize_t got =
            RepeatOnInterrupt([&] { return pread(m_Descriptor, buffer, size, static_cast<off_t>(position)); });
        if (got < 0) return failure->SetSystem(errno);
        *count = static_cast<size_t>(got);
        return ZARVO_OK;
    }

    zarvo_code CheckUnchanged(Failure* failure) const override {
        struct stat status;
        if (fstat(m_Descriptor, &status) != 0) return failure->SetSystem(errno);
        if (m_Stamp.IsKept(status)) return ZARVO_OK;
        return failure->Set(ZARVO_ERROR_CHANGED, "the archive's file has changed since it was opened");
    }

    int m_Descriptor;
    Stamp m_Stamp;
};

// Takes the descriptor over, also when it fails.
zarvo_code OpenFile(int descriptor, UInt64 offset, Owned<Source>* source, Failure* failure) {
    struct stat status;
    UInt64 size = 0;
    zarvo_code code = ZARVO_OK;
    if (fstat(descriptor, &status) != 0)
        code = failure->SetSystem(errno);
    else if (S_ISREG(status.st_mode))
        size = static_cast<UInt64>(status.st_size);
    else if (S_ISBLK(status.st_mode))
        code = ioctl(descriptor, BLKGETSIZE64, &size) == 0 ? ZARVO_OK : failure->SetSystem(errno);
    else if (S_ISDIR(status.st_mode))
        code = failure->SetSystem(EISDIR);
    else
        code = failure->SetSystem(ESPIPE, "an archive must be a file that can be read at any place");
    if (code != ZARVO_OK) {
        close(descriptor);
        return code;
    }
    FileSource* const file = New<FileSource>(kMemLabelFileSystem, descriptor, status);
    if (file == nullptr) {
        close(descriptor);
        return failure->SetMemory();
    }
    *source = {file, kMemLabelFileSystem};
    return file->Begin(size, offset, failure);
}

class MemorySource final : public Source {
public:
    explicit MemorySource(const void* data) : m_Data(static_cast<const UInt8*>(data)) {}

    zarvo_code Begin(size_t size, UInt64 offset, Failure* failure) { return SetRange(size, offset, failure); }

private:
    zarvo_code ReadSome(UInt64 position, void* buffer, size_t size, size_t* count, Failure*) const override {
        memcpy(buffer, m_Data + position, size);
        *count = size;
        return ZARVO_OK;
    }

    const UInt8* m_Data;
};

class CallbackSource final : public Source {
public:
    explicit CallbackSource(const zarvo_source& callbacks) : m_Callbacks(callbacks) {}
    ~CallbackSource() override {
        if (m_Callbacks.close != nullptr) m_Callbacks.close(m_Callbacks.context);
    }

    zarvo_code Begin(UInt64 offset, Failure* failure) {
        uint64_t size = 0;
        const int answer = m_Callbacks.get_size(m_Callbacks.context, &size);
        if (answer != 0) return SetAnswer(answer, failure);
        return SetRange(size, offset, failure);
    }

private:
    zarvo_code ReadSome(UInt64 position, void* buffer, size_t size, size_t* count, Failure* failure) const override {
        const int64_t answer = m_Callbacks.read_at(m_Callbacks.context, buffer, size, position);
        if (answer < 0) return SetAnswer(answer, failure);
        if (static_cast<UInt64>(answer) > size) return failure->SetSystem(EIO, "a read delivered more than was asked");
        *count = static_cast<size_t>(answer);
        return ZARVO_OK;
    }

    // The errno that a callback answers, where it can be one.
    static zarvo_code SetAnswer(int64_t answer, Failure* failure) {
        return failure->SetSystem(answer > 0 || answer < -INT32_MAX ? EIO : static_cast<int>(-answer));
    }

    zarvo_source m_Callbacks;
};

} // namespace

zarvo_code OpenPath(const char* path, UInt64 offset, Owned<Source>* source, Failure* failure) {
    // O_NONBLOCK: a pipe is refused, and not waited for. It means nothing to files.
    const int flags = O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY;
    int descriptor = RepeatOnInterrupt([&] { return open(path, flags); });
    if (descriptor >= 0 && descriptor < kFirstOrdinaryDescriptor) {
        const int moved = fcntl(descriptor, F_DUPFD_CLOEXEC, kFirstOrdinaryDescriptor);
        const int error = errno;
        close(descriptor);
        errno = error;
        descriptor = moved;
    }
    if (descriptor < 0) return failure->SetSystem(errno);
    return OpenFile(descriptor, offset, source, failure);
}

zarvo_code OpenDescriptor(int descriptor, UInt64 offset, Owned<Source>* source, Failure* failure) {
    const int copy = fcntl(descriptor, F_DUPFD_CLOEXEC, kFirstOrdinaryDescriptor);
    if (copy < 0) return failure->SetSystem(errno);
    return OpenFile(copy, offset, source, failure);
}

zarvo_code OpenMemory(const void* data, size_t size, UInt64 offset, Owned<Source>* source, Failure* failure) {
    MemorySource* const memory = New<MemorySource>(kMemLabelFileSystem, data);
    if (memory == nullptr) return failure->SetMemory();
    *source = {memory, kMemLabelFileSystem};
    return memory->Begin(size, offset, failure);
}

zarvo_code OpenCallbacks(const zarvo_source& callbacks, UInt64 offset, Owned<Source>* source, Failure* failure) {
    CallbackSource* const called = New<CallbackSource>(kMemLabelFileSystem, callbacks);
    if (called == nullptr) {
        if (callbacks.close != nullptr) callbacks.close(callbacks.context);
        return failure->SetMemory();
    }
    *source = {called, kMemLabelFileSystem};
    return called->Begin(offset, failure);
}
