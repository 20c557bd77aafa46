#include "Library/Writer/Frames.h"

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include <cstring>

using ArchiveStorageHeader::kStorageBlockCompressionTypeMask;
using ArchiveStorageHeader::kStorageBlockStreamed;

UInt8* ByteSink::Grow(size_t count) {
    const size_t begin = m_Bytes.size();
    m_IsWhole = m_IsWhole && m_Bytes.resize_uninitialized(begin + count);
    return m_IsWhole ? m_Bytes.data() + begin : nullptr;
}

void ByteSink::PutNumber(const FieldName&, UInt64 value, UInt32 size) {
    UInt8* const out = Grow(size);
    for (UInt32 index = 0; out != nullptr && index < size; ++index)
        out[index] = static_cast<UInt8>(value >> (8 * (size - 1 - index)));
}

void ByteSink::PutText(core::string_ref text) {
    UInt8* const out = Grow(text.size() + 1);
    if (out == nullptr) return;
    memcpy(out, text.data(), text.size());
    out[text.size()] = 0;
}

void ByteSink::PutZeros(size_t count) {
    UInt8* const out = Grow(count);
    if (out != nullptr) memset(out, 0, count);
}

// signature and NUL, 4 version, engineVersion and NUL, engineRevision and NUL
static void PutStart(FieldSink& sink, const ArchiveForm& form) {
    sink.PutText(form.signature);
    sink.PutNumber({"version"}, form.version, 4);
    sink.PutText(form.engineVersion);
    sink.PutText(form.engineRevision);
}

// The nodes of the block-based section and of "ZarvoArchive".
//
// 4    nodeCount
// each: 8 node[i].offset, 8 node[i].size, 4 node[i].flags, path and NUL
static void PutNodes(FieldSink& sink, const EntryList& entries) {
    sink.PutNumber({"nodeCount"}, entries.size(), 4);
    for (size_t index = 0; index < entries.size(); ++index) {
        const EntryList::Entry& entry = entries[index];
        sink.PutNumber({"offset", "node", index}, entry.offset, 8);
        sink.PutNumber({"size", "node", index}, entry.size, 8);
        sink.PutNumber({"flags", "node", index}, entry.flags, 4);
        sink.PutText(entries.PathOf(entry));
    }
}

// 8    size
// 4    compressedBlocksInfoSize
// 4    uncompressedBlocksInfoSize
// 4    flags
void PutBlockBasedHeader(FieldSink& sink, const ArchiveForm& form, const BlockBasedSizes& sizes) {
    PutStart(sink, form);
    sink.PutNumber({"size"}, sizes.archive, 8);
    sink.PutNumber({"compressedBlocksInfoSize"}, sizes.compressedSection, 4);
    sink.PutNumber({"uncompressedBlocksInfoSize"}, sizes.uncompressedSection, 4);
    sink.PutNumber({"flags"}, sizes.flags, 4);
}

// 8 8  hash.high, hash.low: nobody reads them
// 4    blockCount
// 10   each: 4 block[i].uncompressedSize, 4 block[i].compressedSize, 2 block[i].flags
//      the nodes
void PutSection(FieldSink& sink, const BlockRecords& blocks, const EntryList* directory) {
    sink.PutNumber({"hash.high"}, 0, 8);
    sink.PutNumber({"hash.low"}, 0, 8);
    sink.PutNumber({"blockCount"}, blocks.size(), 4);
    for (size_t index = 0; index < blocks.size(); ++index) {
        sink.PutNumber({"uncompressedSize", "block", index}, blocks[index].size, 4);
        sink.PutNumber({"compressedSize", "block", index}, blocks[index].storedSize, 4);
        sink.PutNumber({"flags", "block", index}, blocks[index].flags, 2);
    }
    if (directory != nullptr) PutNodes(sink, *directory);
}

