// Makes the archives that scripts/bench extracts. PackFolder KIND FOLDER ARCHIVE packs the contents of a folder.
// PackFolder KIND COUNT ARCHIVE packs that many empty files, a thousand per folder. ARCHIVE.plan says where everything
// is, in lines of text:
//
//   data OFFSET                         where the data starts in the archive
//   block STORED SIZE TYPE CODED        stored and uncompressed size; where the coded bytes start in the stored ones
//   node FLAGS OFFSET SIZE PATH         place in the data stream
#include "Tests/Support/ArchiveBuilder.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// The strongest level of the encoder's fast mode. The archives of the other programs are packed with the same level,
// dictionary and match finder.
constexpr int kLzmaLevel = 4;
constexpr UInt32 kChunk = 131'072;
constexpr UInt32 kStream = 8'388'608;

struct Kind {
    const char* name;
    ArchiveLayout layout;
    CompressionType type = kCompressionNone;
    UInt32 blockSize = kChunk; // also the dictionary's; the legacy layouts have one block
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
        // The legacy stream has a size field after the properties.
        const unsigned codedOffset = block.type != kCompressionLzma ? 0 : layout == ArchiveLayout::kWeb ? 13 : 5;
        fprintf(file, "block %llu %llu %u %u\n", block.compressedSize, block.uncompressedSize, block.type, codedOffset);
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
        char* numberEnd;
        const unsigned long count = strtoul(arguments[2], &numberEnd, 10);
        const bool isCount = *numberEnd == '\0';
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
