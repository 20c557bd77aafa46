#include "Library/OutputFolder.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

template <typename Call>
auto RepeatOnInterrupt(Call&& call) {
    auto answer = call();
    while (answer == -1 && errno == EINTR)
        answer = call();
    return answer;
}

constexpr int kFolderFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

// Distinct names within this process; those of others are found out by O_EXCL.
std::atomic<UInt64> s_NextName{0};

} // namespace

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
        error = mkdir(start.c_str(), 0777) == 0 ? 0 : errno;
    }
    m_Descriptor = open(path, O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (m_Descriptor >= 0) return ZARVO_OK;
    const int openError = errno;
    return failure->SetSystem(error != 0 && error != EEXIST && openError == ENOENT ? error : openError);
}

FolderCache::~FolderCache() { (void)Close(); }

bool FolderCache::Close() {
    const bool hadAny = !m_Folders.empty();
    for (Folder& folder : m_Folders)
        close(folder.descriptor);
    m_Folders.clear();
    return hadAny;
}

// Opens a folder in another one, and makes it where it is missing.
int FolderCache::Enter(int above, const char* name, Failure* failure) {
    if (mkdirat(above, name, 0777) != 0 && errno != EEXIST) {
        (void)failure->SetSystem(errno);
        return -1;
    }
    const int descriptor = openat(above, name, kFolderFlags);
    if (descriptor >= 0) return descriptor;
    const int error = errno;
    struct stat status;
    const bool isLink = fstatat(above, name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(status.st_mode);
    (void)failure->SetSystem(error, isLink ? "a link is in the place of a folder" : nullptr);
    return -1;
}

bool FolderCache::Keep(core::string_ref path, int descriptor) {
    if (m_Folders.size() == kMaxFolders) {
        Folder* oldest = m_Folders.begin();
        for (Folder& folder : m_Folders)
            if (folder.lastUse < oldest->lastUse) oldest = &folder;
        close(oldest->descriptor);
        *oldest = std::move(m_Folders[kMaxFolders - 1]);
        (void)m_Folders.resize_initialized(kMaxFolders - 1); // never grows
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
    char* const buffer = m_Normal.grow(path.size() + 1);
    if (buffer == nullptr) {
        (void)failure->SetMemory();
        return -1;
    }
    const core::string_ref normal(buffer, zarvo_normalize_path(path.data(), path.size(), buffer));
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
    while (begin < normal.size()) {
        if (normal[begin] == '/') ++begin;
        const size_t end = std::min(normal.find('/', begin), normal.size());
        buffer[end] = '\0';
        descriptor = Enter(descriptor, buffer + begin, failure);
        if (end != normal.size()) buffer[end] = '/';
        if (descriptor < 0) return -1;
        if (!Keep(normal.substr(0, end), descriptor)) {
            close(descriptor);
            (void)failure->SetMemory();
            return -1;
        }
        begin = end;
    }
    return descriptor;
}

Standing LookAt(int folder, const char* name) {
    struct stat status;
    Standing standing;
    if (fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return standing;
    standing.isThere = true;
    standing.isFolder = S_ISDIR(status.st_mode);
    standing.device = status.st_dev;
    standing.inode = status.st_ino;
    return standing;
}

NewFile::~NewFile() {
    if (m_Descriptor >= 0) close(m_Descriptor);
    if (m_Name[0] != '\0') unlinkat(m_Folder, m_Name, 0);
    if (m_Folder >= 0) close(m_Folder);
}

// A name of our own that nothing has.
static void MakeName(char (&name)[32]) {
    (void)snprintf(name, sizeof(name), ".zarvo-%x-%llx", static_cast<unsigned>(getpid()),
                   static_cast<unsigned long long>(s_NextName.fetch_add(1, std::memory_order_relaxed)));
}

zarvo_code NewFile::Create(int folder, Failure* failure) {
    m_Descriptor = RepeatOnInterrupt([&] { return openat(folder, ".", O_TMPFILE | O_WRONLY | O_CLOEXEC, 0666); });
    if (m_Descriptor >= 0) return ZARVO_OK;
    // File systems, and kernels, that can't make a file without a name.
    if (errno == EOPNOTSUPP || errno == EISDIR || errno == EINVAL) return CreateNamed(folder, failure);
    return failure->SetSystem(errno);
}

zarvo_code NewFile::CreateNamed(int folder, Failure* failure) {
    m_Folder = fcntl(folder, F_DUPFD_CLOEXEC, 0);
    if (m_Folder < 0) return failure->SetSystem(errno);
    do {
        MakeName(m_Name);
        m_Descriptor = RepeatOnInterrupt(
            [&] { return openat(m_Folder, m_Name, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0666); });
    } while (m_Descriptor < 0 && errno == EEXIST);
    if (m_Descriptor >= 0) return ZARVO_OK;
    m_Name[0] = '\0';
    return failure->SetSystem(errno);
}

zarvo_code NewFile::Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) {
    while (size != 0) {
        const ssize_t written = RepeatOnInterrupt(
            [&] { return pwrite(m_Descriptor, bytes, static_cast<size_t>(size), static_cast<off_t>(offset)); });
        if (written < 0) return failure->SetSystem(errno);
        bytes += written;
        offset += static_cast<UInt64>(written);
        size -= static_cast<UInt64>(written);
    }
    return ZARVO_OK;
}

zarvo_code NewFile::Cut(UInt64 size, Failure* failure) {
    const int answer = RepeatOnInterrupt([&] { return ftruncate(m_Descriptor, static_cast<off_t>(size)); });
    return answer == 0 ? ZARVO_OK : failure->SetSystem(errno);
}

// Gives a file without a name one.
static int LinkFile(int descriptor, int folder, const char* name) {
    if (linkat(descriptor, "", folder, name, AT_EMPTY_PATH) == 0) return 0;
    if (errno != ENOENT && errno != EPERM && errno != EINVAL) return -1;
    char path[40]; // for kernels that let only the superuser do that
    (void)snprintf(path, sizeof(path), "/proc/self/fd/%d", descriptor);
    return linkat(AT_FDCWD, path, folder, name, AT_SYMLINK_FOLLOW);
}

zarvo_code NewFile::Place(int folder, const char* name, bool replaces, Failure* failure) {
    const bool isNamed = m_Name[0] != '\0';
    if (isNamed && m_Descriptor >= 0) {
        // The last word on whether the bytes are there; on some file systems it is said only now.
        const int descriptor = m_Descriptor;
        m_Descriptor = -1;
        if (close(descriptor) != 0 && errno != EINTR) return failure->SetSystem(errno);
    }
    int answer =
        isNamed ? renameat2(folder, m_Name, folder, name, RENAME_NOREPLACE) : LinkFile(m_Descriptor, folder, name);
    const bool canNotRefuse = isNamed && answer != 0 && (errno == EINVAL || errno == ENOSYS);
    if (canNotRefuse) answer = linkat(folder, m_Name, folder, name, 0); // refuses what is there, and leaves both names
    if (answer == 0) {
        if (isNamed && !canNotRefuse) m_Name[0] = '\0';
    } else if (errno == EEXIST && replaces) {
        if (!isNamed) {
            MakeName(m_Name);
            if (LinkFile(m_Descriptor, folder, m_Name) != 0) {
                m_Name[0] = '\0';
                return failure->SetSystem(errno);
            }
            m_Folder = fcntl(folder, F_DUPFD_CLOEXEC, 0);
        }
        if (renameat(folder, m_Name, folder, name) != 0) {
            const int error = errno;
            if (unlinkat(folder, m_Name, 0) == 0) m_Name[0] = '\0';
            return failure->SetSystem(error);
        }
        m_Name[0] = '\0';
    } else {
        return failure->SetSystem(errno);
    }
    if (m_Descriptor < 0) return ZARVO_OK;
    const int descriptor = m_Descriptor;
    m_Descriptor = -1;
    if (close(descriptor) == 0 || errno == EINTR) return ZARVO_OK;
    const int error = errno;
    unlinkat(folder, name, 0); // our own, and not whole
    return failure->SetSystem(error);
}

zarvo_code PlaceEmptyFile(int folder, const char* name, Failure* failure) {
    const int flags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
    const int descriptor = RepeatOnInterrupt([&] { return openat(folder, name, flags, 0666); });
    if (descriptor < 0) return failure->SetSystem(errno);
    return close(descriptor) == 0 || errno == EINTR ? ZARVO_OK : failure->SetSystem(errno);
}
