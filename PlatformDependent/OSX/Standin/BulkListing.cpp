// getattrlistbulk, made from this system's own listing of a folder. As on the platform, the position belongs to the
// descriptor: when a record does not fit, the descriptor is moved back to its entry.
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "PlatformDependent/OSX/Standin/FileFlags.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <string>
#include <sys/syscall.h>
#include <unistd.h>

namespace {

constexpr size_t kListingSize = 32768;
constexpr size_t kLongestListedName = 512; // room for the longest entry of the system's listing
constexpr size_t kRecordAlignment = 8;

constexpr uint32_t kKnownCommon =
    ATTR_CMN_RETURNED_ATTRS | ATTR_CMN_NAME | ATTR_CMN_OBJTYPE | ATTR_CMN_MODTIME | ATTR_CMN_FLAGS | ATTR_CMN_ERROR;
constexpr uint32_t kNeededCommon = ATTR_CMN_RETURNED_ATTRS | ATTR_CMN_NAME;

vtype TypeOf(mode_t mode) {
    switch (mode & S_IFMT) {
    case S_IFREG: return VREG;
    case S_IFDIR: return VDIR;
    case S_IFBLK: return VBLK;
    case S_IFCHR: return VCHR;
    case S_IFLNK: return VLNK;
    case S_IFSOCK: return VSOCK;
    case S_IFIFO: return VFIFO;
    default: return VNON;
    }
}

template <typename T>
void Append(std::string& record, const T& value) {
    record.append(reinterpret_cast<const char*>(&value), sizeof(value));
}

template <typename T>
void Overwrite(std::string& record, size_t offset, const T& value) {
    memcpy(record.data() + offset, &value, sizeof(value));
}

// The record of one entry of the folder, with the attributes that request names.
std::string MakeRecord(int descriptor, const char* name, const attrlist& request) {
    struct stat status;
    int error = fstatat(descriptor, name, &status, AT_SYMLINK_NOFOLLOW) == 0 ? 0 : errno;
    if (gStandinFaults.entryErrorName == name) error = EIO;
    const bool altered = gStandinFaults.alteredName == name;

    uint32_t common = request.commonattr & ~ATTR_CMN_ERROR;
    uint32_t file = request.fileattr;
    if (error != 0) {
        common = ATTR_CMN_NAME | ATTR_CMN_ERROR;
        file = 0;
    } else if (S_ISDIR(status.st_mode)) {
        file = 0;
    }
    if (altered) {
        common &= ~gStandinFaults.missingCommon;
        file &= ~gStandinFaults.missingFile;
    }

    std::string record;
    Append(record, uint32_t{0}); // the length, known at the end
    Append(record, attribute_set_t{common & ~ATTR_CMN_RETURNED_ATTRS, 0, 0, file, 0});
    if (common & ATTR_CMN_ERROR) Append(record, static_cast<uint32_t>(error));
    const size_t nameReference = record.size();
    if (common & ATTR_CMN_NAME) Append(record, attrreference_t{});
    if (common & ATTR_CMN_OBJTYPE) Append(record, static_cast<uint32_t>(TypeOf(status.st_mode)));
    if (common & ATTR_CMN_MODTIME) Append(record, status.st_mtim);
    if (common & ATTR_CMN_FLAGS) {
        const std::string path = "/proc/self/fd/" + std::to_string(descriptor) + "/" + name;
        Append(record, S_ISLNK(status.st_mode) ? 0 : FileFlagsOf(path.c_str())); // links have no flags
    }
    if (file & ATTR_FILE_TOTALSIZE) Append(record, static_cast<int64_t>(status.st_size));
    if (common & ATTR_CMN_NAME) {
        const auto length = static_cast<uint32_t>(strlen(name) + 1);
        const int32_t moved = altered ? gStandinFaults.movedName : 0;
        const auto offset = static_cast<int32_t>(record.size() - nameReference) + moved;
        Overwrite(record, nameReference, attrreference_t{offset, length});
        record.append(name, length);
    }
    record.resize((record.size() + kRecordAlignment - 1) / kRecordAlignment * kRecordAlignment);
    auto length = static_cast<uint32_t>(record.size());
    if (altered && gStandinFaults.cut) length = gStandinFaults.cutLength;
    Overwrite(record, 0, length);
    // A shorter length cuts the record, and the next one follows at once; any other length leaves the record whole.
    if (length >= sizeof(length) && length < record.size()) record.resize(length);
    return record;
}

int Fail(int error) {
    errno = error;
    return -1;
}

} // namespace

int getattrlistbulk(int descriptor, void* list, void* buffer, size_t size, uint64_t options) {
    const auto& request = *static_cast<const attrlist*>(list);
    if (request.bitmapcount != ATTR_BIT_MAP_COUNT || (request.commonattr & kNeededCommon) != kNeededCommon ||
        (request.commonattr & ~kKnownCommon) != 0 || request.volattr != 0 || request.dirattr != 0 ||
        (request.fileattr & ~ATTR_FILE_TOTALSIZE) != 0 || request.forkattr != 0 || options != 0)
        return Fail(EINVAL);
    if (gStandinFaults.callsTooSmall > 0) {
        --gStandinFaults.callsTooSmall;
        return Fail(ERANGE);
    }

    int& recordsLeft = gStandinFaults.recordsBeforeListingError;
    if (recordsLeft == 0) {
        recordsLeft = -1;
        return Fail(gStandinFaults.listingError);
    }

    int count = 0;
    size_t used = 0;
    off_t position = lseek(descriptor, 0, SEEK_CUR); // of the next entry; SYS_getdents64 reports a bad descriptor
    alignas(dirent64) char listing[kListingSize];
    for (;;) {
        // Don't read many more entries than there is room for: the surplus must be read again.
        const size_t listingSize = std::clamp((size - used) / 2, kLongestListedName, sizeof(listing));
        const long length = syscall(SYS_getdents64, descriptor, listing, listingSize);
        if (length < 0) return count > 0 ? count : -1; // deliver the packed records; the next call fails again
        if (length == 0) return count;
        for (long at = 0; at < length;) {
            const auto& entry = *reinterpret_cast<const dirent64*>(listing + at);
            at += entry.d_reclen;
            const std::string name = entry.d_name;
            if (name != "." && name != "..") {
                const std::string record = MakeRecord(descriptor, name.c_str(), request);
                if (recordsLeft == 0 || record.size() > size - used) {
                    lseek(descriptor, position, SEEK_SET);
                    return count > 0 ? count : Fail(ERANGE);
                }
                if (recordsLeft > 0) --recordsLeft;
                memcpy(static_cast<char*>(buffer) + used, record.data(), record.size());
                used += record.size();
                ++count;
            }
            position = entry.d_off;
        }
    }
}
