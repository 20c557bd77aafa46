// Property: our LZMA decoder and the SDK's accept the same input, whole and in pieces of any size, and make the same
// bytes of it. Nothing beside input and output is touched.
#include "Fuzz/FuzzSupport.h"
#include "Fuzz/LzmaComparison.h"

namespace {

constexpr size_t kMostInput = 1 << 16;
constexpr size_t kMostRoom = 1 << 16;

void Check(const LzmaComparison& comparison) {
    if (comparison.difference.empty()) return;
    fprintf(stderr, "%s\n", comparison.difference.c_str());
    abort();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    static LzmaComparer comparer(kMostInput, kMostRoom);
    FuzzInput input(data, size);
    const size_t room = static_cast<size_t>(input.TakeBelow(kMostRoom));
    const size_t inputPiece = static_cast<size_t>(1 + input.TakeBelow(1 << 12));
    const size_t roomPiece = static_cast<size_t>(1 + input.TakeBelow(1 << 12));
    LzmaRandom random(input.TakeBelow(1 << 16));
    if (input.size() < 5 || input.size() > kMostInput) return 0;
    const std::span<const std::uint8_t> stored(input.data(), input.size());
    Check(comparer.CompareBlock(stored, room, false));
    if (stored[4] != 0) return 0; // a dictionary of more than 16 MiB only costs time
    Check(comparer.CompareStream(stored, room, inputPiece, roomPiece, false, random));
    Check(comparer.CompareStream(stored, room, inputPiece, roomPiece, true, random));
    return 0;
}
