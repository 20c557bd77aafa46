#include "Library/Lz4Prefix.h"

#include <lz4.h>

constexpr size_t kMinMatch = 4;
constexpr size_t kLongLength = 15;
constexpr size_t kLastLiterals = 5;
constexpr size_t kNoMatchBefore = 12;                   // from the end of what is decoded
constexpr size_t kShortestRest = 2 + 1 + kLastLiterals; // of the input, after literals that are not the last

namespace {

struct Input {
    const UInt8* data;
    size_t left;

    bool Take(size_t count) {
        if (count > left) return false;
        data += count;
        left -= count;
        return true;
    }

    // Adds the bytes that follow a length of kLongLength.
    bool AddLength(size_t* length) {
        while (left != 0) {
            const UInt8 more = *data;
            (void)Take(1);
            *length += more;
            if (more != 255) return true;
        }
        return false;
    }
};

} // namespace

size_t MeasureLz4(const UInt8* stored, size_t storedSize, size_t size) {
    Input in = {stored, storedSize};
    size_t made = 0;
    while (in.left != 0) {
        const size_t token = *in.data;
        (void)in.Take(1);
        size_t literals = token >> 4;
        if (literals == kLongLength && !in.AddLength(&literals)) return made;
        if (literals > size - made || !in.Take(literals)) return made;
        const bool isLast = in.left == 0;
        if (!isLast && (in.left < kShortestRest || size - made - literals < kNoMatchBefore)) return made;
        made += literals;
        if (isLast) return made;

        const size_t offset = in.data[0] | in.data[1] << 8;
        (void)in.Take(2);
        size_t match = token & 15;
        if (match == kLongLength && !in.AddLength(&match)) return made;
        match += kMinMatch;
        if (offset == 0 || offset > made) return made;
        if (match > size - made - kLastLiterals) return made;
        made += match;
    }
    return made;
}

size_t DecodeLz4(const UInt8* stored, size_t storedSize, UInt8* out, size_t size) {
    auto* const from = reinterpret_cast<const char*>(stored);
    auto* const to = reinterpret_cast<char*>(out);
    const int made = LZ4_decompress_safe(from, to, static_cast<int>(storedSize), static_cast<int>(size));
    if (made >= 0 && static_cast<size_t>(made) == size) return size;
    const size_t prefix = MeasureLz4(stored, storedSize, size);
    if (prefix == 0 || prefix == size) return 0; // of a whole block the decoder has the last word
    const int target = static_cast<int>(prefix);
    const int partial = LZ4_decompress_safe_partial(from, to, static_cast<int>(storedSize), target, target);
    return partial == target ? prefix : 0;
}
