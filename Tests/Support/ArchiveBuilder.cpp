#include "Tests/Support/ArchiveBuilder.h"

#include "Library/Writer/Encoders.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"
#include "Tests/Support/PatchedFields.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>

// The archive is made in three parts: what comes before the data (head), the data, and what comes after it (tail). The
// data is made first, because one of the other parts stores the sizes of its blocks.

namespace {

using namespace ArchiveStorageHeader;

void Require(bool isTrue, const std::string& message) {
    if (isTrue) return;
    fprintf(stderr, "ArchiveBuilder: %s\n", message.c_str());
    abort();
}

bool HasLegacyDirectory(ArchiveLayout layout) { return layout == ArchiveLayout::kWeb || layout == ArchiveLayout::kRaw; }

// The listed entries, the first of which begins at offset in the data stream.
void Place(const ArchiveDescription& description, UInt64 offset, EntryList* list) {
    list->Filter([](const EntryList::Entry&) { return false; });
    for (const ArchiveEntry& entry : description.entries) {
        if (entry.listed) {
            Require(list->Add({entry.path.data(), entry.path.size()}, entry.flags, entry.bytes.size()),
                    "out of memory");
            (*list)[list->size() - 1].offset = offset;
        }
        offset += entry.bytes.size();
    }
}

// The data stream: the legacy directory if there is one, then the entries' bytes one after another.
struct DataStream {
    DataStream(const ArchiveDescription& description, GivenFields& given) : directory(given) {
        const bool isLegacy = HasLegacyDirectory(description.layout);
        Place(description, 0, &list);
        if (isLegacy) Place(description, LegacyDirectorySize(list), &list);
        if (isLegacy) PutLegacyDirectory(directory, list);
        bytes = directory.Bytes();
        for (const ArchiveEntry& entry : description.entries)
            bytes += entry.bytes;
    }

    EntryList list;
    PatchedFields directory;
    std::string bytes;
};

CompressionType TypeOf(const ArchiveDescription& description, const ArchiveBlock& block) {
    if (description.layout == ArchiveLayout::kWeb) return kCompressionLzma;
    if (description.layout == ArchiveLayout::kRaw) return kCompressionNone;
    return block.type.value_or(description.type);
}

std::string StoreBlock(const ArchiveDescription& description, const ArchiveBlock& block, std::string_view plain) {
    if (block.stored) return *block.stored;
    std::string stored = Compress(TypeOf(description, block), plain, description.lzma);
    if (description.layout != ArchiveLayout::kWeb) return stored;
    // In the legacy stream, the size of its data follows the properties, least significant byte first.
    std::string sizeField;
    for (int byte = 0; byte < 8; ++byte)
        sizeField.push_back(static_cast<char>(block.size >> (8 * byte)));
    return stored.insert(kLzmaPropertiesSize, sizeField);
}

// Stores the stream block by block.
void StoreBlocks(const ArchiveDescription& description, std::string_view stream, std::string* data,
                 BlockRecords* records) {
    std::vector<ArchiveBlock> cut = description.blocks;
    UInt64 position = 0;
    for (const ArchiveBlock& block : cut)
        position += block.size;
    const bool isWhole = description.chunkSize == 0 || HasLegacyDirectory(description.layout);
    while (position < stream.size()) {
        const UInt64 left = stream.size() - position;
        cut.push_back({.size = isWhole ? left : std::min(description.chunkSize, left)});
        position += cut.back().size;
    }
    Require(position == stream.size(), "the blocks need more bytes than the entries have");

    for (const ArchiveBlock& block : cut) {
        const std::string stored = StoreBlock(description, block, stream.substr(0, block.size));
        stream.remove_prefix(block.size);
        UInt32 flags = TypeOf(description, block);
        if (block.streamed.value_or(description.streamed)) flags |= kStorageBlockStreamed;
        records->push_back(
            {static_cast<UInt32>(block.size), static_cast<UInt32>(stored.size()), static_cast<UInt16>(flags)});
        *data += stored;
    }
}

// What comes before and after the data.
struct Frame {
    explicit Frame(GivenFields& given) : head(given), tail(given) {}

    PatchedFields head;
    PatchedFields tail;
    UInt64 headerSize = 0;
    UInt64 sectionOffset = 0;
    UInt64 sectionSize = 0;
};

class FrameBuilder {
public:
    FrameBuilder(const ArchiveDescription& description, GivenFields& given, const EntryList& list,
                 const BlockRecords& records, UInt64 storedSize)
        : m_Description(description), m_Given(given), m_List(list), m_Records(records), m_StoredSize(storedSize) {
        constexpr struct {
            const char* signature;
            UInt32 version;
        } kForms[] = {{"ZarvoFS", 7}, {"ZarvoWeb", 6}, {"ZarvoWeb", 3}, {"ZarvoRaw", 3}, {"ZarvoArchive", 5}};
        const auto& form = kForms[static_cast<size_t>(description.layout)];
        m_Signature = description.signature.value_or(form.signature);
        m_Form = {.signature = {m_Signature.data(), m_Signature.size()},
                  .version = description.version.value_or(form.version),
                  .engineVersion = {description.engineVersion.data(), description.engineVersion.size()},
                  .engineRevision = {description.engineRevision.data(), description.engineRevision.size()}};
    }

