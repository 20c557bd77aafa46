// Property: two ways to read agree, or both fail. One reader reads the stream in order, piece by piece; another reads
// ranges of it. Both deliver the same bytes and fail at the same place. When the writer has made the archive, the
// second delivers every range inside the stream.
#include "Fuzz/FuzzArchives.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <cstring>
#include <span>

namespace {

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
    while (stream.size() < kMaxFuzzStream && size != 0) {
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

// Reads ranges through a fresh reader and compares them with the stream as read in order: the reader delivers every
// range up to its end, and refuses what lies past it.
void CheckRanges(const FuzzInput& archive, const std::vector<UInt8>& stream, std::span<const UInt64> seeds) {
    OpenArchive jumping(archive);
    FuzzCheck(jumping.result == 0);
    std::vector<UInt8> range;
    for (UInt64 seed : seeds) {
        const UInt64 from = seed % (stream.size() + 2);
        const UInt64 length = (seed >> 16) % (kMaxFuzzStream / 8);
        range.resize(static_cast<size_t>(length) + 1);
        UInt64 delivered = 0;
        const auto flags = static_cast<FileReadFlags>(seed & 1);
        const bool isRead = jumping.reader.Read(from, length, range.data(), &delivered, flags);
        FuzzCheck(!isRead || (delivered <= length && (delivered != 0 || length == 0)));
        const UInt64 inOrder = from < stream.size() ? stream.size() - from : 0;
        if (length != 0 && length <= inOrder) FuzzCheck(isRead && delivered == length);
        // Nothing is known past kMaxFuzzStream, where reading in order stopped.
        if (isRead && from <= stream.size() && stream.size() < kMaxFuzzStream) FuzzCheck(delivered <= inOrder);
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
        const BuiltArchive built = BuildArchiveFrom(input);
        const FuzzInput archive(reinterpret_cast<const UInt8*>(built.bytes.data()), built.bytes.size());
        CheckRanges(archive, std::vector<UInt8>(built.stream.begin(), built.stream.end()), seeds);
        return 0;
    }
    OpenArchive ordered(input);
    if (ordered.result == 0) CheckRanges(input, ReadInOrder(ordered.reader), seeds);
    return 0;
}
