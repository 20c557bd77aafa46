#include "Library/OutputFolder.h"

#include "PlatformDependent/Linux/RepeatOnInterrupt.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr int kFolderFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

constexpr int kNewFileFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;

// What a descriptor stands for, as a path.
struct DescriptorPath {
    explicit DescriptorPath(int descriptor) { (void)snprintf(text, sizeof(text), "/proc/self/fd/%d", descriptor); }

    char text[40];
};

// Distinct names within this process; those of others are found out by O_EXCL.
std::atomic<UInt64> s_NextName{0};

} // namespace

bool IsOutOfDescriptors(const Failure& failure) { return failure.systemCode == EMFILE || failure.systemCode == ENFILE; }

bool IsDiskFailure(const Failure& failure) {
    const int error = failure.systemCode;
    return error == ENOSPC || error == EDQUOT || error == EROFS;
}

OutputFolder::~OutputFolder() {
    if (m_Descriptor >= 0) close(m_Descriptor);
}

zarvo_code OutputFolder::Open(const char* path, Failure* failure) {
    // From the outermost on: what is there already says so.
    const core::string_ref whole(path);
    core::string start(kMemLabelGeneral);
    if (start.grow(whole.size()) == nullptr) return failure->SetMemory();
    int error = 0;
    for (size_t end = 1; end <= whole.size(); ++end) {
        if (end != whole.size() && whole[end] != '/') continue;
        start = whole.substr(0, end);
        error = RepeatOnInterrupt([&] { return mkdir(start.c_str(), 0777); }) == 0 ? 0 : errno;
    }
    m_Descriptor = RepeatOnInterrupt([&] { return open(path, O_PATH | O_DIRECTORY | O_CLOEXEC); });
    if (m_Descriptor >= 0) return ZARVO_OK;
    const int openError = errno;
    return failure->SetSystem(error != 0 && error != EEXIST && openError == ENOENT ? error : openError);
}

zarvo_code OutputFolder::OpenToLook(const char* path, Failure* failure) {
    const core::string_ref whole(path);
    core::string start(kMemLabelGeneral);
    if (start.grow(whole.size() + 1) == nullptr) return failure->SetMemory();
    start = whole;
    while (true) {
        m_Descriptor = RepeatOnInterrupt([&] { return open(start.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC); });
        if (m_Descriptor >= 0) return m_IsMissing ? CheckCanMakeIn(m_Descriptor, failure) : ZARVO_OK;
        struct stat status;
        const int error = errno;
        const bool isMissing = error == ENOENT && lstat(start.c_str(), &status) != 0;
        if (!isMissing || start.empty() || start == ".") return failure->SetSystem(error);
        m_IsMissing = true;
        const size_t slash = start.rfind('/');
        if (slash == core::string::npos)
            start = ".";
        else
            start = whole.substr(0, std::max<size_t>(slash, 1));
    }
}

zarvo_code OutputFolder::OpenToRead(const char* path, Failure* failure) {
    m_Descriptor = RepeatOnInterrupt([&] { return open(path, O_PATH | O_DIRECTORY | O_CLOEXEC); });
    return m_Descriptor >= 0 ? ZARVO_OK : failure->SetSystem(errno);
}

FolderCache::~FolderCache() { (void)Close(); }

bool FolderCache::Close() {
    const bool hadAny = !m_Folders.empty();
    for (Folder& folder : m_Folders)
        close(folder.descriptor);
    m_Folders.clear();
    m_LastDescriptor = -1;
    return hadAny;
}

