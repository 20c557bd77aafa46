// Makes the seed corpora of the fuzzers, one folder per fuzzer: MakeSeeds FOLDER
#include "Tests/Support/ArchiveBuilder.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>

namespace {

std::string Text(size_t size) {
    std::string text;
    for (int line = 0; text.size() < size; ++line)
        text += "line " + std::to_string(line * 7919) + "\n";
    text.resize(size);
    return text;
}

void WriteSeed(const std::filesystem::path& folder, const std::string& name, const std::string& bytes) {
    std::filesystem::create_directories(folder);
    std::ofstream(folder / name, std::ios::binary) << bytes;
}

ArchiveDescription Describe(ArchiveLayout layout, CompressionType type, bool isStreamed, size_t textSize) {
    ArchiveDescription archive;
    archive.layout = layout;
    archive.entries = {{.path = "a/b.txt", .bytes = Text(textSize)}, {.path = "c.assets", .bytes = "tail"}};
    if (layout != ArchiveLayout::kWeb && layout != ArchiveLayout::kRaw)
        archive.entries.push_back({.path = "folder", .flags = kFolderEntry});
    archive.type = type;
    archive.streamed = isStreamed;
    archive.chunkSize = 400;
    return archive;
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 2) {
        fprintf(stderr, "Usage: MakeSeeds FOLDER\n");
        return 2;
    }
    const std::filesystem::path root = arguments[1];

    int count = 0;
    const auto write = [&](const ArchiveDescription& archive) {
        const std::string bytes = BuildArchive(archive).bytes;
        const std::string name = "seed" + std::to_string(count++);
        for (const char* fuzzer : {"HeaderFuzzer", "LegacyFuzzer", "ReaderFuzzer", "CommandFuzzer", "LibraryFuzzer"})
            WriteSeed(root / fuzzer, name, bytes);
    };
    for (CompressionType type : {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC}) {
        for (bool isStreamed : {false, true}) {
            ArchiveDescription archive = Describe(ArchiveLayout::kBlockBased, type, isStreamed, 1'500);
            archive.sectionType = type;
            archive.sectionAtEnd = isStreamed;
            archive.sectionPadded = !isStreamed;
            archive.version = isStreamed ? 8 : 6;
            write(archive);
            write(Describe(ArchiveLayout::kArchive, type, isStreamed, 900));
        }
    }
    for (UInt32 version : {1u, 2u, 3u, 4u}) {
        ArchiveDescription archive = Describe(ArchiveLayout::kRaw, kCompressionNone, true, 300);
        archive.version = version;
        write(archive);
        archive.layout = ArchiveLayout::kWeb;
        write(archive);
    }
    write(Describe(ArchiveLayout::kWeb, kCompressionLzma, true, 70'000)); // a stream of more than one window
    write(Describe(ArchiveLayout::kBlockBased, kCompressionLzma, true, 140'000));
    write(Describe(ArchiveLayout::kWebVersion6, kCompressionNone, false, 100));

    const std::string text = Text(3'000);
    const std::filesystem::path decompressor = root / "DecompressorFuzzer";
    for (const std::filesystem::path& folder : {decompressor, root / "LzmaFuzzer"}) {
        WriteSeed(folder, "lzma", CompressLzma(text));
        WriteSeed(folder, "lzma-mark", CompressLzma(text, {.endMark = true}));
        WriteSeed(folder, "lzma-empty", CompressLzma("", {.endMark = true}));
    }
    WriteSeed(decompressor, "lz4", CompressLz4(text));
    WriteSeed(decompressor, "lz4hc", CompressLz4HC(text));
    // A directory alone, as a legacy data stream starts with it.
    ArchiveDescription directory = Describe(ArchiveLayout::kRaw, kCompressionNone, true, 0);
    const BuiltArchive built = BuildArchive(directory);
    WriteSeed(root / "LegacyFuzzer", "directory", built.stream);

    // Both draw all they need from single bytes.
    WriteSeed(root / "PatternFuzzer", "text", Text(60));
    WriteSeed(root / "PathFuzzer", "text", Text(300));
    return 0;
}
