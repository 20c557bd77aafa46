// Makes the sample archives, one per layout: MakeSamples FOLDER
#include "Tests/Support/ArchiveBuilder.h"

#include <cstdio>
#include <string>

namespace {

// Large enough for the ZarvoWeb sample, whose data must have at least 65,536 bytes.
std::string MakeTable() {
    std::string table = "number,square\n";
    for (int number = 0; number < 6'000; ++number)
        table += std::to_string(number) + "," + std::to_string(number * number) + "\n";
    return table;
}

const std::vector<ArchiveEntry> kEntries = {
    {.path = "readme.txt", .bytes = "A small archive, to see that everything works.\n"},
    {.path = "tables", .flags = kFolderEntry},
    {.path = "tables/squares.csv", .bytes = MakeTable()},
    {.path = "road/of/one/file.txt", .bytes = "Folders are made on the way.\n"},
    {.path = "empty"},
    {.path = "nothing", .flags = kFolderEntry},
};

ArchiveDescription Describe(ArchiveLayout layout) {
    ArchiveDescription archive;
    archive.layout = layout;
    for (const ArchiveEntry& entry : kEntries) {
        // The legacy directories have no folders.
        const bool isFolder = (entry.flags & kFolderEntry) != 0;
        if (isFolder && (layout == ArchiveLayout::kWeb || layout == ArchiveLayout::kRaw)) continue;
        archive.entries.push_back(entry);
    }
    return archive;
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 2) {
        fprintf(stderr, "Usage: MakeSamples FOLDER\n");
        return 2;
    }
    const std::string folder = std::string(arguments[1]) + "/";

    ArchiveDescription road = Describe(ArchiveLayout::kBlockBased);
    road.version = 8;
    road.sectionType = kCompressionLzma;
    road.chunkSize = 16'384;
    road.type = kCompressionLz4HC;
    WriteArchive(road, folder + "road.zarvo");

    WriteArchive(Describe(ArchiveLayout::kWeb), folder + "web.zarvo");
    WriteArchive(Describe(ArchiveLayout::kRaw), folder + "raw.zarvo");

    ArchiveDescription old = Describe(ArchiveLayout::kArchive);
    old.chunkSize = 16'384;
    old.type = kCompressionLzma;
    WriteArchive(old, folder + "archive.zarvo");
    return 0;
}
