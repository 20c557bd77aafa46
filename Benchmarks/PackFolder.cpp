// Makes the archives that scripts/bench extracts. PackFolder KIND FOLDER ARCHIVE packs the contents of a folder.
// PackFolder KIND COUNT ARCHIVE packs that many empty files, a thousand per folder. ARCHIVE.plan says where everything
// is, in lines of text:
//
//   data OFFSET                         where the data starts in the archive
//   block STORED SIZE TYPE CODED        stored and uncompressed size; where the coded bytes start in the stored ones
//   node FLAGS OFFSET SIZE PATH         place in the data stream
#include "Library/include/zarvo.hpp"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// The strongest level of the encoder's fast mode. Its dictionary has 4 MiB, or the size of a block. The archives of the
// other programs are packed with the same level and match finder.
constexpr int kLzmaLevel = 4;
constexpr uint64_t kStream = 8'388'608;

struct Kind {
    const char* name;
    zarvo::create_options how;
};

const Kind kKinds[] = {
    {"lz4hc", {}},
    {"lzma", {.compression = ZARVO_KIND_LZMA, .level = kLzmaLevel}},
    {"streamed", {.level = kLzmaLevel, .is_streamed = true, .block_size = kStream}},
    {"stored", {.compression = ZARVO_KIND_NONE}},
    {"web", {.layout = ZARVO_LAYOUT_WEB, .level = kLzmaLevel}},
    {"raw", {.layout = ZARVO_LAYOUT_RAW}},
};

zarvo::error WriteEmptyFiles(unsigned long count, const char* archive, const zarvo::create_options& how) {
    constexpr unsigned long kFilesInFolder = 1'000;
    const bool hasFolders = how.layout == ZARVO_LAYOUT_FS;
    zarvo::writer writer;
    for (unsigned long index = 0; index < count; ++index) {
        char path[64];
        snprintf(path, sizeof(path), "%04lu", index / kFilesInFolder);
        zarvo::error error;
        if (index % kFilesInFolder == 0 && hasFolders) error = writer.add_folder(path);
        snprintf(path, sizeof(path), "%04lu/%03lu", index / kFilesInFolder, index % kFilesInFolder);
        if (!error) error = writer.add(path, std::span<const std::byte>());
        if (error) return error;
    }
    return writer.write(archive, {}, how).error;
}

bool WritePlan(const char* archive) {
    ArchiveStorageReader reader(kMemLabelGeneral);
    if (reader.Initialize(core::string(archive), 0) != 0 || !reader.FindDirectory()) return false;
    zarvo::result<zarvo::archive> opened = zarvo::archive::open(archive);
    FILE* const file = fopen((std::string(archive) + ".plan").c_str(), "w");
    if (!opened || file == nullptr) return false;
    fprintf(file, "data %llu\n",
            static_cast<unsigned long long>(ArchiveStorageHeader::GetDataOffset(reader.GetHeader())));
    for (uint64_t index = 0; index < opened->block_count(); ++index) {
        const zarvo_block block = opened->block(index);
        // The legacy stream has a size field after the properties.
        const bool isWeb = opened->info().layout == ZARVO_LAYOUT_WEB;
        const int coded = block.kind != ZARVO_KIND_LZMA ? 0 : isWeb ? 13 : 5;
        fprintf(file, "block %u %u %d %d\n", block.stored_size, block.size, block.kind, coded);
    }
    for (const ArchiveStorageHeader::Node& node : reader.GetDirectoryInfo().nodes)
        fprintf(file, "node %u %llu %llu %s\n", node.flags & ArchiveStorageHeader::kNodeDirectory,
                static_cast<unsigned long long>(node.offset), static_cast<unsigned long long>(node.size),
                node.path.c_str());
    return fclose(file) == 0;
}

} // namespace

int main(int argumentCount, char** arguments) {
    for (const Kind& kind : kKinds) {
        if (argumentCount != 4 || strcmp(arguments[1], kind.name) != 0) continue;
        zarvo::create_options how = kind.how;
        how.force = true;
        char* numberEnd;
        const unsigned long count = strtoul(arguments[2], &numberEnd, 10);
        const zarvo::error error = *numberEnd == '\0' ? WriteEmptyFiles(count, arguments[3], how)
                                                      : zarvo::create(arguments[3], arguments[2], {}, how).error;
        if (error) fprintf(stderr, "PackFolder: %s\n", std::string(error.text()).c_str());
        return !error && WritePlan(arguments[3]) ? 0 : 1;
    }
    fprintf(stderr, "Usage: PackFolder KIND FOLDER|COUNT ARCHIVE, where KIND is one of:");
    for (const Kind& kind : kKinds)
        fprintf(stderr, " %s", kind.name);
    fprintf(stderr, "\n");
    return 2;
}
