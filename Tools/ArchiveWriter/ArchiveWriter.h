// Makes archives of every layout in the open: a description of entries, blocks and form becomes the bytes of an
// archive, and every field that is stored can be given another value by its name.
//
//   ArchiveDescription archive;
//   archive.entries = {{.path = "a.txt", .bytes = "text"}};
//   archive.type = kCompressionLz4;
//   archive.fields = {{"version", 9}};
//   BuiltArchive built = BuildArchive(archive);      // built.bytes, and where its parts lie
//   PackFolder("/some/folder", "/some/file", {});    // the same, from disk to disk, one block in memory at a time
//
// A description that can't be followed (a field name that no part has, a file that can't be read) stops the program
// with a message: it is a fault of the caller. Threads share nothing.
#pragma once

#include "Runtime/Core/Types.h"
#include "Tools/ArchiveWriter/Compressors.h"

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

enum class ArchiveLayout {
    kBlockBased,  // "ZarvoFS"
    kWebVersion6, // the block-based layout under the signature "ZarvoWeb"
    kWeb,
    kRaw,
    kArchive,
};

struct ArchiveEntry {
    std::string path = {};
    std::string bytes = {};
    UInt32 flags = 0;            // of the node; not stored by the legacy layouts
    std::string sourceFile = {}; // on disk, instead of bytes
    bool listed = true;          // false: the bytes are in the data stream, but no node names them
};

constexpr UInt32 kFolderEntry = 1;

struct ArchiveBlock {
    UInt64 size = 0; // bytes of the data stream, compressed as the description's type and streamed say
    std::optional<CompressionType> type = {};
    std::optional<bool> streamed = {};
    std::optional<std::string> stored = {}; // instead of what the compressor makes
};

struct ArchiveDescription {
    ArchiveLayout layout = ArchiveLayout::kBlockBased;
    std::vector<ArchiveEntry> entries = {};

    // How the data stream is cut: as listed, the rest in pieces of chunkSize (0: one block). The layouts kWeb and kRaw
    // have one block.
    std::vector<ArchiveBlock> blocks = {};
    UInt64 chunkSize = 131'072;
    CompressionType type = kCompressionNone;
    bool streamed = false;
    LzmaSettings lzma = {};

    std::optional<std::string> signature = {};
    // Else 7, 6, 3, 3, 5, in the order of the layouts; decides which fields there are.
    std::optional<UInt32> version = {};
    std::string engineVersion = "5.x.x";
    std::string engineRevision = "7041.3.0b12";

    // kBlockBased and kWebVersion6; sectionAtEnd also kArchive, whose header and directory then follow the data.
    bool sectionAtEnd = false;
    CompressionType sectionType = kCompressionNone;
    bool directoryInSection = true;
    bool sectionPadded = false;
    bool webSignatureFlag = true; // kWebVersion6: the flag that makes room for the longer signature

    UInt32 levelCount = 1; // kWeb and kRaw: all but the last entry are of no meaning

    // Values that are stored instead of the true ones. Names are those in the layout tables of ArchiveFrames.cpp, with
    // [i] for the i-th of a list: "block[2].compressedSize", "node[0].offset".
    std::map<std::string, UInt64> fields = {};
};

struct ArchiveField {
    UInt64 position; // in the archive
    UInt32 size;     // in bytes
};

struct BuiltArchive {
    std::string bytes;
    std::string stream;                         // the data stream that the blocks hold
    std::map<std::string, ArchiveField> fields; // every integer that is stored uncompressed, by name
    UInt64 headerSize = 0;                      // with its padding
    UInt64 sectionOffset = 0;                   // kBlockBased and kWebVersion6: of the section. kArchive: of the header
    UInt64 sectionSize = 0;                     // as stored, without padding
    UInt64 dataOffset = 0;
};

BuiltArchive BuildArchive(const ArchiveDescription& description);

struct StoredBlock {
    UInt64 uncompressedSize;
    UInt64 compressedSize;
    CompressionType type;
    bool streamed;
};

// Where everything lies in an archive that has been written to a file.
struct ArchivePlan {
    struct Node {
        std::string path;
        UInt32 flags;
        UInt64 offset; // in the data stream
        UInt64 size;
    };
    UInt64 dataOffset;
    std::vector<StoredBlock> blocks; // from dataOffset on
    std::vector<Node> nodes;
};

// Writes the archive to a file. Only one LZ4 block or what the LZMA encoder needs, the section and what the description
// itself holds are in memory.
ArchivePlan WriteArchive(const ArchiveDescription& description, const std::string& outputFile);

// An archive of every file and folder below a folder, in the order of their paths; form gives all but the entries. The
// legacy layouts hold files only.
ArchivePlan PackFolder(const std::string& folder, const std::string& outputFile, ArchiveDescription form);
