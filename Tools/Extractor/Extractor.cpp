#include "Tools/Extractor/Extractor.h"

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <cstring>
#include <optional>

namespace {

using ArchiveStorageHeader::Node;

constexpr UInt64 kTransferSize = 65'536;

// The folder that entries are written to. A stored path decides what is made below it, never where it is.
class OutputFolder {
public:
    // archivePath must have at most kMaxPathLength characters.
    explicit OutputFolder(core::string_ref archivePath) {
        // A leading "~" is part of the name here, not the home folder.
        const core::string_ref start = archivePath.starts_with("~") ? "./" : "", end = "_data";
        RequireMemory(m_Path.grow(start.size() + archivePath.size() + end.size()));
        m_Path += start;
        m_Path += archivePath;
        m_Path += end;
        m_AbsoluteLength = PathToAbsolutePath(m_Path).size();
    }

    // False when the path is too long for a file system entry. A folder that can't be made is not a failure yet: it may
    // exist already, and otherwise every entry reports it.
    bool Create() const {
        if (m_Path.size() > kMaxPathLength) return false;
        FileSystemEntry entry(m_Path.c_str());
        (void)entry.CreateAsDir();
        return true;
    }

    // Sets *joined to the path of an entry on disk. False for an entry that would leave the folder, or whose path is
    // too long for a file system entry, as it is or made absolute: cut, it would name another file.
    bool Resolve(core::string_ref path, core::string* joined) const {
        if (path.size() > kMaxPathLength || HasParentComponent(path)) return false;
        joined->clear();
        RequireMemory(joined->grow(m_Path.size() + 1 + path.size()));
        AppendPathNameImpl(m_Path, path, '/', *joined);
        const size_t absoluteLength = m_AbsoluteLength + (joined->size() - m_Path.size());
        return std::max(joined->size(), absoluteLength) <= kMaxPathLength;
    }

    // Makes the folder that an entry's path names, and the missing ones above it. The text of path must outlive this
    // object.
    bool CreateFolder(core::string_ref path) {
        core::string joined(kMemLabelGeneral);
        if (!Resolve(path, &joined) || !CreateDirectoryRecursive(joined)) return false;
        m_LastFolder = path;
        return true;
    }

    // Whether path is the one that CreateFolder made, or found, last.
    bool IsLastFolder(core::string_ref path) const { return m_LastFolder == path; }

private:
    // A file system entry turns backslashes into "/", so they separate components here too.
    static bool HasParentComponent(core::string_ref path) {
        size_t start = 0;
        for (size_t index = 0; index <= path.size(); ++index) {
            if (index != path.size() && path[index] != '/' && path[index] != '\\') continue;
            if (path.substr(start, index - start) == "..") return true;
            start = index + 1;
        }
        return false;
    }

    core::string m_Path;
    size_t m_AbsoluteLength = 0; // of m_Path made absolute
    std::optional<core::string_ref> m_LastFolder;
};

void PrintHeader(const ArchiveStorageHeader::Header& header) {
    printf_console("  stream version: %d\n", static_cast<int>(header.version));
    printf_console("  zarvo version: %s\n", header.engineVersion.c_str());
    printf_console("  zarvo revision: %s\n", header.engineRevision.c_str());
    printf_console("  data size: %llu bytes\n", header.size);
}

bool CopyNode(ArchiveStorageReader& reader, const Node& node, FileAccessor& file, dynamic_array<UInt8>& buffer) {
    UInt64 copied = 0;
    while (copied < node.size) {
        UInt64 delivered = 0;
        const UInt64 wanted = std::min(node.size - copied, kTransferSize);
        // The buffer is empty when memory for it was refused.
        if (buffer.empty() || !reader.Read(node.offset + copied, wanted, buffer.data(), &delivered)) {
            printf_console("ERROR: failed to decompress file %s\n", node.path.c_str());
            return false;
        }
        UInt64 written = 0;
        if (!file.Write(delivered, buffer.data(), &written) || written != delivered) {
            printf_console("ERROR: failed to write file %s\n", node.path.c_str());
            return false;
        }
        copied += delivered;
    }
    // Some file systems report a full disk only when the file is closed.
    if (!file.Close()) {
        printf_console("ERROR: failed to write file %s\n", node.path.c_str());
        return false;
    }
    return true;
}

bool ExtractFolder(const Node& node, OutputFolder& output) {
    if (output.CreateFolder(node.path)) return true;
    printf_console("ERROR: failed to create directory %s\n", node.path.c_str());
    return false;
}

bool ExtractFile(ArchiveStorageReader& reader, const Node& node, OutputFolder& output, dynamic_array<UInt8>& buffer) {
    core::string path(kMemLabelGeneral);
    if (!output.Resolve(node.path, &path)) {
        printf_console("ERROR: failed to create file %s\n", node.path.c_str());
        return false;
    }
    const core::string_ref parent = DeleteLastPathNameComponent(node.path);
    const bool hasFolder = output.IsLastFolder(parent) || output.CreateFolder(parent);
    if (!hasFolder)
        printf_console("ERROR: failed to create directory %s\n", core::string(parent, kMemLabelGeneral).c_str());
    FileAccessor file;
    if (!file.Open(path.c_str(), kFilePermissionWrite)) {
        printf_console("ERROR: failed to create file %s\n", node.path.c_str());
        return false;
    }
    return CopyNode(reader, node, file, buffer) && hasFolder;
}

} // namespace

bool ExtractArchive(const char* archivePath) {
    ArchiveStorageReader reader(kMemLabelFileSystem);
    // A file system entry would cut a longer path, and another file would be read.
    if (strlen(archivePath) > kMaxPathLength || reader.Initialize(core::string(archivePath), 0) != 0) {
        printf_console("ERROR: can't read or not a zarvo web file\n");
        return false;
    }
    PrintHeader(reader.GetHeader());

    dynamic_array<UInt8> buffer(kMemLabelGeneral);
    (void)buffer.resize_uninitialized(kTransferSize, kResizeExact); // without it, every file that is not empty fails
    if (!reader.FindDirectory(ArchiveStorageReader::kDirectoryPiecesWhole)) {
        printf_console("ERROR: failed to parse files information\n");
        return false;
    }

    printf_console("  creating folder '%s_data'\n", archivePath);
    OutputFolder output(archivePath);
    bool isAllOk = output.Create();
    // Every entry reports this too; an archive without entries would fail silently.
    if (!isAllOk && reader.GetDirectoryInfo().nodes.empty())
        printf_console("ERROR: failed to create directory %s_data\n", archivePath);
    for (size_t index = 0; index < reader.GetDirectoryInfo().nodes.size(); ++index) {
        const Node& node = reader.GetDirectoryInfo().nodes[index];
        const bool isFolder = (node.flags & ArchiveStorageHeader::kNodeDirectory) != 0;
        const bool isOk = isFolder ? ExtractFolder(node, output) : ExtractFile(reader, node, output, buffer);
        isAllOk = isAllOk && isOk;
    }
    if (isAllOk) printf_console("All ok!\n");
    return isAllOk;
}
