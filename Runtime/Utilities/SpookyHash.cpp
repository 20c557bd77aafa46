// Bob Jenkins' SpookyHash V2, which is in the public domain: the rotations and the order of steps are as published. His
// unrolled rounds are loops over the rotation counts here.
#include "Runtime/Utilities/SpookyHash.h"

#include <bit>
#include <cstring>

namespace {

// Fills the words of the initial state that hold no seed. Odd, irregular in its bits, and not 0.
constexpr UInt64 kFiller = 0xDEADBEEFDEADBEEF;

constexpr size_t kLongVariables = 12;
constexpr size_t kLongBlockSize = kLongVariables * sizeof(UInt64);
constexpr size_t kShortLimit = 2 * kLongBlockSize; // shorter messages take the short path
constexpr size_t kShortBlockSize = 4 * sizeof(UInt64);
static_assert(kShortLimit == 192);

// The index-th word of a message, which need not be aligned.
UInt64 WordAt(const UInt8* bytes, size_t index) {
    static_assert(std::endian::native == std::endian::little, "words of a message are little-endian");
    UInt64 word;
    memcpy(&word, bytes + index * sizeof(word), sizeof(word));
    return word;
}

void MixShort(UInt64 (&h)[4]) {
    constexpr int kRotations[12] = {50, 52, 30, 41, 54, 48, 38, 37, 62, 34, 5, 36};
    for (size_t step = 0; step < 12; ++step) {
        UInt64& turned = h[(step + 2) % 4];
        turned = std::rotl(turned, kRotations[step]) + h[(step + 3) % 4];
        h[step % 4] ^= turned;
    }
}

void FinishShort(UInt64 (&h)[4]) {
    constexpr int kRotations[11] = {15, 52, 26, 51, 28, 9, 47, 54, 32, 25, 63};
    for (size_t step = 0; step < 11; ++step) {
        UInt64& source = h[(step + 2) % 4];
        UInt64& target = h[(step + 3) % 4];
        target ^= source;
        source = std::rotl(source, kRotations[step]);
        target += source;
    }
}

void HashShort(const UInt8* bytes, size_t length, UInt64* hash1, UInt64* hash2) {
    UInt64 h[4] = {*hash1, *hash2, kFiller, kFiller};
    size_t left = length;
    for (; left >= kShortBlockSize; left -= kShortBlockSize, bytes += kShortBlockSize) {
        h[2] += WordAt(bytes, 0);
        h[3] += WordAt(bytes, 1);
        MixShort(h);
        h[0] += WordAt(bytes, 2);
        h[1] += WordAt(bytes, 3);
    }
    if (left >= 16) {
        h[2] += WordAt(bytes, 0);
        h[3] += WordAt(bytes, 1);
        MixShort(h);
        left -= 16;
        bytes += 16;
    }

    h[3] += static_cast<UInt64>(length) << 56;
    if (left != 0) {
        UInt8 tail[16] = {};
        memcpy(tail, bytes, left);
        h[2] += WordAt(tail, 0);
        h[3] += WordAt(tail, 1);
    } else {
        h[2] += kFiller;
        h[3] += kFiller;
    }
    FinishShort(h);
    *hash1 = h[0];
    *hash2 = h[1];
}

void MixLong(UInt64 (&h)[kLongVariables], const UInt8* block) {
    constexpr int kRotations[kLongVariables] = {11, 32, 43, 31, 17, 28, 39, 57, 55, 54, 22, 46};
    for (size_t i = 0; i < kLongVariables; ++i) {
        h[i] += WordAt(block, i);
        h[(i + 2) % kLongVariables] ^= h[(i + 10) % kLongVariables];
        h[(i + 11) % kLongVariables] ^= h[i];
        h[i] = std::rotl(h[i], kRotations[i]);
        h[(i + 11) % kLongVariables] += h[(i + 1) % kLongVariables];
    }
}

void FinishLongOnce(UInt64 (&h)[kLongVariables]) {
    constexpr int kRotations[kLongVariables] = {44, 15, 34, 21, 38, 33, 10, 13, 38, 53, 42, 54};
    for (size_t i = 0; i < kLongVariables; ++i) {
        UInt64& turned = h[(i + 1) % kLongVariables];
        UInt64& sum = h[(i + 11) % kLongVariables];
        sum += turned;
        h[(i + 2) % kLongVariables] ^= sum;
        turned = std::rotl(turned, kRotations[i]);
    }
}

void HashLong(const UInt8* bytes, size_t length, UInt64* hash1, UInt64* hash2) {
    UInt64 h[kLongVariables];
    for (size_t i = 0; i < kLongVariables; i += 3) {
        h[i] = *hash1;
        h[i + 1] = *hash2;
        h[i + 2] = kFiller;
    }
    size_t left = length;
    for (; left >= kLongBlockSize; left -= kLongBlockSize, bytes += kLongBlockSize)
        MixLong(h, bytes);

    UInt8 tail[kLongBlockSize] = {};
    memcpy(tail, bytes, left);
    tail[kLongBlockSize - 1] = static_cast<UInt8>(left);
    for (size_t i = 0; i < kLongVariables; ++i)
        h[i] += WordAt(tail, i);
    for (int pass = 0; pass < 3; ++pass)
        FinishLongOnce(h);
    *hash1 = h[0];
    *hash2 = h[1];
}

} // namespace

void SpookyHash::Hash128(const void* message, size_t length, UInt64* hash1, UInt64* hash2) {
    const auto* bytes = static_cast<const UInt8*>(message);
    if (length < kShortLimit)
        HashShort(bytes, length, hash1, hash2);
    else
        HashLong(bytes, length, hash1, hash2);
}
