// The platform's system calls that this system lacks, under their own names: file status with file flags, chflags and
// getattrlistbulk. Platform.h says what this header is on a Mac. Any thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <sys/stat.h>

// File flags. They are stored in an extended attribute of the file or, where that can't be written, in this process.
constexpr int UF_HIDDEN = 0x8000; // an int on a Mac too

struct PlatformStatus : stat {
    uint32_t st_flags;
};

// stat with the file's flags: follows links; 0, or -1 with errno.
int PlatformStat(const char* path, PlatformStatus* status);

// Replaces the flags of the file, following links; 0, or -1 with errno (EPERM unless the caller owns the file).
int chflags(const char* path, uint32_t flags);

// Kinds of file in a bulk record.
enum vtype : uint32_t { VNON, VREG, VDIR, VBLK, VCHR, VLNK, VSOCK, VFIFO };

constexpr uint16_t ATTR_BIT_MAP_COUNT = 5;
constexpr uint32_t ATTR_CMN_NAME = 0x1;
constexpr uint32_t ATTR_CMN_OBJTYPE = 0x8;
constexpr uint32_t ATTR_CMN_MODTIME = 0x400;
constexpr uint32_t ATTR_CMN_FLAGS = 0x40000;
constexpr uint32_t ATTR_CMN_ERROR = 0x20000000;
constexpr uint32_t ATTR_CMN_RETURNED_ATTRS = 0x80000000;
constexpr uint32_t ATTR_FILE_TOTALSIZE = 0x2;

// The attributes asked for.
struct attrlist {
    uint16_t bitmapcount;
    uint16_t reserved;
    uint32_t commonattr;
    uint32_t volattr;
    uint32_t dirattr;
    uint32_t fileattr;
    uint32_t forkattr;
};

// The attributes that a record holds.
struct attribute_set_t {
    uint32_t commonattr;
    uint32_t volattr;
    uint32_t dirattr;
    uint32_t fileattr;
    uint32_t forkattr;
};

struct attrreference_t {
    int32_t attr_dataoffset; // from this field itself
    uint32_t attr_length;    // the terminating NUL included
};

// Fills buffer with as many records as fit of the next entries, without "." and "..", of the folder that descriptor is
// open on. The position belongs to the descriptor. Returns the number of records, 0 at the end, or -1 with errno:
// ERANGE when not even one fits (the position stays), EBADF, ENOTDIR, EINVAL for a request that is not supported. list
// must ask for the returned set and the name. A record holds these fields, packed to 4 bytes; a missing field takes no
// room:
//
//   0   length of the record, a multiple of 8   uint32_t
//   4   returned set                            attribute_set_t
//   24  error, only in records that report one  uint32_t: such a record has only error and name
//   24  name                                    attrreference_t; the text follows the fixed part
//   32  object type                             uint32_t: a vtype
//   36  modification time                       timespec
//   52  flags                                   uint32_t
//   56  total size, not of folders              int64_t
int getattrlistbulk(int descriptor, void* list, void* buffer, size_t size, uint64_t options);
