// How macOS lists folders: many entries a call, each as a record that holds all there is to say about it.
#include "PlatformDependent/OSX/LocalFileSystemOSX.h"

#include "PlatformDependent/Linux/FileDescriptor.h"
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>

namespace {

constexpr char kSourceName[] = "PlatformDependent/OSX/LocalFileSystemOSX";
constexpr size_t kFirstBufferSize = 4096;
constexpr size_t kLargestBufferSize = 0x40000000;
constexpr size_t kBufferAlignment = 16;
constexpr size_t kReservedPathLength = 1024;
constexpr UInt32 kFixedRecordSize = 60; // no record that is whole is shorter

void Report(const char* message, SourceLocation where = SourceLocation::current()) {
    AssertImplementation(0, kSourceName, where.line, -1, message);
}

// The buffer that records are written to.
class RecordBuffer {
public:
    RecordBuffer()
        : m_Data(static_cast<UInt8*>(malloc_internal(kFirstBufferSize, kBufferAlignment, kMemLabelGeneral,
                                                     kAllocateOptionNone, __FILE__, __LINE__))),
          m_Size(m_Data != nullptr ? kFirstBufferSize : 0) {}
    ~RecordBuffer() { free_alloc_internal(m_Data, kMemLabelGeneral, __FILE__, __LINE__); }
    RecordBuffer(const RecordBuffer&) = delete;
    RecordBuffer& operator=(const RecordBuffer&) = delete;

    UInt8* Data() { return m_Data; }
    size_t Size() const { return m_Size; }

    // False, and as it was, when it is as large as it may be, or memory is or was refused.
    bool Double() {
        if (m_Size == 0 || m_Size > kLargestBufferSize / 2) return false;
        void* larger = realloc_internal(m_Data, m_Size * 2, kBufferAlignment, kMemLabelGeneral, kAllocateOptionNone,
                                        __FILE__, __LINE__);
        if (larger == nullptr) return false;
        m_Data = static_cast<UInt8*>(larger);
        m_Size *= 2;
        return true;
    }

private:
    UInt8* m_Data;
    size_t m_Size;
};

// A folder that is being listed, and the one that it was reached from: a listing that comes back to one of them ends.
struct OpenFolder {
    dev_t device;
    ino_t inode;
    const OpenFolder* parent;

    bool IsAmongThoseAbove() const {
        for (const OpenFolder* above = parent; above != nullptr; above = above->parent)
            if (above->device == device && above->inode == inode) return true;
        return false;
    }
};

// What a record says; what it lacks is as it is here.
struct Record {
    attribute_set_t returned = {};
    core::string_ref name; // points into the record
    UInt32 type = VNON;
    timespec modified = {};
    UInt32 flags = 0;
    SInt64 totalSize = 0;
};

// Copies the fields of a record one after the other; what lies past its end is left as it is.
class FieldReader {
public:
    FieldReader(const UInt8* record, size_t size, size_t position)
        : m_Record(record), m_Size(size), m_Position(position) {}

    template <typename T>
    void Read(T& field) {
        if (sizeof(field) <= m_Size && m_Position <= m_Size - sizeof(field))
            memcpy(&field, m_Record + m_Position, sizeof(field));
        m_Position += sizeof(field);
    }

