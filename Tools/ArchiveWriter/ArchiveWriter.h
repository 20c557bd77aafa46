// Makes archives of every layout: a description of entries, blocks and form becomes the bytes of an archive. Each
// stored field can be given another value by its name.
//
//   ArchiveDescription archive;
//   archive.entries = {{.path = "a.txt", .bytes = "text"}};
//   archive.type = kCompressionLz4;
//   archive.fields = {{"version", 9}};
//   BuiltArchive built = BuildArchive(archive);      // built.bytes, and where its parts lie
//   PackFolder("/some/folder", "/some/file", {});    // the same, from disk to disk, one block in memory at a time
//
// A wrong description (an unknown field name, a file that can't be read) is the caller's fault and ends the program
// with a message. Any thread.
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
    UInt32 flags = 0;            // of the node; the legacy layouts don't store them
    std::string sourceFile = {}; // path of a file that is used instead of bytes
    bool listed = true;          // false: the bytes are in the data stream, but no node names them
};

constexpr UInt32 kFolderEntry = 1;

struct ArchiveBlock {
    UInt64 size = 0; // bytes of the data stream; type and streamed default to those of the description
    std::optional<CompressionType> type = {};
    std::optional<bool> streamed = {};
    std::optional<std::string> stored = {}; // used instead of the compressor's output
};

struct ArchiveDescription {
    ArchiveLayout layout = ArchiveLayout::kBlockBased;
    std::vector<ArchiveEntry> entries = {};

    // The data stream is cut into these blocks, and the rest into blocks of chunkSize (0: one block). The layouts kWeb
    // and kRaw have one block.
    std::vector<ArchiveBlock> blocks = {};
    UInt64 chunkSize = 131'072;
    CompressionType type = kCompressionNone;
    bool streamed = false;
    LzmaSettings lzma = {};

    std::optional<std::string> signature = {};
    // Decides which fields there are. The default is 7, 6, 3, 3, 5, in the order of the layouts.
    std::optional<UInt32> version = {};
    std::string engineVersion = "5.x.x";
    std::string engineRevision = "7041.3.0b12";

    // For kBlockBased and kWebVersion6. sectionAtEnd is also for kArchive: header and directory then follow the data.
    bool sectionAtEnd = false;
    CompressionType sectionType = kCompressionNone;
    bool directoryInSection = true;
    bool sectionPadded = false;
    bool webSignatureFlag = true; // kWebVersion6: the flag that makes room for the longer signature

    UInt32 levelCount = 1; // for kWeb and kRaw: only the last level has a meaning

    // Values that are stored instead of the right ones. The names are those in the layout tables of ArchiveFrames.cpp,
    // with [i] for the i-th of a list: "block[2].compressedSize", "node[0].offset".
    std::map<std::string, UInt64> fields = {};
};

struct ArchiveField {
    UInt64 position; // in the archive
    UInt32 size;     // in bytes
};

struct BuiltArchive {
    std::string bytes;
    std::string stream;                         // the data stream that the blocks hold
    std::map<std::string, ArchiveField> fields; // the integers that are stored uncompressed, by name
    UInt64 headerSize = 0;                      // with its padding
    UInt64 sectionOffset = 0;                   // of the section; for kArchive of the header
    UInt64 sectionSize = 0;                     // stored bytes, without padding
    UInt64 dataOffset = 0;
};

BuiltArchive BuildArchive(const ArchiveDescription& description);

struct StoredBlock {
    UInt64 uncompressedSize;
    UInt64 compressedSize;
    CompressionType type;
    bool streamed;
};

// Where everything is in an archive that has been written to a file.
struct ArchivePlan {
    struct Node {
        std::string path;
        UInt32 flags;
        UInt64 offset; // in the data stream
        UInt64 size;
    };
    UInt64 dataOffset;
    std::vector<StoredBlock> blocks; // one after another, from dataOffset on
    std::vector<Node> nodes;
};

// Writes the archive to a file. Never holds all of the data in memory: only the description, the section, and one LZ4
// block or the LZMA encoder's state.
ArchivePlan WriteArchive(const ArchiveDescription& description, const std::string& outputFile);

// Writes an archive of every file and folder below a folder, in the order of their paths. form describes everything but
// the entries. The legacy layouts hold only files.
ArchivePlan PackFolder(const std::string& folder, const std::string& outputFile, ArchiveDescription form);
