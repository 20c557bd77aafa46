// Makes the archives that scripts/bench extracts: PackFolder KIND FOLDER ARCHIVE packs what a folder holds, and
// PackFolder KIND COUNT ARCHIVE makes so many empty files, a thousand in each folder. ARCHIVE.plan says what lies
// where, in lines of text:
//
//   data OFFSET                         the data's, in the archive
//   block STORED SIZE TYPE BEHIND       stored and uncompressed size; of the coded bytes, how far behind the first
//   node FLAGS OFFSET SIZE PATH         place in the data stream
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// Level 4 is the strongest of the encoder's fast mode. What is compared with these archives is packed with the same
// level, dictionary and match finder.
constexpr int kLzmaLevel = 4;
constexpr UInt32 kChunk = 131'072;
constexpr UInt32 kStream = 8'388'608;

struct Kind {
    const char* name;
    ArchiveLayout layout;
    CompressionType type = kCompressionNone;
    UInt32 blockSize = kChunk; // and the dictionary; the legacy layouts have one block
    bool streamed = false;
};

constexpr Kind kKinds[] = {
    {"lz4hc", ArchiveLayout::kBlockBased, kCompressionLz4HC},
    {"lzma", ArchiveLayout::kBlockBased, kCompressionLzma},
    {"streamed", ArchiveLayout::kBlockBased, kCompressionLzma, kStream, true},
    {"stored", ArchiveLayout::kBlockBased},
    {"web", ArchiveLayout::kWeb, kCompressionLzma, kStream},
    {"raw", ArchiveLayout::kRaw},
};

ArchivePlan WriteEmptyFiles(unsigned long count, const char* outputFile, ArchiveDescription form) {
    constexpr unsigned long kFilesInFolder = 1'000;
    char path[64];
    for (unsigned long index = 0; index < count; ++index) {
        const unsigned long folder = index / kFilesInFolder;
        if (index % kFilesInFolder == 0 && form.layout == ArchiveLayout::kBlockBased) {
            snprintf(path, sizeof(path), "%04lu", folder);
            form.entries.push_back({.path = path, .flags = kFolderEntry});
        }
        snprintf(path, sizeof(path), "%04lu/%03lu", folder, index % kFilesInFolder);
        form.entries.push_back({.path = path});
    }
    return WriteArchive(form, outputFile);
}

bool WritePlan(const ArchivePlan& plan, ArchiveLayout layout, const std::string& outputFile) {
    FILE* file = fopen(outputFile.c_str(), "w");
    if (file == nullptr) return false;
    fprintf(file, "data %llu\n", plan.dataOffset);
    for (const StoredBlock& block : plan.blocks) {
        // The legacy stream has a size field behind the properties.
        const unsigned behind = block.type != kCompressionLzma ? 0 : layout == ArchiveLayout::kWeb ? 13 : 5;
        fprintf(file, "block %llu %llu %u %u\n", block.compressedSize, block.uncompressedSize, block.type, behind);
    }
    for (const ArchivePlan::Node& node : plan.nodes)
        fprintf(file, "node %u %llu %llu %s\n", node.flags, node.offset, node.size, node.path.c_str());
    return fclose(file) == 0;
}

} // namespace

int main(int argumentCount, char** arguments) {
    for (const Kind& kind : kKinds) {
        if (argumentCount != 4 || strcmp(arguments[1], kind.name) != 0) continue;
        ArchiveDescription form;
        form.layout = kind.layout;
        form.type = kind.type;
        form.chunkSize = kind.blockSize;
        form.streamed = kind.streamed;
        form.lzma = {.level = kLzmaLevel, .dictionarySize = kind.blockSize};
        char* behindNumber;
        const unsigned long count = strtoul(arguments[2], &behindNumber, 10);
        const bool isCount = *behindNumber == '\0';
        const ArchivePlan plan =
            isCount ? WriteEmptyFiles(count, arguments[3], form) : PackFolder(arguments[2], arguments[3], form);
        return WritePlan(plan, form.layout, std::string(arguments[3]) + ".plan") ? 0 : 1;
    }
    fprintf(stderr, "Usage: PackFolder KIND FOLDER|COUNT ARCHIVE, where KIND is one of:");
    for (const Kind& kind : kKinds)
        fprintf(stderr, " %s", kind.name);
    fprintf(stderr, "\n");
    return 2;
}
