#include "Fuzz/FuzzArchives.h"

#include <algorithm>
#include <string_view>

BuiltArchive BuildArchiveFrom(FuzzInput& input) {
    constexpr CompressionType kTypes[] = {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC};
    constexpr ArchiveLayout kLayouts[] = {ArchiveLayout::kBlockBased, ArchiveLayout::kArchive, ArchiveLayout::kWeb};
    ArchiveDescription description;
    description.layout = kLayouts[input.TakeBelow(std::size(kLayouts))];
    // Repeated, so that a stream has several windows.
    const UInt64 copies = 1 + input.TakeBelow(300);
    std::vector<ArchiveBlock> blocks(input.TakeBelow(6));
    for (ArchiveBlock& block : blocks) {
        const CompressionType type = kTypes[input.TakeBelow(std::size(kTypes))];
        block.type = type;
        block.streamed = (type == kCompressionLzma || type == kCompressionNone) && input.TakeBelow(2) != 0;
        block.size = input.TakeBelow(100'000);
    }
    const std::string_view bytes(reinterpret_cast<const char*>(input.data()), input.size());
    std::string text;
    for (UInt64 copy = 0; copy < copies && text.size() < kMaxFuzzStream / 2; ++copy)
        text += bytes;
    UInt64 left = text.size();
    for (ArchiveBlock& block : blocks) {
        block.size = std::min(block.size, left);
        left -= block.size;
    }
    // What decodes to nothing is damage in the eyes of LZ4.
    std::erase_if(blocks, [](const ArchiveBlock& block) { return block.size == 0; });
    if (description.layout != ArchiveLayout::kWeb) description.blocks = std::move(blocks);
    description.entries = {{.path = "file", .bytes = std::move(text)}};
    description.lzma.endMark = input.TakeBelow(2) != 0;
    return BuildArchive(description);
}