    void Build(Frame& frame) {
        if (HasLegacyDirectory(m_Description.layout)) return BuildLegacy(frame);
        return m_Description.layout == ArchiveLayout::kArchive ? BuildArchive(frame) : BuildBlockBased(frame);
    }

private:
    // Header and section, or header, data and section. The older signature is counted with one byte more, or where its
    // flag is missing with one less: what follows then overwrites the last byte of the flags.
    void BuildBlockBased(Frame& frame) {
        const bool isWeb = m_Description.layout == ArchiveLayout::kWebVersion6;
        const bool hasWebFlag = isWeb && m_Description.webSignatureFlag;
        PatchedFields section(m_Given);
        PutSection(section, m_Records, m_Description.directoryInSection ? &m_List : nullptr);
        const std::string stored = Compress(m_Description.sectionType, section.Bytes());
        const bool isAtEnd = m_Description.sectionAtEnd;
        const UInt64 room =
            m_Description.sectionPadded && !isAtEnd ? RoundUp(stored.size(), kHeaderAlignment) : stored.size();

        PatchedFields measured(m_Given);
        PutBlockBasedHeader(measured, m_Form, {});
        UInt64 headerSize = measured.Size();
        if (isWeb) headerSize = hasWebFlag ? headerSize + 1 : headerSize - 1;
        if (m_Form.version >= 7) headerSize = RoundUp(headerSize, kHeaderAlignment);

        UInt32 flags = m_Description.sectionType;
        if (m_Description.directoryInSection) flags |= kArchiveDirectoryInBlocksInfo;
        if (isAtEnd) flags |= kArchiveBlocksInfoAtEnd;
        if (hasWebFlag) flags |= kArchiveWebSignatureHeader;
        if (m_Description.sectionPadded) flags |= kArchiveBlocksInfoPadded;
        PutBlockBasedHeader(frame.head, m_Form,
                            {.archive = headerSize + room + m_StoredSize,
                             .compressedSection = stored.size(),
                             .uncompressedSection = section.Size(),
                             .flags = flags});
        frame.head.ResizeTo(headerSize);
        frame.headerSize = headerSize;
        frame.sectionSize = stored.size();
        frame.sectionOffset = isAtEnd ? headerSize + m_StoredSize : headerSize;

        PatchedFields& part = isAtEnd ? frame.tail : frame.head;
        if (m_Description.sectionType == kCompressionNone)
            part.PutPart(section);
        else
            part.PutBytes(stored);
        if (!isAtEnd) frame.head.ResizeTo(headerSize + room);
    }

    void BuildLegacy(Frame& frame) {
        PatchedFields measured(m_Given);
        PutLegacyHeader(measured, m_Form, {});
        frame.headerSize = measured.Size();
        PutLegacyHeader(frame.head, m_Form,
                        {.header = frame.headerSize, .stored = m_StoredSize, .data = m_Records[0].size});
    }

    // The header before or after the data.
    void BuildArchive(Frame& frame) {
        PatchedFields prologue(m_Given), header(m_Given);
        PutArchivePrologue(prologue, m_Form.signature, 0);
        PutArchiveHeader(header, m_Form, 0, m_Records, m_List);
        const bool isAtEnd = m_Description.sectionAtEnd;
        frame.headerSize = prologue.Size();
        frame.sectionSize = header.Size();
        frame.sectionOffset = prologue.Size() + (isAtEnd ? m_StoredSize : 0);
        PutArchivePrologue(frame.head, m_Form.signature, frame.sectionOffset);
        PutArchiveHeader(isAtEnd ? frame.tail : frame.head, m_Form, prologue.Size() + (isAtEnd ? 0 : header.Size()),
                         m_Records, m_List);
    }

    const ArchiveDescription& m_Description;
    GivenFields& m_Given;
    const EntryList& m_List;
    const BlockRecords& m_Records;
    const UInt64 m_StoredSize;
    std::string m_Signature;
    ArchiveForm m_Form = {};
};

BuiltArchive Build(const ArchiveDescription& description, GivenFields& given) {
    BuiltArchive built;
    DataStream stream(description, given);
    std::string data;
    BlockRecords records(kMemLabelGeneral);
    StoreBlocks(description, stream.bytes, &data, &records);
    Frame frame(given);
    FrameBuilder(description, given, stream.list, records, data.size()).Build(frame);
    for (const auto& [name, value] : description.fields)
        Require(given.put.count(name) != 0, "no field is named " + name);

    built.stream = std::move(stream.bytes);
    built.bytes = frame.head.Bytes() + data + frame.tail.Bytes();
    if (description.layout == ArchiveLayout::kRaw) stream.directory.PutFieldsAt(frame.head.Size(), &built.fields);
    frame.head.PutFieldsAt(0, &built.fields);
    frame.tail.PutFieldsAt(frame.head.Size() + data.size(), &built.fields);
    built.headerSize = frame.headerSize;
    built.sectionOffset = frame.sectionOffset;
    built.sectionSize = frame.sectionSize;
    built.dataOffset = frame.head.Size();
    return built;
}

} // namespace

BuiltArchive BuildArchive(const ArchiveDescription& description) {
    GivenFields given{description};
    return Build(description, given);
}

void WriteArchive(const ArchiveDescription& description, const std::string& outputFile) {
    GivenFields given{description, !description.fields.empty()};
    std::ofstream output(outputFile, std::ios::binary | std::ios::trunc);
    output << Build(description, given).bytes;
    output.close();
    Require(!output.fail(), "can't write " + outputFile);
}
