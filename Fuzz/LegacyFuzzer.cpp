// Properties: the legacy parsers never make more records than the bytes can hold; and the scanner that follows a
// directory piece by piece calls it complete exactly when the parser can read it.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/LegacyDirectoryScanner.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

static void ParseWhole(const FuzzInput& input) {
    Header header(kMemLabelGeneral);
    BlocksInfo blocks(kMemLabelGeneral);
    DirectoryInfo directory(kMemLabelGeneral);
    FuzzFile archive(input.data(), input.size());
    if (ReadHeaderSignature(archive.file, header) != kHeaderOk) return;
    if (header.signature == kSignatureWeb) {
        const int result = ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(archive.file, header, blocks);
        FuzzCheck(result != kHeaderOk || blocks.storageBlocks.size() == 1);
    } else {
        (void)ReadAll(archive.file, header, blocks, directory); // only its effect on the records is of interest
    }
    FuzzCheck(blocks.storageBlocks.size() * 24 <= std::max<size_t>(input.size(), 24));
    FuzzCheck(directory.nodes.size() * 9 <= input.size());
}

static void ScanAndParseDirectory(FuzzInput input) {
    const UInt64 pieceSize = 1 + input.TakeBelow(64);
    LegacyDirectoryScanner scanner;
    for (UInt64 position = 0; position < input.size() && !scanner.IsComplete(); position += pieceSize)
        scanner.Scan(input.data() + position, static_cast<size_t>(std::min(pieceSize, input.size() - position)));

    Header header(kMemLabelGeneral);
    DirectoryInfo directory(kMemLabelGeneral);
    FuzzFile stream(input.data(), input.size());
    const int result = ReadDirectoryInfo_ZarvoWebAndZarvoRaw(stream.file, header, directory);
    FuzzCheck(scanner.IsComplete() == (result == kHeaderOk));
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    ParseWhole(FuzzInput(data, size));
    ScanAndParseDirectory(FuzzInput(data, size));
    return 0;
}
