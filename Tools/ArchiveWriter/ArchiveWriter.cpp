#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include "Tools/ArchiveWriter/ArchiveFrames.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>

// The archive is made in three parts: what comes before the data (head), the data, and what comes after it (tail). The
// data is made first, because one of the other parts stores the sizes of its blocks.

namespace {

constexpr UInt64 kPieceSize = 1'048'576; // bytes that are copied at once

void Require(bool isTrue, const std::string& message) {
    if (isTrue) return;
    fprintf(stderr, "ArchiveWriter: %s\n", message.c_str());
    abort();
}

// The data stream: the legacy directory if there is one, then the entries' bytes one after another. It can be read
// once, from start to end.
class DataStream {
public:
    DataStream(const ArchiveDescription& description, GivenFields& given) : m_Description(description) {
        m_Size = Place(0);
        if (!HasLegacyDirectory(description.layout)) return;
        // The directory's contents depend on where the entries lie, but its size does not.
        m_Size = Place(MakeLegacyDirectory(given, m_Nodes).Size());
        m_Pending = MakeLegacyDirectory(given, m_Nodes).Bytes();
    }

    UInt64 Size() const { return m_Size; }
    const std::vector<PlacedNode>& Nodes() const { return m_Nodes; }

    // The next bytes of the stream, at most size; valid until the next call.
    std::string_view Next(UInt64 size) {
        while (m_Taken == m_Pending.size())
            LoadPending(size);
        const std::string_view piece = std::string_view(m_Pending).substr(m_Taken, size);
        m_Taken += piece.size();
        return piece;
    }

    std::string Read(UInt64 size) {
        std::string bytes;
        bytes.reserve(size);
        while (bytes.size() < size)
            bytes += Next(size - bytes.size());
        return bytes;
    }

private:
    // Places the entries from offset on. Returns the end of the last one.
    UInt64 Place(UInt64 offset) {
        m_Nodes.clear();
        for (const ArchiveEntry& entry : m_Description.entries) {
            const UInt64 size = EntrySize(entry);
            if (entry.listed) m_Nodes.push_back({&entry, offset, size});
            offset += size;
        }
        return offset;
    }

    static UInt64 EntrySize(const ArchiveEntry& entry) {
        if (entry.sourceFile.empty()) return entry.bytes.size();
        std::error_code error;
        const UInt64 size = std::filesystem::file_size(entry.sourceFile, error);
        Require(!error, "no size of " + entry.sourceFile);
        return size;
    }

    void LoadPending(UInt64 wanted) {
        m_Pending.clear();
        m_Taken = 0;
        if (m_File.is_open()) {
            m_Pending.resize(wanted);
            m_File.read(m_Pending.data(), static_cast<std::streamsize>(wanted));
            m_Pending.resize(static_cast<size_t>(m_File.gcount()));
            if (m_Pending.empty()) m_File.close();
            return;
        }
        Require(m_NextEntry < m_Description.entries.size(), "the blocks need more bytes than the entries have");
        const ArchiveEntry& entry = m_Description.entries[m_NextEntry++];
        if (entry.sourceFile.empty()) {
            m_Pending = entry.bytes;
        } else {
            m_File.open(entry.sourceFile, std::ios::binary);
            Require(m_File.is_open(), "can't open " + entry.sourceFile);
        }
    }

