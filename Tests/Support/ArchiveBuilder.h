// Makes archives of every layout and version, with the encoders and frames of libzarvo: a description of entries,
// blocks and form becomes the bytes of an archive. Each stored field can be given another value by its name.
//
//   ArchiveDescription archive;
//   archive.entries = {{.path = "a.txt", .bytes = "text"}};
//   archive.type = kCompressionLz4;
//   archive.fields = {{"version", 9}};
//   BuiltArchive built = BuildArchive(archive);      // built.bytes, and where its parts lie
//
// A wrong description (an unknown field name) is the caller's fault and ends the program with a message. Any thread.
#pragma once

#include "Runtime/Core/Types.h"
#include "Tests/Support/Compressors.h"

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
    UInt32 flags = 0;   // of the node; the legacy layouts don't store them
    bool listed = true; // false: the bytes are in the data stream, but no node names them
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

    // Values that are stored instead of the right ones. The names are those in the layout tables of Frames.cpp,
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

// The same, into a file.
void WriteArchive(const ArchiveDescription& description, const std::string& outputFile);
