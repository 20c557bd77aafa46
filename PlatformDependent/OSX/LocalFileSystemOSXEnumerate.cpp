// How macOS lists folders: many entries per call, each described by a record.
#include "PlatformDependent/OSX/LocalFileSystemOSX.h"

#include "PlatformDependent/Linux/FileDescriptor.h"
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Utilities/FixedReports.h"
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
constexpr size_t kMaxNameLength = 1024;
constexpr UInt32 kFixedRecordSize = 60; // a whole record is at least this long

void Report(const char* message, SourceLocation where = SourceLocation::current()) {
    AssertImplementation(0, kSourceName, where.line, -1, message);
}

// The bytes that one call fills with records.
using RecordBuffer = dynamic_array<UInt8>;

// False when the buffer has its largest size, or memory is refused.
bool Double(RecordBuffer& buffer) {
    return buffer.size() <= kLargestBufferSize / 2 && buffer.resize_uninitialized(buffer.size() * 2, kResizeExact);
}

// The fields of a record. A field that the record lacks keeps its initial value.
struct Record {
    attribute_set_t returned = {};
    core::string_ref name; // points into the record
    UInt32 type = VNON;
    timespec modified = {};
    UInt32 flags = 0;
    SInt64 totalSize = 0;
};

// Reads the fields of a record in order. A field past the end of the record is left unchanged.
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

    // Reads a reference and returns the text that it points to, up to its NUL or the end of the record.
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

// size is how many bytes of the record are there, whatever its length field says.
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
    if (record.name.empty()) // also when the reference leads out of the record
        Report(FixedReports::kListingHasNoName);
    if (!(common & ATTR_CMN_OBJTYPE)) Report(FixedReports::kListingHasNoType);
    if (!(common & ATTR_CMN_MODTIME)) Report(FixedReports::kListingHasNoTime);
    if (!(common & ATTR_CMN_FLAGS)) Report(FixedReports::kListingHasNoFlags);
}

// A link to a folder counts as a folder; a link whose target has no status does not.
bool IsFolder(const Record& record, const char* path) {
    if (record.type != VLNK) return record.type == VDIR;
    struct stat status;
    return GetStatus(path, &status) && S_ISDIR(status.st_mode);
}

void AddSize(const Record& record, void** handlerData) {
    const bool hasSize = (record.returned.fileattr & ATTR_FILE_TOTALSIZE) != 0;
    if (!hasSize) Report(FixedReports::kListingHasNoSize);
    if (handlerData == nullptr || *handlerData == nullptr)
        Report(FixedReports::kSumHasNoCounter);
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

// One listing: a folder and, when recursive, the folders below it.
class FolderLister {
public:
    FolderLister(dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                 FileEnumerationFlag flags)
        : m_Out(out), m_HandlerData(handlerData), m_Flags(flags), m_Recursive(recursive) {}

    // A folder that can't be opened, or that the listing is already inside, adds nothing and is no failure. parent is
    // the folder that path was reached from, or null.
    bool Enumerate_Internal(const core::string& path, const OpenFolder* parent) {
        core::string working(kMemLabelGeneral);
        RequireMemory(
            working.grow(path.length() + 1 + kMaxNameLength)); // the longest path, so that appending can't fail
        working = path;
        if (working.empty() || working.back() != '/') working.push_back('/');

        const FileDescriptor descriptor(PlatformOpen(path.c_str(), O_RDONLY, 0));
        if (descriptor.Get() < 1) return true; // 0 is standard input's number, and not used either
        struct stat status;
        if (fstat(descriptor.Get(), &status) != 0) return true;
        if (parent != nullptr && parent->IsInside(status)) return true;
        const OpenFolder folder = {status.st_dev, status.st_ino, parent};

        attrlist request = {};
        request.bitmapcount = ATTR_BIT_MAP_COUNT;
        request.commonattr = ATTR_CMN_RETURNED_ATTRS | ATTR_CMN_NAME | ATTR_CMN_OBJTYPE | ATTR_CMN_MODTIME |
                             ATTR_CMN_FLAGS | ATTR_CMN_ERROR;
        request.fileattr = ATTR_FILE_TOTALSIZE;
        RecordBuffer buffer(kMemLabelGeneral);
        if (!buffer.resize_uninitialized(kFirstBufferSize, kResizeExact)) return false;
        for (;;) {
            const int count = getattrlistbulk(descriptor.Get(), &request, buffer.data(), buffer.size(), 0);
            const int error = errno; // before another call changes it
            if (count == 0) return true;
            if (count > 0) {
                HandleRecords(buffer, count, path, working, folder);
            } else if (error != ERANGE || !Double(buffer)) {
                PrintListingError(error, path);
                return false;
            }
        }
    }

private:
    void HandleRecords(const RecordBuffer& buffer, int count, const core::string& path, core::string& working,
                       const OpenFolder& folder) {
        const UInt8* bytes = buffer.data();
        size_t left = buffer.size();
        for (UInt32 length = 0; count > 0 && left >= sizeof(length); --count) {
            memcpy(&length, bytes, sizeof(length));
            if (length < kFixedRecordSize) Report("Trying to copy too much data from getattrlistbulk attribute buffer");
            if (length < sizeof(length)) return; // the next record can't be found
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
        if (record.name.empty()) return; // without a name the path would be the folder's own

        const size_t prefixLength = working.length();
        working.append(record.name.substr(0, kMaxNameLength)); // the platform's names are shorter
        const bool isFolder = IsFolder(record, working.c_str());
        if (!FlaggedAsSkipped(isFolder, (record.flags & UF_HIDDEN) != 0, record.name, m_Flags)) {
            if ((m_Flags & kFileEnumerationSumSizes) == 0)
                AddEntry(record, working, isFolder, m_Out);
            else if (!isFolder)
                AddSize(record, m_HandlerData);
            if (isFolder && m_Recursive)
                (void)Enumerate_Internal(working, &folder); // a failure doesn't end the listing
        }
        working.truncate(prefixLength);
    }

    dynamic_block_array<FileEntryInfo, 32>* m_Out;
    void** m_HandlerData;
    FileEnumerationFlag m_Flags;
    bool m_Recursive;
};

// The path made absolute, or unchanged when the platform can't represent it.
core::string FileSystemRepresentation(const char* path) {
    const char* text = NSURL_fileSystemRepresentation(NSURL_fileURLWithPath(MakeNSString(path)));
    return core::string(*text != '\0' ? text : path, kMemLabelPathString);
}

// The part of an absolute path that lies below the current directory; all of it when it lies elsewhere.
core::string_ref BelowCurrentDirectory(core::string_ref path, core::string_ref currentDirectory) {
    if (path.empty() || currentDirectory.empty()) return path.substr(std::min<size_t>(1, path.length()));
    if (!path.starts_with(currentDirectory)) return path;
    if (path.length() == currentDirectory.length()) return ".";
    const core::string_ref rest = path.substr(currentDirectory.length());
    if (currentDirectory[currentDirectory.length() - 1] == '/') return rest; // it is the root
    return rest[0] == '/' ? rest.substr(1) : path; // path: a folder whose name only begins the same
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
