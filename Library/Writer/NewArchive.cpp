#include "Library/Writer/NewArchive.h"

#include "Library/NewFile.h"
#include "Library/OutputFolder.h"
#include "PlatformDependent/Linux/FileDescriptor.h"
#include "PlatformDependent/Linux/RepeatOnInterrupt.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

NewArchive::~NewArchive() {
    if (m_Descriptor >= 0) {
        (void)unlinkat(m_Folder, m_Unfinished.c_str(), 0); // while the lock is held
        close(m_Descriptor);
    }
    if (m_Folder >= 0) close(m_Folder);
}

zarvo_code NewArchive::FindPlace(const char* path, Failure* failure) {
    constexpr core::string_ref kBefore(".", 1);
    constexpr core::string_ref kAfter(".zarvo-part", 11);
    const core::string_ref whole(path);
    const size_t slash = whole.rfind('/');
    const core::string_ref name = slash == core::string_ref::npos ? whole : whole.substr(slash + 1);
    if (name.empty() || name == "." || name == "..") return failure->SetSystem(EISDIR);
    if (name.size() > NAME_MAX) return failure->SetSystem(ENAMETOOLONG);
    // Of a very long name, as much as fits.
    const core::string_ref start = name.substr(0, NAME_MAX - kBefore.size() - kAfter.size());
    m_Name = name;
    m_Unfinished = kBefore;
    m_Unfinished += start;
    m_Unfinished += kAfter;

    core::string folder(kMemLabelGeneral);
    if (folder.grow(whole.size() + 1) == nullptr) return failure->SetMemory();
    folder = slash == core::string_ref::npos ? core::string_ref(".") : whole.substr(0, slash + 1);
    m_Folder = RepeatOnInterrupt([&] { return open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); });
    if (m_Folder < 0 || fstat(m_Folder, &m_FolderStatus) != 0) return failure->SetSystem(errno);
    return ZARVO_OK;
}

bool NewArchive::IsPlace(const struct stat& folder, core::string_ref name) const {
    return m_Folder >= 0 && folder.st_dev == m_FolderStatus.st_dev && folder.st_ino == m_FolderStatus.st_ino &&
           (m_Name == name || m_Unfinished == name);
}

zarvo_code NewArchive::CheckPlace(bool isReplacing, Failure* failure) const {
    const Standing standing = LookAt(m_Folder, m_Name.c_str());
    if (!standing.isThere) return ZARVO_OK;
    if (standing.isFolder) return failure->SetSystem(EISDIR);
    if (!isReplacing) return failure->SetSystem(EEXIST);
    return standing.isSpecial ? failure->SetSystem(EEXIST, "a device, pipe or socket is not replaced") : ZARVO_OK;
}

zarvo_code NewArchive::CheckCanOpen(Failure* failure) const { return CheckCanMakeIn(m_Folder, failure); }

// Makes the file, or removes one that a killed run has left; *isDone says which. A lock is on the file that it opened,
// which another run may have finished or removed meanwhile.
zarvo_code NewArchive::OpenLocked(bool* hasLeftover, bool* isDone, Failure* failure) {
    constexpr int kFlags = O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;
    const char* const name = m_Unfinished.c_str();
    bool isNew = true;
    int opened = RepeatOnInterrupt([&] { return openat(m_Folder, name, kFlags | O_EXCL, 0666); });
    if (opened < 0 && errno == EEXIST) {
        isNew = false;
        opened = RepeatOnInterrupt([&] { return openat(m_Folder, name, kFlags, 0666); });
        if (opened < 0) return failure->SetSystem(errno, "something is in the unfinished file's place");
    }
    if (opened < 0) return failure->SetSystem(errno);
    FileDescriptor file(opened);
    const int locked = RepeatOnInterrupt([&] { return flock(opened, LOCK_EX | LOCK_NB); });
    const int error = locked == 0 ? 0 : errno;
    if (error == EWOULDBLOCK) return failure->SetSystem(EBUSY, "another run is making this archive");
    struct stat status;
    if (fstat(opened, &status) != 0 || !S_ISREG(status.st_mode))
        return failure->SetSystem(EEXIST, "something is in the unfinished file's place");
    // A new file can do without a lock where the file system has none.
    if (error != 0 && !isNew) return failure->SetSystem(error, "an unfinished file can't be locked");
    const Standing named = LookAt(m_Folder, name);
    if (!named.isThere || named.device != status.st_dev || named.inode != status.st_ino) return ZARVO_OK;
    if (!isNew) {
        *hasLeftover = true;
        return unlinkat(m_Folder, name, 0) == 0 ? ZARVO_OK : failure->SetSystem(errno);
    }
    *isDone = true;
    m_Descriptor = file.Release();
    return ZARVO_OK;
}

zarvo_code NewArchive::Open(bool isReplacing, bool* hasLeftover, Failure* failure) {
    m_IsReplacing = isReplacing;
    *hasLeftover = false;
    for (bool isDone = false; !isDone;)
        if (const zarvo_code code = OpenLocked(hasLeftover, &isDone, failure); code != ZARVO_OK) return code;
    return ZARVO_OK;
}

zarvo_code NewArchive::Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) {
    return WriteAt(m_Descriptor, offset, bytes, size, failure);
}

zarvo_code NewArchive::Finish(Failure* failure) {
    if (RepeatOnInterrupt([&] { return fsync(m_Descriptor); }) != 0) return failure->SetSystem(errno);
    const char* const unfinished = m_Unfinished.c_str();
    const int named = m_IsReplacing ? renameat(m_Folder, unfinished, m_Folder, m_Name.c_str())
                                    : RenameToNew(m_Folder, unfinished, m_Name.c_str());
    if (named != 0) return failure->SetSystem(errno);
    close(m_Descriptor); // its bytes are on the disk
    m_Descriptor = -1;
    // Not every file system can do that with folders.
    const int synced = RepeatOnInterrupt([&] { return fsync(m_Folder); });
    if (synced == 0 || errno == EINVAL) return ZARVO_OK;
    return failure->SetSystem(errno, "the archive has its name, but its folder may not be on the disk");
}