    // A text that a reference, the field read next, points to: up to its NUL or the end of the record.
    core::string_ref ReadText() {
        const auto start = static_cast<SInt64>(m_Position);
        attrreference_t reference = {};
        Read(reference);
        const SInt64 at = start + reference.attr_dataoffset;
        if (reference.attr_dataoffset == 0 || at < 0 || at >= static_cast<SInt64>(m_Size)) return {};
        const char* text = reinterpret_cast<const char*>(m_Record + at);
        return {text, strnlen(text, m_Size - static_cast<size_t>(at))};
    }

private:
    const UInt8* m_Record;
    size_t m_Size;
    size_t m_Position;
};

// size counts the bytes of the record that are there, whatever its own length says.
Record ReadRecord(const UInt8* bytes, size_t size) {
    Record record;
    FieldReader reader(bytes, size, sizeof(UInt32)); // past the length
    reader.Read(record.returned);
    const UInt32 common = record.returned.commonattr;
    UInt32 error = 0;
    if (common & ATTR_CMN_ERROR) reader.Read(error);
    if (common & ATTR_CMN_NAME) record.name = reader.ReadText();
    if (common & ATTR_CMN_OBJTYPE) reader.Read(record.type);
    if (common & ATTR_CMN_MODTIME) reader.Read(record.modified);
    if (common & ATTR_CMN_FLAGS) reader.Read(record.flags);
    if (record.returned.fileattr & ATTR_FILE_TOTALSIZE) reader.Read(record.totalSize);
    return record;
}

void ReportMissingAttributes(const Record& record) {
    const UInt32 common = record.returned.commonattr;
    if (record.name.empty()) // one that lies outside of the record is as good as none
        Report("Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_NAME'");
    if (!(common & ATTR_CMN_OBJTYPE))
        Report("Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_OBJTYPE'");
    if (!(common & ATTR_CMN_MODTIME))
        Report("Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_MODTIME'");
    if (!(common & ATTR_CMN_FLAGS))
        Report("Assertion failed on expression: 'entry.returned.commonattr & ATTR_CMN_FLAGS'");
}

// A link that leads to a folder counts as one; a link whose target can't be looked at does not.
bool IsFolder(const Record& record, const char* path) {
    if (record.type != VLNK) return record.type == VDIR;
    struct stat status;
    return GetStatus(path, &status) && S_ISDIR(status.st_mode);
}

void AddSize(const Record& record, void** handlerData) {
    const bool hasSize = (record.returned.fileattr & ATTR_FILE_TOTALSIZE) != 0;
    if (!hasSize) Report("Assertion failed on expression: 'entry.returned.fileattr & ATTR_FILE_TOTALSIZE'");
    if (handlerData == nullptr || *handlerData == nullptr)
        Report("Assertion failed on expression: 'handlerData != NULL'");
    else
        *static_cast<UInt64*>(*handlerData) += static_cast<UInt64>(record.totalSize); // 0 without the attribute
}

void AddEntry(const Record& record, const core::string& path, bool isFolder,
              dynamic_block_array<FileEntryInfo, 32>* out) {
    const bool isHidden = record.name[0] == '.' || (record.flags & UF_HIDDEN) != 0;
    FileEntryInfo& info = out->emplace_back();
    strcpy_truncate(info.path, path.data(), sizeof(info.path), path.length());
    if (isFolder) info.flags |= kFileEntryIsDirectory;
    if (record.type == VLNK) info.flags |= kFileEntryIsSymLink;
    if (isHidden) info.flags |= kFileEntryIsHidden;
    info.size = isFolder ? 0 : static_cast<UInt64>(record.totalSize);
    UnixTimeToZarvoTime(record.modified.tv_sec, info.lastModified);
}

void PrintListingError(int error, const core::string& path) {
    printf_console("Error (%s) occured whilst enumerating %s\n", strerror(error), path.c_str());
}

// One listing, of a folder and those below it.
class FolderLister {
public:
    FolderLister(dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                 FileEnumerationFlag flags)
        : m_Out(out), m_HandlerData(handlerData), m_Flags(flags), m_Recursive(recursive) {}

