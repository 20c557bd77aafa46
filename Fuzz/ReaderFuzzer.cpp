// Property: any range that a fresh reader delivers holds the same bytes as the same range read in order, piece by
// piece, through another reader; and a range that lies outside the stream is refused.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <cstring>

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

// The stream from its start, up to the first byte that is not delivered.
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

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    FuzzInput input(data, size);
    const UInt64 seeds[] = {input.TakeBelow(~UInt64{0}), input.TakeBelow(~UInt64{0}), input.TakeBelow(~UInt64{0}),
                            input.TakeBelow(~UInt64{0})};

    OpenArchive ordered(input);
    if (ordered.result != 0) return 0;
    const std::vector<UInt8> stream = ReadInOrder(ordered.reader);

    OpenArchive jumping(input);
    FuzzCheck(jumping.result == 0);
    std::vector<UInt8> range;
    for (UInt64 seed : seeds) {
        const UInt64 from = seed % (stream.size() + 2);
        const UInt64 length = (seed >> 16) % (kMaxStream / 8);
        range.resize(static_cast<size_t>(length) + 1);
        UInt64 delivered = 0;
        const auto flags = static_cast<FileReadFlags>(seed & 1);
        if (!jumping.reader.Read(from, length, range.data(), &delivered, flags)) continue;
        FuzzCheck(delivered <= length && (delivered != 0 || length == 0));
        if (from >= stream.size()) continue;
        const size_t comparable = std::min(static_cast<size_t>(delivered), stream.size() - static_cast<size_t>(from));
        FuzzCheck(comparable == 0 || memcmp(range.data(), stream.data() + from, comparable) == 0);
    }
    return 0;
}