// 20   from version 4 on: unused[0].high, unused[0].low, unused[0].word
// 4    unused[1].word
// 4    headerSize, where the data starts
// 4    levelBound
// 4    levelCount
// 8    level[0].compressedSize, level[0].uncompressedSize, of the whole data
// 4    from version 2 on: totalSize
// 4    from version 3 on: unused[2].word
void PutLegacyHeader(FieldSink& sink, const ArchiveForm& form, const LegacySizes& sizes) {
    PutStart(sink, form);
    if (form.version >= 4) {
        sink.PutNumber({"high", "unused", 0}, 0, 8);
        sink.PutNumber({"low", "unused", 0}, 0, 8);
        sink.PutNumber({"word", "unused", 0}, 0, 4);
    }
    sink.PutNumber({"word", "unused", 1}, 0, 4);
    sink.PutNumber({"headerSize"}, sizes.header, 4);
    sink.PutNumber({"levelBound"}, 1, 4);
    sink.PutNumber({"levelCount"}, 1, 4);
    sink.PutNumber({"compressedSize", "level", 0}, sizes.stored, 4);
    sink.PutNumber({"uncompressedSize", "level", 0}, sizes.data, 4);
    if (form.version >= 2) sink.PutNumber({"totalSize"}, sizes.header + sizes.stored, 4);
    if (form.version >= 3) sink.PutNumber({"word", "unused", 2}, 0, 4);
}

// 4    entryCount
// each: path and NUL, 4 node[i].offset, 4 node[i].size
void PutLegacyDirectory(FieldSink& sink, const EntryList& entries) {
    sink.PutNumber({"entryCount"}, entries.size(), 4);
    for (size_t index = 0; index < entries.size(); ++index) {
        sink.PutText(entries.PathOf(index));
        sink.PutNumber({"offset", "node", index}, entries[index].offset, 4);
        sink.PutNumber({"size", "node", index}, entries[index].size, 4);
    }
}

UInt64 LegacyDirectorySize(const EntryList& entries) {
    UInt64 size = 4;
    for (size_t index = 0; index < entries.size(); ++index)
        size += 9 + entries[index].pathSize;
    return size;
}

// signature and NUL, 8 headerPosition
void PutArchivePrologue(FieldSink& sink, core::string_ref signature, UInt64 position) {
    sink.PutText(signature);
    sink.PutNumber({"headerPosition"}, position, 8);
}

// 4    version
//      engineVersion and NUL, engineRevision and NUL
// 24   unused[0].high, unused[0].low, unused[0].word, unused[1].word
// 4    directoryPosition, counted from the header
// 4    dataPosition
//      the nodes
// 4    blockCount
// 8    blockCount + 1 times, if there are blocks: running[i].uncompressed
// 16   blockCount times: 8 running[i].stored, 4 running[i].type, 4 running[i].streamed (bit 0)
// 16   if there are blocks: 8 running[blockCount].stored, 4 endType, 4 endStreamed; nobody reads the last two
void PutArchiveHeader(FieldSink& sink, const ArchiveForm& form, UInt64 dataPosition, const BlockRecords& blocks,
                      const EntryList& entries) {
    sink.PutNumber({"version"}, form.version, 4);
    sink.PutText(form.engineVersion);
    sink.PutText(form.engineRevision);
    sink.PutNumber({"high", "unused", 0}, 0, 8);
    sink.PutNumber({"low", "unused", 0}, 0, 8);
    sink.PutNumber({"word", "unused", 0}, 0, 4);
    sink.PutNumber({"word", "unused", 1}, 0, 4);
    const UInt64 directoryPosition = 4 + form.engineVersion.size() + 1 + form.engineRevision.size() + 1 + 24 + 4;
    sink.PutNumber({"directoryPosition"}, directoryPosition, 4);
    sink.PutNumber({"dataPosition"}, dataPosition, 4);
    PutNodes(sink, entries);
    sink.PutNumber({"blockCount"}, blocks.size(), 4);
    if (blocks.empty()) return;

    UInt64 position = 0;
    sink.PutNumber({"uncompressed", "running", 0}, position, 8);
    for (size_t index = 0; index < blocks.size(); ++index) {
        position += blocks[index].size;
        sink.PutNumber({"uncompressed", "running", index + 1}, position, 8);
    }
    position = 0;
    for (size_t index = 0; index < blocks.size(); ++index) {
        const UInt32 flags = blocks[index].flags;
        sink.PutNumber({"stored", "running", index}, position, 8);
        sink.PutNumber({"type", "running", index}, flags & kStorageBlockCompressionTypeMask, 4);
        sink.PutNumber({"streamed", "running", index}, (flags & kStorageBlockStreamed) != 0 ? 1 : 0, 4);
        position += blocks[index].storedSize;
    }
    sink.PutNumber({"stored", "running", blocks.size()}, position, 8);
    sink.PutNumber({"endType"}, 0, 4);
    sink.PutNumber({"endStreamed"}, 0, 4);
}