// Opens a folder in another one.
int FolderCache::Enter(int above, const char* name, Failure* failure) {
    const auto openFolder = [&] { return RepeatOnInterrupt([&] { return openat(above, name, kFolderFlags); }); };
    // A folder is likely to be there if the last one was.
    const bool opensFirst = m_Missing != kMake || m_WasThere;
    int descriptor = opensFirst ? openFolder() : -1;
    if (m_Missing == kMake && descriptor < 0 && (!opensFirst || errno == ENOENT)) {
        m_WasThere = RepeatOnInterrupt([&] { return mkdirat(above, name, 0777); }) != 0;
        if (m_WasThere && errno != EEXIST) {
            (void)failure->SetSystem(errno);
            return -1;
        }
        descriptor = openFolder();
    }
    if (descriptor >= 0) return descriptor;
    const int error = errno;
    if (m_Missing == kLook && error == ENOENT) {
        (void)CheckCanMakeIn(above, failure);
        return -1;
    }
    struct stat status;
    const bool isLink = fstatat(above, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(status.st_mode);
    (void)failure->SetSystem(error, isLink ? "a link is in the place of a folder" : nullptr);
    return -1;
}

// Of folders below one that is missing, only the names can be wrong. names: with a "/" between them.
void FolderCache::CheckNames(int above, char* names, Failure* failure) {
    for (char* name = names; name != nullptr && failure->code == ZARVO_OK;) {
        char* const slash = strchr(name, '/');
        if (slash != nullptr) *slash = '\0';
        (void)CheckName(above, name, failure);
        name = slash != nullptr ? slash + 1 : nullptr;
    }
}

bool FolderCache::Keep(core::string_ref path, int descriptor) {
    if (m_Folders.size() == m_MaxFolders) {
        Folder* oldest = m_Folders.begin();
        for (Folder& folder : m_Folders)
            if (folder.lastUse < oldest->lastUse) oldest = &folder;
        close(oldest->descriptor);
        *oldest = std::move(m_Folders[m_MaxFolders - 1]);
        m_Folders.truncate(m_MaxFolders - 1);
    }
    const size_t index = m_Folders.size();
    if (!m_Folders.resize_initialized(index + 1)) return false;
    Folder& folder = m_Folders[index];
    if (folder.path.grow(path.size()) == nullptr) {
        m_Folders.truncate(index);
        return false;
    }
    folder.path = path;
    folder.descriptor = descriptor;
    folder.lastUse = ++m_Uses;
    return true;
}

int FolderCache::Get(core::string_ref path, Failure* failure) {
    // Each file asks twice, and files of a folder mostly follow one another.
    if (m_LastDescriptor >= 0 && path == m_LastPath) return m_LastDescriptor;
    m_LastDescriptor = -1;
    if (m_LastPath.grow(path.size()) == nullptr) {
        (void)failure->SetMemory();
        return -1;
    }
    m_LastPath = path;
    m_LastDescriptor = Walk(path, m_MaxFolders, failure);
    if (m_LastDescriptor >= 0 || !IsOutOfDescriptors(*failure) || !Close()) return m_LastDescriptor;
    *failure = {};
    m_LastDescriptor = Walk(path, 1, failure);
    return m_LastDescriptor;
}

int FolderCache::Walk(core::string_ref path, size_t maxKept, Failure* failure) {
    char* const buffer = m_Normal.grow(path.size() + 1);
    if (buffer == nullptr) {
        (void)failure->SetMemory();
        return -1;
    }
    const core::string_ref normal(buffer, zarvo_normalize_path(path.data(), path.size(), buffer));
    if (m_Output->IsMissing()) {
        if (!normal.empty()) CheckNames(m_Output->Descriptor(), buffer, failure);
        return -1;
    }
    if (normal.empty()) return m_Output->Descriptor();

    // From the innermost folder that is open.
    int descriptor = m_Output->Descriptor();
    size_t begin = 0;
    for (Folder& folder : m_Folders) {
        const size_t size = folder.path.size();
        const bool isOnTheWay =
            size >= begin && normal.starts_with(folder.path) && (size == normal.size() || normal[size] == '/');
        if (!isOnTheWay) continue;
        descriptor = folder.descriptor;
        folder.lastUse = ++m_Uses;
        begin = size;
    }
    if (begin == normal.size()) return descriptor;
    size_t left = 1 + static_cast<size_t>(std::count(normal.begin() + begin + (begin != 0), normal.end(), '/'));
    bool isKept = true; // the descriptor at hand
    while (left != 0) {
        if (normal[begin] == '/') ++begin;
        const size_t end = std::min(normal.find('/', begin), normal.size());
        buffer[end] = '\0';
        const int inner = Enter(descriptor, buffer + begin, failure);
        if (end != normal.size()) buffer[end] = '/';
        if (inner < 0 && failure->code == ZARVO_OK) CheckNames(descriptor, buffer + begin, failure);
        if (!isKept) close(descriptor);
        if (inner < 0) return -1;
        descriptor = inner;
        begin = end;
        isKept = left-- <= maxKept; // those around them would soon give way to these
        if (isKept && !Keep(normal.substr(0, end), descriptor)) {
            close(descriptor);
            (void)failure->SetMemory();
            return -1;
        }
    }
    return descriptor;
}

Standing LookAt(int folder, const char* name) {
    struct stat status;
    Standing standing;
    if (fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return standing;
    standing.isThere = true;
    standing.isFolder = S_ISDIR(status.st_mode);
    standing.isSpecial = !standing.isFolder && !S_ISREG(status.st_mode) && !S_ISLNK(status.st_mode);
    standing.device = status.st_dev;
    standing.inode = status.st_ino;
    return standing;
}

zarvo_code CheckName(int folder, const char* name, Failure* failure) {
    struct stat status;
    const bool isTooLong = fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0 && errno == ENAMETOOLONG;
    return isTooLong ? failure->SetSystem(ENAMETOOLONG) : ZARVO_OK;
}

zarvo_code CheckCanMakeIn(int folder, Failure* failure) {
    return faccessat(folder, ".", W_OK | X_OK, AT_EACCESS) == 0 ? ZARVO_OK : failure->SetSystem(errno);
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

zarvo_code NewFile::Place(int folder, const char* name, bool replaces, Failure* failure) {
    const bool isNamed = IsNamed();
    if (isNamed && Close() != 0) return failure->SetSystem(errno);
    const int answer = isNamed ? RenameToNew(folder, m_Name, name) : LinkFile(m_Descriptor, folder, name);
    if (answer == 0) {
        m_Name[0] = '\0';
        if (Close() == 0) return ZARVO_OK;
        const int error = errno;
        unlinkat(folder, name, 0); // our own, and not whole
        return failure->SetSystem(error);
    }
    if (errno != EEXIST || !replaces) return failure->SetSystem(errno);
    if (!isNamed) {
        int linked = 0;
        do {
            MakeName(m_Name); // may be one that a killed process has left
            linked = LinkFile(m_Descriptor, folder, m_Name);
        } while (linked != 0 && errno == EEXIST);
        if (linked != 0) {
            m_Name[0] = '\0';
            return failure->SetSystem(errno);
        }
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
