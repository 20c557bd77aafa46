#include "Library/NewFile.h"

#include "Library/OutputFolder.h"
#include "PlatformDependent/Linux/RepeatOnInterrupt.h"

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int kNewFileFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;

// What a descriptor stands for, as a path.
struct DescriptorPath {
    explicit DescriptorPath(int descriptor) { (void)snprintf(text, sizeof(text), "/proc/self/fd/%d", descriptor); }

    char text[40];
};

// Distinct names within this process; those of others are found out by O_EXCL.
std::atomic<UInt64> s_NextName{0};

} // namespace

bool IsDiskFailure(const Failure& failure) {
    const int error = failure.systemCode;
    return error == ENOSPC || error == EDQUOT || error == EROFS;
}

NewFile::~NewFile() {
    if (m_Descriptor >= 0) close(m_Descriptor);
    if (m_Folder < 0) return;
    Remove(m_Folder);
    close(m_Folder);
}

// A name of our own that nothing has.
static void MakeName(char (&name)[32]) {
    (void)snprintf(name, sizeof(name), ".zarvo-%x-%llx", static_cast<unsigned>(getpid()),
                   static_cast<unsigned long long>(s_NextName.fetch_add(1, std::memory_order_relaxed)));
}

// Whether files without a name can get one: not where only the superuser can do it directly, and /proc is missing.
static bool CanNameFiles() {
    static const bool s_HasProc = access("/proc/self/fd", X_OK) == 0;
    return s_HasProc;
}

zarvo_code NewFile::Create(int folder, Failure* failure) {
    if (!CanNameFiles()) return CreateNamed(folder, failure);
    m_Descriptor = RepeatOnInterrupt([&] { return openat(folder, ".", O_TMPFILE | O_WRONLY | O_CLOEXEC, 0666); });
    if (m_Descriptor >= 0) return ZARVO_OK;
    // File systems, and kernels, that can't make a file without a name.
    if (errno == EOPNOTSUPP || errno == EISDIR || errno == EINVAL) return CreateNamed(folder, failure);
    return failure->SetSystem(errno);
}

// Makes a file with a name of our own, which is stored, or is empty after a failure.
static int OpenNamed(int folder, char (&name)[32]) {
    int descriptor;
    do {
        MakeName(name); // may be one that a killed process has left
        descriptor = RepeatOnInterrupt([&] { return openat(folder, name, kNewFileFlags, 0666); });
    } while (descriptor < 0 && errno == EEXIST);
    if (descriptor < 0) name[0] = '\0';
    return descriptor;
}

zarvo_code NewFile::CreateNamed(int folder, Failure* failure) {
    m_Folder = fcntl(folder, F_DUPFD_CLOEXEC, 0);
    if (m_Folder < 0) return failure->SetSystem(errno);
    m_Descriptor = OpenNamed(m_Folder, m_Name);
    if (m_Descriptor >= 0) return ZARVO_OK;
    (void)failure->SetSystem(errno);
    close(m_Folder); // another try may follow
    m_Folder = -1;
    return failure->code;
}

zarvo_code WriteAt(int descriptor, UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) {
    while (size != 0) {
        const ssize_t written = RepeatOnInterrupt(
            [&] { return pwrite(descriptor, bytes, static_cast<size_t>(size), static_cast<off_t>(offset)); });
        if (written < 0) return failure->SetSystem(errno);
        bytes += written;
        offset += static_cast<UInt64>(written);
        size -= static_cast<UInt64>(written);
    }
    return ZARVO_OK;
}

static zarvo_code CutFile(int descriptor, UInt64 size, Failure* failure) {
    const int answer = RepeatOnInterrupt([&] { return ftruncate(descriptor, static_cast<off_t>(size)); });
    return answer == 0 ? ZARVO_OK : failure->SetSystem(errno);
}

zarvo_code NewFile::Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) {
    return WriteAt(m_Descriptor, offset, bytes, size, failure);
}

zarvo_code NewFile::Cut(UInt64 size, Failure* failure) { return CutFile(m_Descriptor, size, failure); }

zarvo_code NewFile::CreateClosed(int folder, Failure* failure) {
    const int descriptor = OpenNamed(folder, m_Name);
    if (descriptor < 0) return failure->SetSystem(errno);
    struct stat status;
    const int error = fstat(descriptor, &status) == 0 ? 0 : errno;
    close(descriptor); // nothing has been written
    if (error != 0) {
        Remove(folder);
        return failure->SetSystem(error);
    }
    m_Device = status.st_dev;
    m_Inode = status.st_ino;
    return ZARVO_OK;
}

