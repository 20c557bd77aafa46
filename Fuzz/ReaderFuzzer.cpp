// Property: two ways to read agree, or both fail. One reader reads the stream in order, piece by piece; another reads
// ranges of it. Both deliver the same bytes and fail at the same place. When the writer has made the archive, the
// second delivers every range inside the stream.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <algorithm>
#include <cstring>
#include <span>
#include <string_view>

namespace {

constexpr UInt64 kMaxStream = 1 << 18;
constexpr UInt64 kSequentialPiece = 4096;

struct OpenArchive {
    explicit OpenArchive(const FuzzInput& input)
        : entry(MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionRead,
                                                  const_cast<std::uint8_t*>(input.data()), input.size(), false)),
          reader(kMemLabelFileSystem),
          result(reader.Initialize(entry, 0, true, false)) {}

    FileSystemEntry entry;
    ArchiveStorageReader reader;
    int result;
};

// The stream from its start to the first byte that can't be read.
std::vector<UInt8> ReadInOrder(ArchiveStorageReader& reader) {
    std::vector<UInt8> stream;
    UInt8 piece[kSequentialPiece];
    UInt64 size = kSequentialPiece;
    while (stream.size() < kMaxStream && size != 0) {
        UInt64 delivered = 0;
        if (!reader.Read(stream.size(), size, piece, &delivered)) {
            size /= 2; // near the end a full piece is refused
            continue;
        }
        FuzzCheck(delivered != 0 && delivered <= size);
        stream.insert(stream.end(), piece, piece + delivered);
    }
    return stream;
}

// An archive made by the writer: its text, and the kinds and sizes of its blocks, come from the input.
BuiltArchive BuildFrom(FuzzInput& input) {
    constexpr CompressionType kTypes[] = {kCompressionNone, kCompressionLzma, kCompressionLz4, kCompressionLz4HC};
    constexpr ArchiveLayout kLayouts[] = {ArchiveLayout::kBlockBased, ArchiveLayout::kArchive, ArchiveLayout::kWeb};
    ArchiveDescription description;
    description.layout = kLayouts[input.TakeBelow(std::size(kLayouts))];
    // Repeated, so that a stream has several windows.
    const UInt64 copies = 1 + input.TakeBelow(300);
    std::vector<ArchiveBlock> blocks(input.TakeBelow(6));
    for (ArchiveBlock& block : blocks) {
        block.type = kTypes[input.TakeBelow(std::size(kTypes))];
        block.streamed = (block.type == kCompressionLzma || block.type == kCompressionNone) && input.TakeBelow(2) != 0;
        block.size = input.TakeBelow(100'000);
    }
    const std::string_view bytes(reinterpret_cast<const char*>(input.data()), input.size());
    std::string text;
    for (UInt64 copy = 0; copy < copies && text.size() < kMaxStream / 2; ++copy)
        text += bytes;
    UInt64 left = text.size();
    for (ArchiveBlock& block : blocks) {
        block.size = std::min(block.size, left);
        left -= block.size;
    }
    // An LZ4 block without data counts as damaged.
    std::erase_if(blocks, [](const ArchiveBlock& block) { return block.size == 0; });
    if (description.layout != ArchiveLayout::kWeb) description.blocks = std::move(blocks);
    description.entries = {{.path = "file", .bytes = std::move(text)}};
    description.lzma.endMark = input.TakeBelow(2) != 0;
    return BuildArchive(description);
}

// Reads ranges through a fresh reader and compares them with the stream as read in order: the reader delivers every
// range up to its end, and refuses what lies past it.
void CheckRanges(const FuzzInput& archive, const std::vector<UInt8>& stream, std::span<const UInt64> seeds) {
    OpenArchive jumping(archive);
    FuzzCheck(jumping.result == 0);
    std::vector<UInt8> range;
    for (UInt64 seed : seeds) {
        const UInt64 from = seed % (stream.size() + 2);
        const UInt64 length = (seed >> 16) % (kMaxStream / 8);
        range.resize(static_cast<size_t>(length) + 1);
        UInt64 delivered = 0;
        const auto flags = static_cast<FileReadFlags>(seed & 1);
        const bool isRead = jumping.reader.Read(from, length, range.data(), &delivered, flags);
        FuzzCheck(!isRead || (delivered <= length && (delivered != 0 || length == 0)));
        const UInt64 inOrder = from < stream.size() ? stream.size() - from : 0;
        if (length != 0 && length <= inOrder) FuzzCheck(isRead && delivered == length);
        // Nothing is known past kMaxStream, where reading in order stopped.
        if (isRead && from <= stream.size() && stream.size() < kMaxStream) FuzzCheck(delivered <= inOrder);
        const UInt64 comparable = isRead ? std::min(delivered, inOrder) : 0;
        FuzzCheck(comparable == 0 || memcmp(range.data(), stream.data() + from, static_cast<size_t>(comparable)) == 0);
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    FuzzInput input(data, size);
    const UInt64 seeds[] = {input.TakeBelow(~UInt64{0}), input.TakeBelow(~UInt64{0}), input.TakeBelow(~UInt64{0}),
                            input.TakeBelow(~UInt64{0})};

    if (input.TakeBelow(4) == 1) {
        const BuiltArchive built = BuildFrom(input);
        const FuzzInput archive(reinterpret_cast<const UInt8*>(built.bytes.data()), built.bytes.size());
        CheckRanges(archive, std::vector<UInt8>(built.stream.begin(), built.stream.end()), seeds);
        return 0;
    }
    OpenArchive ordered(input);
    if (ordered.result == 0) CheckRanges(input, ReadInOrder(ordered.reader), seeds);
    return 0;
}
