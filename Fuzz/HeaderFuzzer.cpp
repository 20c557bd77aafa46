// Properties: the block-based parsers make no more records than the bytes can hold; and parsing twice gives the same
// records.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

using namespace ArchiveStorageHeader;

namespace {

constexpr size_t kStoredBlockSize = 10;
constexpr size_t kStoredNodeMinSize = 21;

struct Parsed {
    Header header{kMemLabelGeneral};
    BlocksInfo blocks{kMemLabelGeneral};
    DirectoryInfo directory{kMemLabelGeneral};
    HeaderResult result = kHeaderOk;
};

void Parse(FileAccessor& file, Parsed& parsed) {
    parsed.result = ReadHeaderSignature(file, parsed.header);
    if (parsed.result != kHeaderOk) return;
    parsed.result = ReadHeader(file, parsed.header);
    if (parsed.result != kHeaderOk) return;
    FuzzCheck(parsed.header.version <= kNewestVersion);
    FuzzCheck(parsed.header.compressedBlocksInfoSize <= parsed.header.uncompressedBlocksInfoSize);
    const UInt64 section = GetBlocksInfoOffset(parsed.header);
    if (section > ~UInt64{0} >> 1 || !file.Seek(VFS::FileOffset(VFS::FileSize(section)), kFileOriginBegin)) return;
    parsed.result = ReadBlocksInfo(file, parsed.header, parsed.blocks);
    if (parsed.result != kHeaderOk) return;
    parsed.result = ReadDirectoryInfo(file, parsed.header, parsed.directory);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    Parsed first;
    Parsed second;
    FuzzFile once(data, size);
    Parse(once.file, first);
    FuzzFile again(data, size);
    Parse(again.file, second);

    FuzzCheck(first.result == second.result);
    FuzzCheck(first.blocks.storageBlocks.size() * kStoredBlockSize <= size);
    FuzzCheck(first.directory.nodes.size() * kStoredNodeMinSize <= size);
    FuzzCheck(first.directory.nodes.size() == second.directory.nodes.size());
    for (size_t index = 0; index < first.directory.nodes.size(); ++index) {
        FuzzCheck(first.directory.nodes[index].path == second.directory.nodes[index].path);
        FuzzCheck(first.directory.nodes[index].path.size() <= size);
        FuzzCheck(first.directory.nodes[index].offset == second.directory.nodes[index].offset);
    }
    return 0;
}
