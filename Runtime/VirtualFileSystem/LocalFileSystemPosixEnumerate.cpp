// The POSIX back end's listing of folders.
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"

#include <cstring>
#include <dirent.h>
#include <sys/stat.h>

using core::string_ref;

bool FlaggedAsSkipped(bool isDirectory, bool isHidden, string_ref name, FileEnumerationFlag flags) {
    constexpr size_t kTemporaryLength = 4;
    const UInt32 byKind = isHidden ? (isDirectory ? kFileEnumerationSkipHiddenFolders : kFileEnumerationSkipHiddenFiles)
                                   : (isDirectory ? kFileEnumerationSkipFolders : kFileEnumerationSkipFiles);
    if ((flags & byKind) != 0) return true;
    if ((flags & kFileEnumerationSkipByName) != 0) {
        if (!name.empty() && (name[0] == '.' || name[name.size() - 1] == '~')) return true;
        if (name.compare("cvs", kCaseInsensitive) == 0) return true;
    }
    return (flags & kFileEnumerationSkipTemporary) != 0 && !isDirectory && name.size() >= kTemporaryLength &&
           name.substr(name.size() - kTemporaryLength).compare(".tmp", kCaseInsensitive) == 0;
}

namespace {

// The innermost folder that this thread's listing is inside. The recursion can't pass it on, as it goes through the
// virtual Enumerate, whose parameters are fixed.
thread_local const OpenFolder* tInnermostFolder = nullptr;

// Makes a folder the innermost one for as long as it lives.
class ScopedInnermostFolder : private NonCopyable {
public:
    explicit ScopedInnermostFolder(int descriptor) {
        struct stat status = {};
        (void)fstat(descriptor, &status); // can't fail for an open folder
        m_Folder = {status.st_dev, status.st_ino, tInnermostFolder};
        tInnermostFolder = &m_Folder;
    }
    ~ScopedInnermostFolder() { tInnermostFolder = m_Folder.outer; }

    const OpenFolder& Get() const { return m_Folder; }

private:
    OpenFolder m_Folder;
};

// Owns a folder's stream.
class FolderStream : private NonCopyable {
public:
    explicit FolderStream(const char* path) {
        do
            m_Stream = opendir(path);
        while (m_Stream == nullptr && errno == EINTR);
    }
    ~FolderStream() {
        if (m_Stream != nullptr) closedir(m_Stream);
    }

    bool IsOpen() const { return m_Stream != nullptr; }
    int GetDescriptor() const { return dirfd(m_Stream); }

    // The next name, skipping "." and ".."; null at the end. Valid until the next call.
    const char* Next() {
        while (const dirent* record = readdir(m_Stream)) {
            const char* name = record->d_name;
            if (strcmp(name, ".") != 0 && strcmp(name, "..") != 0) return name;
        }
        return nullptr;
    }

private:
    DIR* m_Stream;
};

// status is null for a dangling link: only its name is known then.
void Describe(FileEntryInfo& info, string_ref path, const struct stat* status, bool isLink, bool isHidden) {
    strcpy_truncate(info.path, path.data(), sizeof(info.path), path.size());
    UInt32 flags = 0;
    if (isLink) flags |= kFileEntryIsSymLink;
    if (isHidden) flags |= kFileEntryIsHidden;
    if (status != nullptr) {
        info.size = static_cast<UInt64>(status->st_size);
        UnixTimeToZarvoTime(status->st_mtime, info.lastModified);
        if (S_ISDIR(status->st_mode)) flags |= kFileEntryIsDirectory;
        if ((status->st_mode & S_IWUSR) == 0) flags |= kFileEntryIsReadOnly;
    }
    info.flags = static_cast<UInt8>(flags);
}

void AddSize(void** handlerData, UInt64 size) {
    const bool hasCounter = handlerData != nullptr && *handlerData != nullptr;
    if (Check(hasCounter, FixedReports::kSumHasNoCounter)) *static_cast<UInt64*>(*handlerData) += size;
}

} // namespace

bool LocalFileSystemPosix::Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                                     void** handlerData, FileEnumerationFlag flags) const {
    constexpr size_t kMaxNameLength = 1024;
    const bool isSumming = (flags & kFileEnumerationSumSizes) != 0;
    if (isSumming)
        AssertImplementation(0, "Runtime/VirtualFileSystem/LocalFileSystemPosix", __LINE__, -1,
                             "Filesystem does not support storing size during enumeration outside of Zarvo Editor.");
    FolderStream stream(path);
    if (!stream.IsOpen()) return false;
    const ScopedInnermostFolder folder(stream.GetDescriptor());

    core::string working(kMemLabelGeneral);
    RequireMemory(working.grow(strlen(path) + 1 + kMaxNameLength)); // the longest path, so that appending can't fail
    working = path;
    if (working.back() != '/') working += '/';
    const size_t prefixLength = working.size();
    while (const char* name = stream.Next()) {
        working.truncate(prefixLength);
        working.append(name, strnlen(name, kMaxNameLength));
        struct stat linkStatus;
        if (!GetLinkStatus(working.c_str(), &linkStatus)) continue; // removed meanwhile
        const bool isLink = S_ISLNK(linkStatus.st_mode);
        struct stat status = linkStatus;
        const bool hasStatus = !isLink || GetStatus(working.c_str(), &status);
        const bool isFolder = hasStatus && S_ISDIR(status.st_mode);
        const bool isHidden = name[0] == '.';
        if (FlaggedAsSkipped(isFolder, isHidden, name, flags)) continue;
        if (!isSumming)
            Describe(out->emplace_back(), working, hasStatus ? &status : nullptr, isLink, isHidden);
        else
            AddSize(handlerData, hasStatus && !isFolder ? static_cast<UInt64>(status.st_size) : 0);
        if (!isFolder || !recursive || folder.Get().IsInside(status)) continue;
        if (!Enumerate(working.c_str(), out, true, handlerData, flags)) return false;
    }
    return true;
}