// Opens the file, and nothing else that may have got its name meanwhile.
int NewFile::OpenAgain(int folder) const {
    const int found = RepeatOnInterrupt([&] { return openat(folder, m_Name, O_PATH | O_NOFOLLOW | O_CLOEXEC); });
    if (found < 0) return -1;
    struct stat status;
    int descriptor = -1;
    errno = ESTALE;
    if (fstat(found, &status) == 0 && status.st_dev == m_Device && status.st_ino == m_Inode) {
        const DescriptorPath path(found);
        descriptor = RepeatOnInterrupt([&] { return open(path.text, O_WRONLY | O_CLOEXEC); });
    }
    const int error = errno;
    close(found);
    errno = error;
    return descriptor;
}

// The work of a function below on the file, opened for it. work: (descriptor) -> code.
template <typename Work>
static zarvo_code DoAndClose(int descriptor, Failure* failure, Work&& work) {
    if (descriptor < 0) return failure->SetSystem(errno);
    const zarvo_code code = work(descriptor);
    if (close(descriptor) != 0 && errno != EINTR && code == ZARVO_OK) return failure->SetSystem(errno);
    return code;
}

zarvo_code NewFile::WriteClosed(int folder, UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) const {
    return DoAndClose(OpenAgain(folder), failure,
                      [&](int descriptor) { return WriteAt(descriptor, offset, bytes, size, failure); });
}

zarvo_code NewFile::CutClosed(int folder, UInt64 size, Failure* failure) const {
    return DoAndClose(OpenAgain(folder), failure, [&](int descriptor) { return CutFile(descriptor, size, failure); });
}

void NewFile::Remove(int folder) {
    if (IsNamed()) unlinkat(folder, m_Name, 0);
    m_Name[0] = '\0';
}

// Gives a file without a name one.
static int LinkFile(int descriptor, int folder, const char* name) {
    if (linkat(descriptor, "", folder, name, AT_EMPTY_PATH) == 0) return 0;
    if (errno != ENOENT && errno != EPERM && errno != EINVAL) return -1;
    const DescriptorPath path(descriptor); // for kernels that let only the superuser do that
    return linkat(AT_FDCWD, path.text, folder, name, AT_SYMLINK_FOLLOW);
}

int RenameToNew(int folder, const char* from, const char* to) {
    if (renameat2(folder, from, folder, to, RENAME_NOREPLACE) == 0) return 0;
    if (errno != EINVAL && errno != ENOSYS) return -1;
    // The file system can't refuse what is there when it renames, but when it links.
    if (linkat(folder, from, folder, to, 0) == 0) {
        (void)unlinkat(folder, from, 0);
        return 0;
    }
    if (errno == EEXIST) return -1;
    // It has no links.
    if (!LookAt(folder, to).isThere) return renameat(folder, from, folder, to);
    errno = EEXIST;
    return -1;
}

// The last word on whether the bytes are there: on some file systems it is said only when the file is closed.
int NewFile::Close() {
    const int descriptor = m_Descriptor;
    m_Descriptor = -1;
    return descriptor < 0 || close(descriptor) == 0 || errno == EINTR ? 0 : -1;
}

zarvo_code NewFile::Place(int folder, const char* name, Failure* failure) {
    const bool isNamed = IsNamed();
    if (isNamed && Close() != 0) return failure->SetSystem(errno);
    const int answer = isNamed ? RenameToNew(folder, m_Name, name) : LinkFile(m_Descriptor, folder, name);
    if (answer != 0) return failure->SetSystem(errno);
    m_Name[0] = '\0';
    if (Close() == 0) return ZARVO_OK;
    const int error = errno;
    unlinkat(folder, name, 0); // our own, and not whole
    return failure->SetSystem(error);
}

zarvo_code NewFile::Replace(int folder, const char* name, Failure* failure) {
    while (!IsNamed()) {
        MakeName(m_Name); // may be one that a killed process has left
        if (LinkFile(m_Descriptor, folder, m_Name) == 0) break;
        m_Name[0] = '\0';
        if (errno != EEXIST) return failure->SetSystem(errno);
    }
    if (Close() == 0 && renameat(folder, m_Name, folder, name) == 0) {
        m_Name[0] = '\0';
        return ZARVO_OK;
    }
    const int error = errno;
    if (unlinkat(folder, m_Name, 0) == 0) m_Name[0] = '\0';
    return failure->SetSystem(error);
}

zarvo_code PlaceEmptyFile(int folder, const char* name, Failure* failure) {
    const int descriptor = RepeatOnInterrupt([&] { return openat(folder, name, kNewFileFlags, 0666); });
    if (descriptor < 0) return failure->SetSystem(errno);
    return close(descriptor) == 0 || errno == EINTR ? ZARVO_OK : failure->SetSystem(errno);
}