    // A folder that can't be opened, or is listed already further up, adds nothing and is no failure.
    bool Enumerate_Internal(const core::string& path, const OpenFolder* parent) {
        core::string working(kMemLabelGeneral);
        // Where memory is refused later, half a path would be listed.
        if (working.grow(std::max(path.length() + 1, kReservedPathLength)) == nullptr) return false;
        working = path;
        if (working.empty() || working.back() != '/') working.push_back('/');

        const FileDescriptor descriptor(PlatformOpen(path.c_str(), O_RDONLY, 0));
        if (descriptor.Get() < 1) return true; // 0, the number of standard input, is not listed from either
        struct stat status;
        if (fstat(descriptor.Get(), &status) != 0) return true;
        const OpenFolder folder = {status.st_dev, status.st_ino, parent};
        if (folder.IsAmongThoseAbove()) return true;

        attrlist request = {};
        request.bitmapcount = ATTR_BIT_MAP_COUNT;
        request.commonattr = ATTR_CMN_RETURNED_ATTRS | ATTR_CMN_NAME | ATTR_CMN_OBJTYPE | ATTR_CMN_MODTIME |
                             ATTR_CMN_FLAGS | ATTR_CMN_ERROR;
        request.fileattr = ATTR_FILE_TOTALSIZE;
        RecordBuffer buffer;
        for (;;) {
            const int count = getattrlistbulk(descriptor.Get(), &request, buffer.Data(), buffer.Size(), 0);
            const int error = errno; // before anything else changes it
            if (count == 0) return true;
            if (count > 0) {
                HandleRecords(buffer, count, path, working, folder);
            } else if (error != ERANGE || !buffer.Double()) {
                PrintListingError(error, path);
                return false;
            }
        }
    }

private:
    void HandleRecords(RecordBuffer& buffer, int count, const core::string& path, core::string& working,
                       const OpenFolder& folder) {
        const UInt8* bytes = buffer.Data();
        size_t left = buffer.Size();
        for (UInt32 length = 0; count > 0 && left >= sizeof(length); --count) {
            memcpy(&length, bytes, sizeof(length));
            if (length < kFixedRecordSize) Report("Trying to copy too much data from getattrlistbulk attribute buffer");
            if (length < sizeof(length)) return; // leads nowhere
            const size_t held = std::min<size_t>(length, left);
            HandleRecord(ReadRecord(bytes, held), path, working, folder);
            bytes += held;
            left -= held;
        }
    }

    void HandleRecord(const Record& record, const core::string& path, core::string& working, const OpenFolder& folder) {
        if (record.returned.commonattr & ATTR_CMN_ERROR) {
            PrintListingError(errno, path);
            return;
        }
        ReportMissingAttributes(record);
        if (record.name.empty()) return; // the path would be the folder's own

        const size_t prefixLength = working.length();
        working.append(record.name);
        if (working.length() == prefixLength) return; // memory was refused
        const bool isFolder = IsFolder(record, working.c_str());
        if (!FlaggedAsSkipped(isFolder, (record.flags & UF_HIDDEN) != 0, record.name, m_Flags)) {
            if ((m_Flags & kFileEnumerationSumSizes) == 0)
                AddEntry(record, working, isFolder, m_Out);
            else if (!isFolder)
                AddSize(record, m_HandlerData);
            if (isFolder && m_Recursive) (void)Enumerate_Internal(working, &folder); // the rest is listed all the same
        }
        working.resize(prefixLength);
    }

    dynamic_block_array<FileEntryInfo, 32>* m_Out;
    void** m_HandlerData;
    FileEnumerationFlag m_Flags;
    bool m_Recursive;
};

// The path made absolute; as it stands when the platform has no text for it.
core::string FileSystemRepresentation(const char* path) {
    const char* text = NSURL_fileSystemRepresentation(NSURL_fileURLWithPath(MakeNSString(path)));
    return core::string(*text != '\0' ? text : path, kMemLabelPathString);
}

// What of path, which is absolute, is left below the current directory; path itself when it lies elsewhere.
core::string_ref BelowCurrentDirectory(core::string_ref path, core::string_ref currentDirectory) {
    if (path.empty() || currentDirectory.empty()) return path.substr(std::min<size_t>(1, path.length()));
    if (!path.starts_with(currentDirectory)) return path;
    if (path.length() == currentDirectory.length()) return ".";
    const core::string_ref rest = path.substr(currentDirectory.length());
    if (currentDirectory[currentDirectory.length() - 1] == '/') return rest; // only the root ends so
    return rest[0] == '/' ? rest.substr(1) : path; // otherwise the name of another folder begins alike
}

} // namespace

bool LocalFileSystemOSX::Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive,
                                   void** handlerData, FileEnumerationFlag flags) const {
    if (flags & kFileEnumerationSumSizes)
        Report("Filesystem does not support storing size during enumeration outside of Zarvo Editor.");
    if (path == nullptr) return false;

    core::string representation = FileSystemRepresentation(path);
    if (path[0] != '/' && representation.starts_with("/")) {
        const core::string current = FileSystemRepresentation(GetFileSystem()->CurrentDirectory().c_str());
        representation = BelowCurrentDirectory(representation, current);
    }
    return FolderLister(out, recursive, handlerData, flags).Enumerate_Internal(representation, nullptr);
}
