// Properties: a decompressor writes nothing outside the room it is given; a stream yields the same bytes however its
// input and room are cut, and the same as decoding the whole buffer at once; and a failed stream stays failed.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/Utilities/Compression/Compression.h"

#include <algorithm>
#include <cstring>

namespace {

constexpr size_t kMaxOutput = 1 << 18;

struct Outcome {
    std::vector<UInt8> output;
    bool isFailed = false;
};

// Decodes the whole buffer into a room of exactly the given size; the sanitizer watches its ends.
Outcome DecompressOnce(const IDecompressor& decompressor, const FuzzInput& input, size_t room) {
    Outcome outcome;
    outcome.output.resize(room);
    size_t srcSize = input.size();
    size_t dstSize = room;
    outcome.isFailed = !decompressor.DecompressMemory(input.data(), &srcSize, outcome.output.data(), &dstSize);
    if (outcome.isFailed) return outcome;
    FuzzCheck(dstSize <= room && srcSize <= input.size());
    outcome.output.resize(dstSize);
    return outcome;
}

Outcome DecompressStream(const IDecompressor& decompressor, const FuzzInput& input, size_t room, size_t inputPiece,
                         size_t outputPiece) {
    Outcome outcome;
    void* state = nullptr;
    FuzzCheck(decompressor.DecompressStreamInit(&state));
    size_t consumed = 0;
    while (outcome.output.size() < room) {
        const size_t produced = outcome.output.size();
        size_t srcSize = std::min(inputPiece, input.size() - consumed);
        size_t dstSize = std::min(outputPiece, room - produced);
        outcome.output.resize(produced + dstSize);
        static constexpr UInt8 kNoInput = 0;
        const UInt8* source = srcSize != 0 ? input.data() + consumed : &kNoInput;
        if (!decompressor.DecompressStream(state, source, &srcSize, outcome.output.data() + produced, &dstSize,
                                           false)) {
            outcome.output.resize(produced);
            outcome.isFailed = true;
            UInt8 byte = 0;
            size_t more = input.size() - consumed;
            size_t one = 1;
            if (consumed != 0) FuzzCheck(!decompressor.DecompressStream(state, source, &more, &byte, &one, false));
            break;
        }
        outcome.output.resize(produced + dstSize);
        consumed += srcSize;
        FuzzCheck(consumed <= input.size());
        if (srcSize == 0 && dstSize == 0) break;
    }
    decompressor.DecompressStreamDeinit(state);
    return outcome;
}

bool IsPrefix(const std::vector<UInt8>& a, const std::vector<UInt8>& b) {
    return a.size() <= b.size() && (a.empty() || memcmp(a.data(), b.data(), a.size()) == 0);
}

// Inputs that need a dictionary of gigabytes only cost time here.
bool NamesLargeDictionary(const FuzzInput& input) {
    UInt32 dictionarySize = 0;
    if (input.size() < 5) return false;
    memcpy(&dictionarySize, input.data() + 1, sizeof(dictionarySize));
    return dictionarySize > 1 << 24;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    FuzzInput input(data, size);
    const size_t room = static_cast<size_t>(input.TakeBelow(kMaxOutput));
    const size_t inputPiece = static_cast<size_t>(5 + input.TakeBelow(4096));
    const size_t outputPiece = static_cast<size_t>(1 + input.TakeBelow(70'000));

    static IDecompressor* const lz4 = CreateDecompressor(kCompressionLz4, kMemLabelGeneral);
    static IDecompressor* const lzma = CreateDecompressor(kCompressionLzma, kMemLabelGeneral);
    (void)DecompressOnce(*lz4, input, room); // the sanitizer checks it
    if (NamesLargeDictionary(input)) return 0;
    const Outcome once = DecompressOnce(*lzma, input, room);
    const Outcome whole = DecompressStream(*lzma, input, room, std::max<size_t>(size, 1), std::max<size_t>(room, 1));
    const Outcome pieces = DecompressStream(*lzma, input, room, inputPiece, outputPiece);
    // In pieces, a stream may deliver more bytes before it fails than in one call.
    FuzzCheck(IsPrefix(whole.output, pieces.output) || IsPrefix(pieces.output, whole.output));
    if (!whole.isFailed && !pieces.isFailed) FuzzCheck(whole.output == pieces.output);
    if (!once.isFailed && !whole.isFailed) FuzzCheck(IsPrefix(once.output, whole.output));
    return 0;
}
