#include "Library/Writer/FolderEntries.h"

#include "Library/Patterns.h"
#include "Library/Progress.h"
#include "PlatformDependent/Linux/RepeatOnInterrupt.h"
#include "Runtime/Allocator/Allocator.h"

#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

FolderEntries::Reason ReasonOf(mode_t mode) {
    if (S_ISLNK(mode)) return FolderEntries::kLink;
    if (S_ISFIFO(mode)) return FolderEntries::kPipe;
    return S_ISSOCK(mode) ? FolderEntries::kSocket : FolderEntries::kDevice;
}

} // namespace

// Lists the folders one after another: those that are found are listed later.
class FolderEntries::Search {
public:
    Search(const OutputFolder* root, const zarvo_run_options& options, const NewArchive& place, Findings* findings)
        : m_Folders(root, kFoldersOfSearch, FolderCache::kRefuse),
          m_Options(options),
          m_Place(place),
          m_Findings(findings),
          m_Path(findings->failed),
          m_Clock({}) {}

    zarvo_code ListAll(Failure* failure) {
        const EntryList& files = *m_Findings->files;
        zarvo_code code = ListFolder({}, failure);
        for (size_t index = 0; code == ZARVO_OK && index < files.size(); ++index)
            if (EntryList::IsFolder(files[index])) code = ListFolder(files.PathOf(index), failure);
        return code;
    }

private:
    static constexpr size_t kFoldersOfSearch = 8; // of the 16 descriptors that a process may be down to

    zarvo_code ListFolder(core::string_ref path, Failure* failure) {
        if (m_Path.grow(path.size() + NAME_MAX + 2) == nullptr) return failure->SetMemory();
        m_Path = path; // the list may move its paths
        DIR* const folder = OpenFolder(failure);
        if (folder == nullptr) return FailWith(true, failure);
        if (!path.empty()) m_Path += '/';
        m_FolderPathSize = m_Path.size();
        const zarvo_code code = ListNames(folder, failure);
        (void)closedir(folder); // it was only read
        return code;
    }

    DIR* OpenFolder(Failure* failure) {
        const int found = m_Folders.Get(m_Path, failure);
        if (found < 0) return nullptr;
        const int descriptor =
            RepeatOnInterrupt([&] { return openat(found, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC); });
        DIR* const folder = descriptor >= 0 ? fdopendir(descriptor) : nullptr;
        if (folder != nullptr) return folder;
        (void)failure->SetSystem(errno);
        if (descriptor >= 0) close(descriptor);
        return nullptr;
    }

    zarvo_code ListNames(DIR* folder, Failure* failure) {
        struct stat status;
        if (fstat(dirfd(folder), &status) != 0) {
            (void)failure->SetSystem(errno);
            return FailWith(true, failure);
        }
        while (true) {
            if (m_Clock.IsDue() && !TellProgress(m_Options, {.filesTotal = m_Findings->files->size()}))
                return failure->SetStopped();
            errno = 0;
            const dirent* const found = readdir(folder);
            if (found == nullptr && errno == 0) return ZARVO_OK;
            if (found == nullptr) {
                (void)failure->SetSystem(errno);
                m_Path.truncate(m_FolderPathSize);
                return FailWith(true, failure);
            }
            const core::string_ref name(found->d_name);
            if (name == "." || name == ".." || m_Place.IsPlace(status, name)) continue;
            m_Path.truncate(m_FolderPathSize);
            // On some file systems, names are longer than NAME_MAX.
            if (m_Path.grow(m_FolderPathSize + name.size()) == nullptr) return failure->SetMemory();
            m_Path += name;
            if (const zarvo_code code = AddFound(dirfd(folder), found->d_name, failure); code != ZARVO_OK) return code;
        }
    }

    zarvo_code AddFound(int folder, const char* name, Failure* failure) {
        if (m_Options.excluded != nullptr) {
            const int isExcluded = m_Options.excluded->Match(m_Path);
            if (isExcluded < 0) return failure->SetMemory();
            if (isExcluded != 0) return ZARVO_OK;
        }
        struct stat status;
        if (fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) != 0) {
            (void)failure->SetSystem(errno);
            return FailWith(false, failure);
        }
        const bool isFolder = S_ISDIR(status.st_mode);
        if (!isFolder && !S_ISREG(status.st_mode)) {
            const bool isKept = m_Findings->leftOut->Add(m_Path, 0, 0, ReasonOf(status.st_mode));
            return isKept ? ZARVO_OK : failure->SetMemory();
        }
        if (core::string_ref(name).find('\\') != core::string_ref::npos) {
            (void)failure->Set(ZARVO_ERROR_REFUSED, "the name holds \"\\\", which separates folders in archives");
            return FailWith(isFolder, failure);
        }
        const UInt64 size = isFolder ? 0 : static_cast<UInt64>(status.st_size);
        const bool isKept = m_Findings->files->Add(m_Path, isFolder ? EntryList::kFolder : 0, size);
        return isKept ? ZARVO_OK : failure->SetMemory();
    }

    zarvo_code FailWith(bool isFolder, Failure* failure) {
        m_Findings->isFailedFolder = isFolder;
        return failure->code;
    }

    FolderCache m_Folders;
    const zarvo_run_options& m_Options;
    const NewArchive& m_Place;
    Findings* m_Findings;
    core::string& m_Path;        // of what is at hand, and so of what fails
    size_t m_FolderPathSize = 0; // of the folder that is listed, with "/"
    ProgressClock m_Clock;       // begins in the distant past: the first name is told at once
};

