// Properties: the legacy parsers make no more records than the bytes can hold; and the scanner, which follows a
// directory piece by piece, calls it complete exactly when the parser can read it.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/LegacyDirectoryScanner.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

constexpr size_t kStoredBlockSize = 24;  // two running positions, in ZarvoArchive
constexpr size_t kStoredNodeMinSize = 9; // in the legacy directory, which has the smaller nodes

static void ParseWhole(const FuzzInput& input) {
    Header header(kMemLabelGeneral);
    BlocksInfo blocks(kMemLabelGeneral);
    DirectoryInfo directory(kMemLabelGeneral);
    FuzzFile archive(input.data(), input.size());
    if (ReadHeaderSignature(archive.file, header) != kHeaderOk) return;
    if (header.signature == kSignatureWeb) {
        const HeaderResult result = ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(archive.file, header, blocks);
        FuzzCheck(result != kHeaderOk || blocks.storageBlocks.size() == 1);
    } else {
        (void)ReadAll(archive.file, header, blocks, directory); // the checks below hold whatever it answers
    }
    // The one block of ZarvoWeb and ZarvoRaw is not stored.
    FuzzCheck(blocks.storageBlocks.size() * kStoredBlockSize <= std::max(input.size(), kStoredBlockSize));
    FuzzCheck(directory.nodes.size() * kStoredNodeMinSize <= input.size());
}

static void ScanAndParseDirectory(FuzzInput input) {
    const UInt64 pieceSize = 1 + input.TakeBelow(64);
    LegacyDirectoryScanner scanner;
    for (UInt64 position = 0; position < input.size() && !scanner.IsComplete(); position += pieceSize)
        scanner.Scan(input.data() + position, static_cast<size_t>(std::min(pieceSize, input.size() - position)));

    Header header(kMemLabelGeneral);
    DirectoryInfo directory(kMemLabelGeneral);
    FuzzFile stream(input.data(), input.size());
    const HeaderResult result = ReadDirectoryInfo_ZarvoWebAndZarvoRaw(stream.file, header, directory);
    FuzzCheck(scanner.IsComplete() == (result == kHeaderOk));
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    ParseWhole(FuzzInput(data, size));
    ScanAndParseDirectory(FuzzInput(data, size));
    return 0;
}
