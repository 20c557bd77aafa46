#include "Library/Lz4Coder.h"

#include <lz4.h>

size_t DecodeLz4(const UInt8* stored, size_t storedSize, UInt8* out, size_t size) {
    auto* const from = reinterpret_cast<const char*>(stored);
    auto* const to = reinterpret_cast<char*>(out);
    const int whole = LZ4_decompress_safe(from, to, static_cast<int>(storedSize), static_cast<int>(size));
    if (whole >= 0 && static_cast<size_t>(whole) == size) return size;

    // The decoder does not say how far it got, but decodes as many bytes as it is asked for where it can.
    auto canGive = [&](size_t count) {
        const int target = static_cast<int>(count);
        return LZ4_decompress_safe_partial(from, to, static_cast<int>(storedSize), target, target) == target;
    };
    size_t given = 0;
    size_t refused = size; // if nothing else, the end of the block is wrong
    while (refused - given > 1) {
        const size_t middle = given + (refused - given) / 2;
        (canGive(middle) ? given : refused) = middle;
    }
    return given != 0 && canGive(given) ? given : 0;
}