FolderEntries::~FolderEntries() {
    for (Reader* reader : m_Readers)
        Delete(reader, kMemLabelFileSystem);
}

zarvo_code FolderEntries::List(const zarvo_run_options& options, const NewArchive& place, Findings* findings,
                               Failure* failure) {
    Search search(&m_Root, options, place, findings);
    return search.ListAll(failure);
}

bool FolderEntries::PrepareToRead(UInt32 threads) {
    if (!m_Readers.reserve(threads)) return false;
    while (m_Readers.size() < threads) {
        Reader* const reader = New<Reader>(kMemLabelFileSystem, &m_Root);
        if (reader == nullptr) return false;
        m_Readers.push_back(reader);
    }
    return true;
}

// The descriptor of a file's folder, which is the reader's, or -1 after a failure. *name: the file's name in it.
int FolderEntries::FindFolder(Reader* reader, core::string_ref path, const char** name, Failure* failure) {
    const size_t slash = path.rfind('/');
    *name = path.data() + (slash == core::string_ref::npos ? 0 : slash + 1);
    return reader->folders.Get(path.substr(0, slash == core::string_ref::npos ? 0 : slash), failure);
}

// Folders that are kept open give way when descriptors run out.
int FolderEntries::OpenFile(Reader* reader, core::string_ref path, Failure* failure) {
    for (bool isSecondTry = false;; isSecondTry = true) {
        *failure = {};
        const char* name = nullptr;
        const int folder = FindFolder(reader, path, &name, failure);
        if (folder >= 0) {
            // Not to wait for a pipe that has taken the file's place.
            constexpr int kFlags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
            const int descriptor = RepeatOnInterrupt([&] { return openat(folder, name, kFlags); });
            if (descriptor >= 0) return descriptor;
            (void)failure->SetSystem(errno, errno == ELOOP ? "a link is in the place of a file" : nullptr);
        }
        if (isSecondTry || !IsOutOfDescriptors(*failure) || !reader->folders.Close()) return -1;
    }
}

// Whether an open file is still what the list says it is.
static zarvo_code CheckSize(int descriptor, UInt64 size, Failure* failure) {
    struct stat status;
    if (fstat(descriptor, &status) != 0) return failure->SetSystem(errno);
    if (S_ISREG(status.st_mode) && static_cast<UInt64>(status.st_size) == size) return ZARVO_OK;
    return failure->Set(ZARVO_ERROR_CHANGED, "the file has changed: it had %llu bytes",
                        static_cast<unsigned long long>(size));
}

static zarvo_code ReadFully(int descriptor, UInt64 offset, UInt8* bytes, size_t size, Failure* failure) {
    while (size != 0) {
        const ssize_t got =
            RepeatOnInterrupt([&] { return pread(descriptor, bytes, size, static_cast<off_t>(offset)); });
        if (got < 0) return failure->SetSystem(errno);
        // It has become shorter meanwhile, or is one of those that have less than their size says.
        if (got == 0)
            return failure->Set(ZARVO_ERROR_CHANGED, "the file ends after %llu bytes",
                                static_cast<unsigned long long>(offset));
        bytes += got;
        offset += static_cast<UInt64>(got);
        size -= static_cast<size_t>(got);
    }
    return ZARVO_OK;
}

zarvo_code FolderEntries::Read(UInt32 thread, const EntryList& list, const EntryList::Entry& entry, UInt64 offset,
                               UInt8* bytes, size_t size, Failure* failure) {
    const int descriptor = OpenFile(m_Readers[thread], list.PathOf(entry), failure);
    if (descriptor < 0) return failure->code;
    zarvo_code code = CheckSize(descriptor, entry.size, failure);
    if (code == ZARVO_OK && size != 0) {
        code = ReadFully(descriptor, offset, bytes, size, failure);
        if (code == ZARVO_OK) code = CheckSize(descriptor, entry.size, failure); // it may have changed meanwhile
    }
    close(descriptor);
    return code;
}

zarvo_code FolderEntries::CheckCanRead(const EntryList& list, const EntryList::Entry& entry, Failure* failure) {
    if (!PrepareToRead(1)) return failure->SetMemory();
    const char* name = nullptr;
    const int folder = FindFolder(m_Readers[0], list.PathOf(entry), &name, failure);
    if (folder < 0) return failure->code;
    return faccessat(folder, name, R_OK, AT_EACCESS) == 0 ? ZARVO_OK : failure->SetSystem(errno);
}
