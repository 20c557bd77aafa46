// The values that the file system's operations exchange: sizes and offsets with checked conversions, enumerations,
// and FileEntryData, the record that handlers work on. Plain values; an object belongs to one thread at a time.
#pragma once

#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"
#include "Runtime/Utilities/DateTime.h"

#include <compare>
#include <limits>
#include <type_traits>

class FileAccessorHandler;
class FileSystemHandler;

namespace VFS {

// Report a conversion that changes the value: one too large for its target, and a negative one to an unsigned type.
void ReportValueTooLarge();
void ReportNegativeValue();

// Converts value to Target. A value that Target can't hold is reported, then converted by keeping its low bits.
template <typename Target, typename Source>
constexpr Target CheckedCast(Source value) {
    if constexpr (std::is_signed_v<Source> && std::is_unsigned_v<Target>) {
        if (value < 0) {
            ReportNegativeValue();
            return static_cast<Target>(value);
        }
    }
    using Common = std::common_type_t<std::make_unsigned_t<Source>, std::make_unsigned_t<Target>>;
    if (value > 0 && static_cast<Common>(value) > static_cast<Common>(std::numeric_limits<Target>::max()))
        ReportValueTooLarge();
    return static_cast<Target>(value);
}

// A byte count or a position.
class FileSize {
public:
    constexpr FileSize() = default;
    constexpr FileSize(UInt64 value) : m_Value(value) {}

    // See CheckedCast.
    template <typename Target>
    constexpr Target Cast() const {
        return CheckedCast<Target>(m_Value);
    }

    friend constexpr auto operator<=>(FileSize, FileSize) = default;

private:
    UInt64 m_Value = 0;
};

// A signed distance.
class FileOffset {
public:
    constexpr FileOffset() = default;
    constexpr FileOffset(SInt64 value) : m_Value(value) {}
    // A size above 2^63 - 1 is reported and becomes negative.
    explicit constexpr FileOffset(FileSize size) : m_Value(size.Cast<SInt64>()) {}

    template <typename Target>
    constexpr Target Cast() const {
        return CheckedCast<Target>(m_Value);
    }

    friend constexpr auto operator<=>(FileOffset, FileOffset) = default;

private:
    SInt64 m_Value = 0;
};

static_assert(sizeof(FileSize) == 8 && sizeof(FileOffset) == 8);

} // namespace VFS

// How a file is opened.
enum FilePermission : SInt32 {
    kFilePermissionRead = 0,      // the file must exist
    kFilePermissionWrite = 1,     // write only; created if missing, emptied if present
    kFilePermissionReadWrite = 2, // opened as it is, or created empty if it can't be opened
    kFilePermissionAppend = 3,    // write only at the end; created if missing
};

// A hint that Open passes to the handler. The handlers here ignore it.
enum FileAutoBehavior : SInt32 {
    kFileAutoBehaviorNone = 0,
    kFileAutoBehaviorLock = 1, // the file is opened to be locked
};

// A bit set passed with every read. Only the archive reader uses it.
enum FileReadFlags : UInt32 {
    kFileReadFlagsNone = 0,
    kFileReadFlagsThroughCache = 1, // whole archive blocks go through the block cache too
};

// The base of a seek.
enum FileOrigin : SInt32 {
    kFileOriginBegin = 1,
    kFileOriginCurrent = 2,
    kFileOriginEnd = 3,
};

// The values are flock's.
enum FileLockMode : SInt32 {
    kFileLockShared = 1,
    kFileLockExclusive = 2,
    kFileLockUnlock = 8,
};

// The code that an operation leaves in an entry's lastError.
enum FileSystemError : UInt32 {
    kFileSystemErrorNone = 0,
    kFileSystemErrorNotFound = 1,      // ENOENT
    kFileSystemErrorAlreadyExists = 7, // EEXIST
    kFileSystemErrorAccessDenied = 9,  // EPERM, EACCES
    kFileSystemErrorCrossDevice = 10,  // EXDEV
    kFileSystemErrorUnknown = 14,      // any other errno
    kFileSystemErrorNotSupported = 15, // the handler has no such operation
};

// An entry holds paths of up to kMaxPathLength characters and a NUL; longer ones are cut.
constexpr size_t kPathBufferSize = 1040;
constexpr size_t kMaxPathLength = kPathBufferSize - 1;

// Bits of FileEntryInfo::flags; also the bits that SetFlags takes.
enum FileEntryFlags : UInt8 {
    kFileEntryIsDirectory = 1,
    kFileEntryIsSymLink = 2,
    kFileEntryIsHidden = 4,
    kFileEntryIsReadOnly = 8,
};

// What GetFileEntryInfo and Enumerate report about one file or folder.
struct FileEntryInfo {
    UInt64 size = 0; // bytes; for a folder, what the platform reports
    DateTime lastModified;
    UInt8 flags = 0; // FileEntryFlags
    char path[kPathBufferSize] = {};
};

// The fields that GetFileEntryInfo is asked to fill, and in its result those that it filled.
enum FileEntryInfoQueryFlags : UInt32 {
    kFileEntryQueryNone = 0,
    kFileEntryQuerySize = 0x004, // always filled together with the modification time
    kFileEntryQueryDirectory = 0x010,
    kFileEntryQuerySymLink = 0x020,
    kFileEntryQueryHidden = 0x040,
    kFileEntryQueryExists = 0x080, // returned only when the entry exists
    kFileEntryQueryLastModified = 0x100,
    kFileEntryQueryReadOnly = 0x200,
};
constexpr FileEntryInfoQueryFlags operator|(FileEntryInfoQueryFlags a, FileEntryInfoQueryFlags b) {
    return static_cast<FileEntryInfoQueryFlags>(static_cast<UInt32>(a) | static_cast<UInt32>(b));
}

// What an enumeration skips. A name is hidden when it starts with "." (on macOS, when it carries the hidden flag).
enum FileEnumerationFlag : UInt32 {
    kFileEnumerationAll = 0,
    kFileEnumerationSkipHiddenFiles = 0x02,
    kFileEnumerationSkipHiddenFolders = 0x04,
    kFileEnumerationSkipFiles = 0x08,     // visible ones
    kFileEnumerationSkipFolders = 0x10,   // visible ones
    kFileEnumerationSkipByName = 0x20,    // names that start with ".", equal "cvs" or end with "~"
    kFileEnumerationSkipTemporary = 0x40, // files that end with .tmp in any case
    kFileEnumerationSumSizes = 0x80,      // no filter: sums sizes instead of listing entries
};
constexpr FileEnumerationFlag operator|(FileEnumerationFlag a, FileEnumerationFlag b) {
    return static_cast<FileEnumerationFlag>(static_cast<UInt32>(a) | static_cast<UInt32>(b));
}

// A path bound to the handlers that serve it. A new one is empty: no path, null pointers. The destructor calls
// DestroyFileEntry of the handler, if there is one.
struct FileEntryData : private NonCopyable {
    FileEntryData() { path[0] = '\0'; }
    ~FileEntryData();

    char path[kPathBufferSize];
    FileSystemHandler* handler = nullptr;                     // answers questions about the entry
    FileAccessorHandler* accessorHandler = nullptr;           // reads and writes its contents; normally the same object
    void* handlerState = nullptr;                             // the accessor handler's, between Open and Close
    mutable FileSystemError lastError = kFileSystemErrorNone; // by the last operation that records errors
};

static_assert(sizeof(FileEntryInfo) == 1064 && offsetof(FileEntryInfo, flags) == 16 &&
              offsetof(FileEntryInfo, path) == 17);
static_assert(sizeof(FileEntryData) == 1072);
