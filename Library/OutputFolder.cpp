#include "Library/OutputFolder.h"

#include "PlatformDependent/Linux/RepeatOnInterrupt.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

constexpr int kFolderFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

bool IsOutOfDescriptors(const Failure& failure) { return failure.systemCode == EMFILE || failure.systemCode == ENFILE; }

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
        const int answer = RepeatOnInterrupt([&] { return mkdir(start.c_str(), 0777); }) == 0 ? 0 : errno;
        // What lies below a folder that can't be made is missing: that is no reason of its own.
        if (answer != ENOENT || error == 0 || error == EEXIST) error = answer;
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
