// The model of LZMA: which symbols there are, what the decoder remembers between them, and where the probability of
// each bit lies in the table.
//
// A symbol is a sequence of bits, each coded with a probability of its own that learns from the bits it has coded:
//
//   bits            symbol        what it stands for
//   0 + literal     literal       one byte
//   1 0 + length
//       + distance  match         length bytes as they stand distance bytes back (distance 2^32: the end mark)
//   1 1 0 0         short repeat  one byte as it stands the latest distance back
//   1 1 0 1 + len   repeat 0      length bytes, the latest distance back
//   1 1 1 0 + len   repeat 1      length bytes, the distance before that
//   1 1 1 1 0 + len repeat 2      and so on; a distance that is used again becomes the latest
//   1 1 1 1 1 + len repeat 3
//
// The state says which kinds of symbols came last, as far as it helps to guess the next:
//
//   state  the latest symbols, the latest last            after literal  match  repeat  short repeat
//   0      literal, literal, literal                      0              7      8       9
//   1      match, literal, literal                        0              7      8       9
//   2      repeat, literal, literal                       0              7      8       9
//   3      short repeat, literal, literal                 0              7      8       9
//   4      match, literal                                 1              7      8       9
//   5      repeat, literal                                2              7      8       9
//   6      short repeat, literal                          3              7      8       9
//   7      literal, match                                 4              10     11      11
//   8      literal, repeat                                5              10     11      11
//   9      literal, short repeat                          6              10     11      11
//   10     not a literal, match                           4              10     11      11
//   11     not a literal, repeat or short repeat          5              10     11      11
//
// Literals in states 7 to 11 are matched: the byte at the latest distance is likely to be wrong, as a longer match
// would have held it, and helps to guess: while the bits agree with it, each bit's probability is chosen by its bit as
// well.
//
// Lengths are 2 to 273: 0 + 3 bits, 1 0 + 3 bits, or 1 1 + 8 bits. Distances, less one, are a slot of 6 bits and the
// bits below the slot's highest two, which the slot counts:
//
//   slot      distance - 1                  coded as
//   0 - 3     slot                          nothing more
//   4 - 13    1x followed by 1 - 5 bits     a tree of the slot's own, the lowest bit first
//   14 - 63   1x followed by 6 - 30 bits    direct bits of even chance, then 4 bits in a tree, the lowest bit first
#pragma once

#include <cstddef>
#include <cstdint>

namespace lzma {

using Probability = uint16_t; // that the bit is 0, in 2048ths
constexpr int kProbabilityBits = 11;
constexpr Probability kEvenChance = 1 << (kProbabilityBits - 1);

constexpr uint32_t kStates = 12;
constexpr uint32_t kFirstMatchedState = 7; // literals from this state on are matched
constexpr uint8_t kAfterLiteral[kStates] = {0, 0, 0, 0, 1, 2, 3, 4, 5, 6, 4, 5};
constexpr uint8_t kAfterMatch[kStates] = {7, 7, 7, 7, 7, 7, 7, 10, 10, 10, 10, 10};
constexpr uint8_t kAfterRepeat[kStates] = {8, 8, 8, 8, 8, 8, 8, 11, 11, 11, 11, 11};
constexpr uint8_t kAfterShortRepeat[kStates] = {9, 9, 9, 9, 9, 9, 9, 11, 11, 11, 11, 11};

constexpr uint32_t kPositionStates = 16; // at most: pb is 4 at most
constexpr uint32_t kShortestMatch = 2;
constexpr uint32_t kLongestMatch = 273;

constexpr uint32_t kSlotBits = 6;
constexpr uint32_t kLengthsWithSlots = 4; // lengths of 2, 3, 4 and more choose a tree for the slot
constexpr uint32_t kFirstTreeSlot = 4;
constexpr uint32_t kFirstDirectSlot = 14;
constexpr uint32_t kMostTreeBits = 5; // of the slots between
constexpr int kAlignBits = 4;         // the last bits of the slots from kFirstDirectSlot on

// Within the probabilities of a length: those of repeats are apart from those of matches.
constexpr uint32_t kLengthIsLong = 0;
constexpr uint32_t kLengthIsLonger = 1;
constexpr uint32_t kLengthShort = 2;                                   // a tree of 8 per position state
constexpr uint32_t kLengthMiddle = kLengthShort + kPositionStates * 8; // likewise
constexpr uint32_t kLengthHigh = kLengthMiddle + kPositionStates * 8;  // one tree of 256
constexpr uint32_t kLengthProbabilities = kLengthHigh + 256;

// The table. A tree of n bits has its 2^n - 1 probabilities from place 1 on; the children of place i are 2i and 2i + 1.
constexpr uint32_t kIsMatch = 0; // state, position state
constexpr uint32_t kIsRepeat = kIsMatch + kStates * kPositionStates;
constexpr uint32_t kIsNotLatest = kIsRepeat + kStates;
constexpr uint32_t kIsNotSecond = kIsNotLatest + kStates;
constexpr uint32_t kIsNotThird = kIsNotSecond + kStates;
constexpr uint32_t kIsLong = kIsNotThird + kStates; // state, position state: a repeat 0, not a short one
constexpr uint32_t kSlot = kIsLong + kStates * kPositionStates;
constexpr uint32_t kTreeSlots = kSlot + (kLengthsWithSlots << kSlotBits);
constexpr uint32_t kAlign = kTreeSlots + ((kFirstDirectSlot - kFirstTreeSlot) << kMostTreeBits);
constexpr uint32_t kMatchLength = kAlign + (1 << kAlignBits);
constexpr uint32_t kRepeatLength = kMatchLength + kLengthProbabilities;
constexpr uint32_t kLiteral = kRepeatLength + kLengthProbabilities;

// A literal's probabilities are chosen by the lowest lp bits of the position and the highest lc bits of the byte before
// it. Each choice holds three trees of 256: one for literals without a match byte or once they differ from it, one each
// for the match byte's bit being 0 and 1.
constexpr uint32_t kLiteralProbabilities = 3 * 256;

// The longest symbol is a match with 22 bits of which each has the least probable value, 31 / 2048, and 26 of even
// chance: 22 * log2(2048 / 31) + 26 < 160 bits.
constexpr size_t kLongestSymbol = 20;

} // namespace lzma
