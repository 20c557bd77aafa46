// The platform's file manager and workspace: how they create, copy and trash files.
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "PlatformDependent/OSX/Standin/Objects.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr char kRecycle[] = "recycle";
constexpr size_t kCopySize = 65536;
constexpr int kMaxLinks = 40; // per path, the system's own limit
constexpr mode_t kModeBits = 07777;

bool ExistsItself(const std::string& path) {
    struct stat status;
    return lstat(path.c_str(), &status) == 0;
}

std::string ReadLink(const std::string& path) {
    char buffer[PATH_MAX];
    const ssize_t length = readlink(path.c_str(), buffer, sizeof(buffer));
    return std::string(buffer, length > 0 ? static_cast<size_t>(length) : 0);
}

// The names in a folder without "." and ".."; false when it can't be read.
bool ListNames(const std::string& path, std::vector<std::string>* names) {
    DIR* folder = opendir(path.c_str());
    if (folder == nullptr) return false;
    errno = 0;
    while (const dirent* entry = readdir(folder)) {
        const std::string name = entry->d_name;
        if (name != "." && name != "..") names->push_back(name);
    }
    const bool complete = errno == 0;
    closedir(folder);
    return complete;
}

void RemoveTree(const std::string& path) {
    struct stat status;
    if (lstat(path.c_str(), &status) != 0) return;
    if (!S_ISDIR(status.st_mode)) {
        unlink(path.c_str());
        return;
    }
    std::vector<std::string> names;
    ListNames(path, &names);
    for (const std::string& name : names)
        RemoveTree(path + "/" + name);
    rmdir(path.c_str());
}

bool CopyBytes(int from, int to) {
    char buffer[kCopySize];
    for (;;) {
        const ssize_t count = read(from, buffer, sizeof(buffer));
        if (count <= 0) return count == 0;
        for (ssize_t done = 0; done < count;) {
            const ssize_t written = write(to, buffer + done, static_cast<size_t>(count - done));
            if (written < 0) return false;
            done += written;
        }
    }
}

bool CopyFile(const std::string& source, const std::string& destination, mode_t mode) {
    const int from = open(source.c_str(), O_RDONLY | O_CLOEXEC);
    if (from < 0) return false;
    const int to = open(destination.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    bool copied = to >= 0 && CopyBytes(from, to) && fchmod(to, mode) == 0;
    if (to >= 0 && close(to) != 0) copied = false;
    close(from);
    return copied;
}

bool CopyTree(const std::string& source, const std::string& destination) {
    struct stat status;
    if (lstat(source.c_str(), &status) != 0) return false;
    if (S_ISREG(status.st_mode)) return CopyFile(source, destination, status.st_mode & kModeBits);
    if (S_ISLNK(status.st_mode)) return symlink(ReadLink(source).c_str(), destination.c_str()) == 0;
    if (!S_ISDIR(status.st_mode)) return false;

    std::vector<std::string> names;
    if (!ListNames(source, &names) || mkdir(destination.c_str(), 0700) != 0) return false;
    for (const std::string& name : names)
        if (!CopyTree(source + "/" + name, destination + "/" + name)) return false;
    return chmod(destination.c_str(), status.st_mode & kModeBits) == 0; // last, as it may forbid writing
}

std::string ResolvedWithSlash(const std::string& path) {
    const std::string resolved = ResolveLinks(path);
    return resolved == "/" ? resolved : resolved + "/";
}

// Whether path, which need not exist, lies inside folder. A folder can't be copied into itself.
bool LiesInside(const std::string& path, const std::string& folder) {
    return ResolvedWithSlash(path.substr(0, path.find_last_of('/') + 1) + ".").starts_with(ResolvedWithSlash(folder));
}

// Moves a file or folder to the trash, with a number after its name if the name is taken.
bool MoveIntoTrash(const std::string& folder, const std::string& name) {
    const std::string trash = Platform_HomeDirectory()->text + "/.Trash";
    if (mkdir(trash.c_str(), 0700) != 0 && errno != EEXIST) return false;
    std::string target = trash + "/" + name;
    for (int number = 2; ExistsItself(target); ++number)
        target = trash + "/" + name + " " + std::to_string(number);
    return rename((folder + "/" + name).c_str(), target.c_str()) == 0;
}

} // namespace

// Unlike the platform, this does not expand a leading "~" or drop a leading "/private", which mean nothing here.
std::string ResolveLinks(const std::string& path) {
    const bool absolute = !path.empty() && path[0] == '/';
    std::string resolved = absolute ? "/" : "";
    std::string rest = path;
    int links = 0;
    while (!rest.empty()) {
        const size_t start = std::min(rest.find_first_not_of('/'), rest.size());
        const size_t end = std::min(rest.find('/', start), rest.size());
        const std::string component = rest.substr(start, end - start);
        rest.erase(0, end);
        if (component.empty() || component == ".") continue;

        const std::string candidate = resolved + (resolved.empty() || resolved.back() == '/' ? "" : "/") + component;
        const size_t slash = resolved.find_last_of('/');
        const std::string last = resolved.substr(slash == std::string::npos ? 0 : slash + 1);
        if (component == ".." && resolved == "/") continue;
        if (component == ".." && !last.empty() && last != "..") {
            resolved.erase(slash == std::string::npos ? 0 : slash == 0 ? 1 : slash); // its links are resolved already
            continue;
        }
        const std::string target = ReadLink(candidate);
        if (target.empty() || ++links > kMaxLinks) {
            resolved = candidate;
            continue;
        }
        if (target[0] == '/') resolved = "/";
        rest = target + rest;
    }
    return resolved.empty() && !path.empty() ? "." : resolved;
}

bool NSFileManager_fileExistsAtPath(NSString* path) {
    struct stat status;
    return path != nullptr && stat(path->text.c_str(), &status) == 0;
}

bool NSFileManager_createFileAtPath(NSString* path) {
    if (path == nullptr) return false;
    const int descriptor = open(path->text.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
    return descriptor >= 0 && close(descriptor) == 0;
}

bool NSFileManager_copyItemAtPath(NSString* source, NSString* destination) {
    if (source == nullptr || destination == nullptr) return false;
    if (ExistsItself(destination->text) || LiesInside(destination->text, source->text)) return false;
    if (CopyTree(source->text, destination->text)) return true;
    RemoveTree(destination->text);
    return false;
}

NSString* Platform_RecycleOperation() { return MakeAutoreleased<NSString>(std::string(kRecycle)); }

bool NSWorkspace_performFileOperation(NSString* operation, NSString* source, NSString*, NSArray* files, int* tag) {
    *tag = 0;
    if (gStandinFaults.trashRefuses || operation == nullptr || source == nullptr || files == nullptr) return false;
    if (operation->text != kRecycle) return false;
    bool moved = true;
    for (NSString* name : files->objects)
        if (name == nullptr || !MoveIntoTrash(source->text, name->text)) moved = false;
    return moved;
}
