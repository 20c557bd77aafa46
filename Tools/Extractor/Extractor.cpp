#include "Tools/Extractor/Extractor.h"

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

// Where entries go. A stored path decides what is made below the output folder, and never where that folder is.
class OutputFolder {
public:
    explicit OutputFolder(core::string_ref archivePath) {
        // A leading "~" is part of the name here, not the home folder.
        const core::string_ref start = archivePath.starts_with("~") ? "./" : "", end = "_data";
        // Without memory there is no folder: half its path would name another one.
        if (m_Path.grow(start.size() + archivePath.size() + end.size()) == nullptr) return;
        m_Path += start;
        m_Path += archivePath;
        m_Path += end;
        m_AbsoluteLength = PathToAbsolutePath(m_Path).size(); // 0 without memory
    }

    // False when an entry would cut the folder's path, or memory for it was refused. A folder that can't be made is no
    // failure yet: it may be there already, and if it is not, every entry says so.
    bool Create() const {
        if (m_AbsoluteLength == 0 || m_Path.size() > kMaxPathLength) return false;
        FileSystemEntry entry(m_Path.c_str());
        (void)entry.CreateAsDir();
        return true;
    }

    // The path of an entry on disk. False for one that would leave the folder, or whose path, as it is or absolute,
    // would be cut to another one's.
    bool Resolve(core::string_ref path, core::string* joined) const {
        if (m_AbsoluteLength == 0 || HasParentComponent(path)) return false;
        joined->clear();
        AppendPathNameImpl(m_Path, path, '/', *joined);
        if (joined->size() < m_Path.size()) return false; // memory was refused
        const size_t absoluteLength = m_AbsoluteLength + (joined->size() - m_Path.size());
        return std::max(joined->size(), absoluteLength) <= kMaxPathLength;
    }

    // Makes the folder that an entry's path names, and those above it, where they are missing. The path is kept.
    bool CreateFolder(core::string_ref path) {
        core::string joined(kMemLabelGeneral);
        if (!Resolve(path, &joined) || !CreateDirectoryRecursive(joined)) return false;
        m_LastFolder = path;
        return true;
    }

    // Whether the folder is the one that was made, or found, last.
    bool IsLastFolder(core::string_ref path) const { return m_LastFolder == path; }

private:
    // Entries turn backslashes into "/", so they separate components here too.
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
    size_t m_AbsoluteLength = 0; // 0: memory for the path was refused
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
        // An empty buffer: memory for it was refused.
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
    // Some file systems report only here that the bytes did not fit.
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
    FileAccessor file;
    bool isOk = true;
    // The folder of the file before is there still, or the open fails.
    const core::string_ref parent = DeleteLastPathNameComponent(node.path);
    bool isOpen = output.IsLastFolder(parent) && file.Open(path.c_str(), kFilePermissionWrite);
    if (!isOpen) {
        (void)file.Close(); // nothing is open
        isOk = output.CreateFolder(parent);
        if (!isOk)
            printf_console("ERROR: failed to create directory %s\n", core::string(parent, kMemLabelGeneral).c_str());
        isOpen = file.Open(path.c_str(), kFilePermissionWrite);
    }
    if (!isOpen) {
        printf_console("ERROR: failed to create file %s\n", node.path.c_str());
        return false;
    }
    return CopyNode(reader, node, file, buffer) && isOk;
}

} // namespace

bool ExtractArchive(const char* archivePath) {
    ArchiveStorageReader reader(kMemLabelFileSystem);
    // An entry would cut a longer path, and another file would be read.
    if (strlen(archivePath) > kMaxPathLength || reader.Initialize(core::string(archivePath), 0) != 0) {
        printf_console("ERROR: can't read or not a zarvo web file\n");
        return false;
    }
    PrintHeader(reader.GetHeader());

    dynamic_array<UInt8> buffer(kMemLabelGeneral);
    (void)buffer.resize_uninitialized(kTransferSize, kResizeExact); // without it the files that have bytes fail
    if (!reader.FindDirectory(ArchiveStorageReader::kDirectoryPiecesWhole)) {
        printf_console("ERROR: failed to parse files information\n");
        return false;
    }

    printf_console("  creating folder '%s_data'\n", archivePath);
    OutputFolder output(archivePath);
    bool isAllOk = output.Create();
    // Every entry says so, too; without entries somebody has to.
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