    const ArchiveDescription& m_Description;
    std::vector<PlacedNode> m_Nodes;
    UInt64 m_Size = 0;
    size_t m_NextEntry = 0;
    std::string m_Pending; // bytes that have been loaded
    size_t m_Taken = 0;    // how many of them Next has returned
    std::ifstream m_File;  // the source file of the entry before m_NextEntry
};

CompressionType TypeOf(const ArchiveDescription& description, const ArchiveBlock& block) {
    if (description.layout == ArchiveLayout::kWeb) return kCompressionLzma;
    if (description.layout == ArchiveLayout::kRaw) return kCompressionNone;
    return block.type.value_or(description.type);
}

// Stores the next block of the stream. Returns its stored size.
UInt64 StoreBlock(const ArchiveDescription& description, const ArchiveBlock& block, DataStream& stream,
                  const ByteSink& sink) {
    UInt64 storedSize = 0;
    const auto store = [&](std::string_view bytes) {
        sink(bytes);
        storedSize += bytes.size();
    };
    UInt64 left = block.size;
    const auto next = [&](size_t size) {
        const std::string_view piece = left == 0 ? std::string_view() : stream.Next(std::min<UInt64>(left, size));
        left -= piece.size();
        return piece;
    };
    if (block.stored) {
        store(*block.stored);
        while (left != 0)
            next(kPieceSize);
        return storedSize;
    }
    switch (const CompressionType type = TypeOf(description, block)) {
    case kCompressionNone:
        while (left != 0)
            store(next(kPieceSize));
        break;
    case kCompressionLzma: {
        // In the legacy stream, the size of its data follows the properties, least significant byte first.
        std::string sizeField;
        for (int byte = 0; byte < 8 && description.layout == ArchiveLayout::kWeb; ++byte)
            sizeField.push_back(static_cast<char>(block.size >> (8 * byte)));
        const auto storeCoded = [&](std::string_view bytes) {
            store(bytes);
            if (storedSize == kLzmaPropertiesSize) store(sizeField);
        };
        CompressLzma(next, storeCoded, description.lzma);
        break;
    }
    default: store(Compress(type, stream.Read(block.size)));
    }
    return storedSize;
}

// Stores the stream block by block.
std::vector<StoredBlock> StoreBlocks(const ArchiveDescription& description, DataStream& stream, const ByteSink& sink) {
    std::vector<ArchiveBlock> cut = description.blocks;
    UInt64 position = 0;
    for (const ArchiveBlock& block : cut)
        position += block.size;
    const bool isWhole = description.chunkSize == 0 || HasLegacyDirectory(description.layout);
    while (position < stream.Size()) {
        const UInt64 left = stream.Size() - position;
        cut.push_back({.size = isWhole ? left : std::min(description.chunkSize, left)});
        position += cut.back().size;
    }

    std::vector<StoredBlock> stored;
    for (const ArchiveBlock& block : cut) {
        const UInt64 storedSize = StoreBlock(description, block, stream, sink);
        stored.push_back(
            {block.size, storedSize, TypeOf(description, block), block.streamed.value_or(description.streamed)});
    }
    return stored;
}

// Makes all parts; the data goes to the sink.
Frame MakeParts(const ArchiveDescription& description, GivenFields& given, const ByteSink& sink,
                ArchivePlan* plan = nullptr) {
    DataStream stream(description, given);
    const std::vector<StoredBlock> blocks = StoreBlocks(description, stream, sink);
    Frame frame = MakeFrame(description, given, blocks, stream.Nodes());
    if (plan != nullptr) {
        plan->dataOffset = frame.head.Size();
        plan->blocks = blocks;
        for (const PlacedNode& node : stream.Nodes())
            plan->nodes.push_back({node.entry->path, node.entry->flags, node.offset, node.size});
    }
    for (const auto& [name, value] : description.fields)
        Require(given.stored.count(name) != 0, "no field is named " + name);
    return frame;
}

void AppendFile(std::ofstream& output, const std::string& path) {
    std::ifstream input(path, std::ios::binary);
    std::string piece(kPieceSize, '\0');
    while (input.read(piece.data(), static_cast<std::streamsize>(piece.size())), input.gcount() > 0)
        output.write(piece.data(), input.gcount());
}

} // namespace

BuiltArchive BuildArchive(const ArchiveDescription& description) {
    BuiltArchive built;
    GivenFields given{description.fields};
    std::string data;
    const Frame frame = MakeParts(description, given, [&](std::string_view bytes) { data += bytes; });

    DataStream stream(description, given);
    if (description.layout == ArchiveLayout::kRaw)
        MakeLegacyDirectory(given, stream.Nodes()).PutFieldsAt(frame.head.Size(), &built.fields);
    built.stream = stream.Read(stream.Size());
    built.bytes = frame.head.Bytes() + data + frame.tail.Bytes();
    frame.head.PutFieldsAt(0, &built.fields);
    frame.tail.PutFieldsAt(frame.head.Size() + data.size(), &built.fields);
    built.headerSize = frame.headerSize;
    built.sectionOffset = frame.sectionOffset;
    built.sectionSize = frame.sectionSize;
    built.dataOffset = frame.head.Size();
    return built;
}

ArchivePlan WriteArchive(const ArchiveDescription& description, const std::string& outputFile) {
    // The data is made first, but parts that depend on it come before it. It is kept in a temporary file until then.
    const std::string dataFile = outputFile + ".data";
    GivenFields given{description.fields, !description.fields.empty()};
    ArchivePlan plan;
    std::ofstream data(dataFile, std::ios::binary | std::ios::trunc);
    const Frame frame = MakeParts(
        description, given, [&](std::string_view bytes) { data << bytes; }, &plan);
    data.close();
    Require(!data.fail(), "can't write " + dataFile);

    std::ofstream output(outputFile, std::ios::binary | std::ios::trunc);
    output << frame.head.Bytes();
    AppendFile(output, dataFile);
    output << frame.tail.Bytes();
    output.close();
    Require(!output.fail(), "can't write " + outputFile);
    std::error_code error;
    Require(std::filesystem::remove(dataFile, error), "can't remove " + dataFile);
    return plan;
}

ArchivePlan PackFolder(const std::string& folder, const std::string& outputFile, ArchiveDescription form) {
    std::map<std::string, bool> isFolderByPath;
    std::error_code error;
    std::filesystem::recursive_directory_iterator entry(folder, error), end;
    for (; !error && entry != end; entry.increment(error))
        isFolderByPath[entry->path().string()] = entry->is_directory();
    Require(!error, "can't list " + folder);

    for (const auto& [path, isFolder] : isFolderByPath) {
        // The legacy layouts have no nodes for folders.
        if (isFolder && HasLegacyDirectory(form.layout)) continue;
        const std::string relative = path.substr(folder.size() + 1);
        if (isFolder)
            form.entries.push_back({.path = relative, .flags = kFolderEntry});
        else
            form.entries.push_back({.path = relative, .sourceFile = path});
    }
    return WriteArchive(form, outputFile);
}
