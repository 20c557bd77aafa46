#include "Tools/ArchiveWriter/ArchiveFrames.h"

namespace {

UInt64 RoundUpTo16(UInt64 value) { return (value + 15) / 16 * 16; }

std::string Indexed(const char* list, size_t index, const char* field) {
    return std::string(list) + "[" + std::to_string(index) + "]." + field;
}

UInt64 SumOfStoredSizes(const std::vector<StoredBlock>& blocks) {
    UInt64 sum = 0;
    for (const StoredBlock& block : blocks)
        sum += block.compressedSize;
    return sum;
}

// The nodes of the block-based section and of the old archive. Each is: 8 node[i].offset, 8 node[i].size,
// 4 node[i].flags, path and NUL.
void PutNodes(FieldWriter& writer, const std::vector<PlacedNode>& nodes) {
    for (size_t index = 0; index < nodes.size(); ++index) {
        writer.Put64(Indexed("node", index, "offset"), nodes[index].offset);
        writer.Put64(Indexed("node", index, "size"), nodes[index].size);
        writer.Put32(Indexed("node", index, "flags"), nodes[index].entry->flags);
        writer.PutText(nodes[index].entry->path);
    }
}

// The blocks-info section.
//
// 8 8  hash.high, hash.low
// 4    blockCount
// 10   each: 4 block[i].uncompressedSize, 4 block[i].compressedSize, 2 block[i].flags (kind, 0x40 streamed)
// 4    nodeCount      (only with the directory)
//      nodes          (only with the directory)
FieldWriter MakeSection(const ArchiveDescription& description, GivenFields& given,
                        const std::vector<StoredBlock>& blocks, const std::vector<PlacedNode>& nodes) {
    FieldWriter writer(given);
    writer.Put64("hash.high", 0);
    writer.Put64("hash.low", 0);
    writer.Put32("blockCount", blocks.size());
    for (size_t index = 0; index < blocks.size(); ++index) {
        const StoredBlock& block = blocks[index];
        writer.Put32(Indexed("block", index, "uncompressedSize"), block.uncompressedSize);
        writer.Put32(Indexed("block", index, "compressedSize"), block.compressedSize);
        writer.Put16(Indexed("block", index, "flags"), block.type | (block.streamed ? 0x40u : 0u));
    }
    if (!description.directoryInSection) return writer;
    writer.Put32("nodeCount", nodes.size());
    PutNodes(writer, nodes);
    return writer;
}

// The block-based layout.
//
//      signature and NUL
// 4    version
//      engineVersion and NUL, engineRevision and NUL
// 8    size
// 4    compressedBlocksInfoSize
// 4    uncompressedBlocksInfoSize
// 4    flags: 0x3F kind of the section, 0x40 directory, 0x80 at the end, 0x100 web signature, 0x200 padded
// 1    only with flag 0x100. Without it, the NUL of "ZarvoWeb" is not counted either, and what follows overwrites the
//      last byte of flags
//      from version 7 on: NULs up to a multiple of 16
//      the section; with flag 0x200: NULs up to a multiple of 16 from its start
//      the data
//      with flag 0x80: the section, without padding, here instead
Frame MakeBlockBasedFrame(const ArchiveDescription& description, GivenFields& given,
                          const std::vector<StoredBlock>& blocks, const std::vector<PlacedNode>& nodes) {
    const bool isWeb = description.layout == ArchiveLayout::kWebVersion6;
    const UInt32 version = description.version.value_or(isWeb ? 6 : 7);
    const FieldWriter section = MakeSection(description, given, blocks, nodes);
    const std::string storedSection = Compress(description.sectionType, section.Bytes());
    const UInt64 room = description.sectionPadded ? RoundUpTo16(storedSection.size()) : storedSection.size();

    const std::string signature = description.signature.value_or(isWeb ? "ZarvoWeb" : "ZarvoFS");
    const bool hasWebFlag = isWeb && description.webSignatureFlag;
    UInt64 headerSize = signature.size() + description.engineVersion.size() + description.engineRevision.size() + 27;
    if (isWeb) headerSize = hasWebFlag ? headerSize + 1 : headerSize - 1;
    if (version >= 7) headerSize = RoundUpTo16(headerSize);
    const UInt64 size =
        headerSize + (description.sectionAtEnd ? storedSection.size() : room) + SumOfStoredSizes(blocks);

    Frame frame{FieldWriter(given), FieldWriter(given)};
    frame.head.PutText(signature);
    frame.head.Put32("version", version);
    frame.head.PutText(description.engineVersion);
    frame.head.PutText(description.engineRevision);
    frame.head.Put64("size", size);
    frame.head.Put32("compressedBlocksInfoSize", storedSection.size());
    frame.head.Put32("uncompressedBlocksInfoSize", section.Size());
    frame.head.Put32("flags", description.sectionType | (description.directoryInSection ? 0x40u : 0u) |
                                  (description.sectionAtEnd ? 0x80u : 0u) | (hasWebFlag ? 0x100u : 0u) |
                                  (description.sectionPadded ? 0x200u : 0u));
    frame.head.ResizeTo(headerSize);
    frame.headerSize = headerSize;
    frame.sectionSize = storedSection.size();
    frame.sectionOffset = description.sectionAtEnd ? headerSize + SumOfStoredSizes(blocks) : headerSize;

    FieldWriter& part = description.sectionAtEnd ? frame.tail : frame.head;
    if (description.sectionType == kCompressionNone)
        part.PutPart(section);
    else
        part.PutBytes(storedSection);
    if (!description.sectionAtEnd) frame.head.ResizeTo(headerSize + room);
    return frame;
}

// The legacy header of "ZarvoWeb" and "ZarvoRaw".
//
//      signature and NUL
// 4    version
//      engineVersion and NUL, engineRevision and NUL
// 20   from version 4 on: 16 bytes and unused[0].word
// 4    unused[1].word
// 4    headerSize, where the data starts
// 4    levelBound
// 4    levelCount
// 8    each: 4 level[i].compressedSize, 4 level[i].uncompressedSize; the last is that of the whole data
// 4    from version 2 on: totalSize
// 4    from version 3 on: unused[2].word
//      the data, whose stream starts with the directory
Frame MakeLegacyFrame(const ArchiveDescription& description, GivenFields& given,
                      const std::vector<StoredBlock>& blocks) {
    const char* const name = description.layout == ArchiveLayout::kWeb ? "ZarvoWeb" : "ZarvoRaw";
    const std::string signature = description.signature.value_or(name);
    const UInt32 version = description.version.value_or(3);
    const UInt64 headerSize = signature.size() + 1 + 4 + description.engineVersion.size() + 1 +
                              description.engineRevision.size() + 1 + (version >= 4 ? 20 : 0) + 16 +
                              8 * UInt64{description.levelCount} + (version >= 2 ? 4 : 0) + (version >= 3 ? 4 : 0);
    constexpr UInt32 kUnused = 0x55AA55AA;

    Frame frame{FieldWriter(given), FieldWriter(given)};
    frame.head.PutText(signature);
    frame.head.Put32("version", version);
    frame.head.PutText(description.engineVersion);
    frame.head.PutText(description.engineRevision);
    if (version >= 4) {
        frame.head.PutBytes(std::string(16, '\x55'));
        frame.head.Put32("unused[0].word", kUnused);
    }
    frame.head.Put32("unused[1].word", kUnused);
    frame.head.Put32("headerSize", headerSize);
    frame.head.Put32("levelBound", description.levelCount);
    frame.head.Put32("levelCount", description.levelCount);
    for (UInt32 level = 0; level < description.levelCount; ++level) {
        const bool isLast = level + 1 == description.levelCount;
        frame.head.Put32(Indexed("level", level, "compressedSize"), isLast ? blocks.front().compressedSize : kUnused);
        frame.head.Put32(Indexed("level", level, "uncompressedSize"),
                         isLast ? blocks.front().uncompressedSize : kUnused);
    }
    if (version >= 2) frame.head.Put32("totalSize", headerSize + SumOfStoredSizes(blocks));
    if (version >= 3) frame.head.Put32("unused[2].word", kUnused);
    frame.headerSize = headerSize;
    return frame;
}

// "ZarvoArchive".
//
//      signature and NUL
// 8    headerPosition
//      at headerPosition, before or after the data:
// 4    version
//      engineVersion and NUL, engineRevision and NUL
// 24   16 bytes, unused[0].word, unused[1].word
// 4    directoryPosition, counted from headerPosition
// 4    dataPosition
// 4    nodeCount
//      nodes
// 4    blockCount
// 8    blockCount + 1 times, if there are blocks: running[i].uncompressed, from any start
// 16   blockCount + 1 times, if there are blocks: 8 running[i].stored, 4 running[i].type, 4 running[i].streamed (bit 0)
Frame MakeArchiveFrame(const ArchiveDescription& description, GivenFields& given,
                       const std::vector<StoredBlock>& blocks, const std::vector<PlacedNode>& nodes) {
    const std::string signature = description.signature.value_or("ZarvoArchive");
    const UInt64 prologueSize = signature.size() + 1 + 8;
    const UInt64 directoryPosition =
        4 + description.engineVersion.size() + 1 + description.engineRevision.size() + 1 + 28;
    UInt64 headerSize = directoryPosition + 12 + (blocks.empty() ? 0 : 24 * (blocks.size() + 1));
    for (const PlacedNode& node : nodes)
        headerSize += 21 + node.entry->path.size();
    const UInt64 dataPosition = prologueSize + (description.sectionAtEnd ? 0 : headerSize);

    Frame frame{FieldWriter(given), FieldWriter(given)};
    frame.sectionOffset = description.sectionAtEnd ? dataPosition + SumOfStoredSizes(blocks) : prologueSize;
    frame.sectionSize = headerSize;
    frame.headerSize = prologueSize;
    frame.head.PutText(signature);
    frame.head.Put64("headerPosition", frame.sectionOffset);

    FieldWriter& part = description.sectionAtEnd ? frame.tail : frame.head;
    part.Put32("version", description.version.value_or(5));
    part.PutText(description.engineVersion);
    part.PutText(description.engineRevision);
    part.PutBytes(std::string(16, '\x55'));
    part.Put32("unused[0].word", 1);
    part.Put32("unused[1].word", 2);
    part.Put32("directoryPosition", directoryPosition);
    part.Put32("dataPosition", dataPosition);
    part.Put32("nodeCount", nodes.size());
    PutNodes(part, nodes);
    part.Put32("blockCount", blocks.size());
    if (blocks.empty()) return frame;

    UInt64 uncompressed = 1'000;
    for (size_t index = 0; index <= blocks.size(); ++index) {
        part.Put64(Indexed("running", index, "uncompressed"), uncompressed);
        if (index < blocks.size()) uncompressed += blocks[index].uncompressedSize;
    }
    UInt64 stored = 5'000;
    for (size_t index = 0; index <= blocks.size(); ++index) {
        const bool isEnd = index == blocks.size();
        part.Put64(Indexed("running", index, "stored"), stored);
        part.Put32(Indexed("running", index, "type"), isEnd ? 4u : blocks[index].type);
        part.Put32(Indexed("running", index, "streamed"), isEnd || blocks[index].streamed ? 1u : 0u);
        if (!isEnd) stored += blocks[index].compressedSize;
    }
    return frame;
}

} // namespace

// The legacy directory, at the start of the data stream.
//
// 4    entryCount
// each:
//      path, NUL-terminated
// 4    node[i].offset, in the stream that this directory is part of
// 4    node[i].size
FieldWriter MakeLegacyDirectory(GivenFields& given, const std::vector<PlacedNode>& nodes) {
    FieldWriter writer(given);
    writer.Put32("entryCount", nodes.size());
    for (size_t index = 0; index < nodes.size(); ++index) {
        writer.PutText(nodes[index].entry->path);
        writer.Put32(Indexed("node", index, "offset"), nodes[index].offset);
        writer.Put32(Indexed("node", index, "size"), nodes[index].size);
    }
    return writer;
}

Frame MakeFrame(const ArchiveDescription& description, GivenFields& given, const std::vector<StoredBlock>& blocks,
                const std::vector<PlacedNode>& nodes) {
    if (HasLegacyDirectory(description.layout)) return MakeLegacyFrame(description, given, blocks);
    if (description.layout == ArchiveLayout::kArchive) return MakeArchiveFrame(description, given, blocks, nodes);
    return MakeBlockBasedFrame(description, given, blocks, nodes);
}
