// The range decoder: bits out of the input.
//
// The input is one long binary fraction. range is the width of the part of it that is still possible, and code says
// where in that part the fraction lies. A bit splits the range in proportion to its probability, the part of a 0 first,
// and code tells in which part it is. Before that a range that has become less than 2^24 is widened by 8 bits, and code
// takes the next byte of the input. The probability then goes a 32nd of the way to what it has just seen.
#pragma once

#include "Library/Lzma/Model.h"

namespace lzma {

constexpr uint32_t kLeastRange = 1 << 24;
constexpr uint32_t kCertain = 1 << kProbabilityBits;
constexpr int kLearningShift = 5;
// A probability p becomes p + ((kCertain - p) >> 5) after a 0 and p - (p >> 5) after a 1. Both are p - (learning >> 5)
// with a shift that keeps the sign, learning being p - kLearnsZero or p.
constexpr uint32_t kLearnsZero = kCertain - (1 << kLearningShift) + 1;

struct RangeDecoder {
    uint32_t range;
    uint32_t code;
    const uint8_t* in;

    // A branch, although it is hard to guess: without it, every bit waited longer, and took 7 % more time on text and
    // programs, 15 % on noise.
    void Normalise() {
        if (range >= kLeastRange) return;
        range <<= 8;
        code = code << 8 | *in++;
    }

    // For bits on which a branch follows anyway: the processor guesses it, and goes on before the bit is known.
    bool Bit(Probability& place) {
        Normalise();
        const uint32_t probability = place;
        const uint32_t bound = (range >> kProbabilityBits) * probability;
        if (code < bound) {
            range = bound;
            place = static_cast<Probability>(probability + ((kCertain - probability) >> kLearningShift));
            return false;
        }
        range -= bound;
        code -= bound;
        place = static_cast<Probability>(probability - (probability >> kLearningShift));
        return true;
    }
};

} // namespace lzma
