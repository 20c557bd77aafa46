// The decoding loop, between the range decoder below it and the stream above: symbols become bytes.
#pragma once

#include "Library/Lzma/Model.h"

namespace lzma {

// What is remembered between two symbols, and where input and output are.
struct SymbolState {
    Probability* table;
    uint32_t literalContextBits;  // lc
    uint32_t literalPositionMask; // of lp bits
    uint32_t positionMask;        // of pb bits
    uint32_t dictionarySize;

    const uint8_t* in;
    uint32_t range; // at least 2^24 between two calls
    uint32_t code;

    uint32_t state;
    uint32_t distances[4]; // the latest first; each reaches a byte that has been written, once there is one
    uint32_t pending;      // how many bytes of the latest match there was no room for

    uint8_t* out;
    uintptr_t origin; // out - origin is the position in the stream

    // Where the bytes before out lie. A distance that reaches to before the window goes on down from its end.
    uint8_t* window;
    size_t windowSize;
    uint8_t* wideEnd; // copies that end here or before may write kWideCopy - 1 bytes more
};

constexpr size_t kWideCopy = 16;

// The byte that lies distance back.
inline uint8_t* FindMatch(const SymbolState& symbols, uint8_t* out, uint32_t distance) {
    const size_t place = static_cast<size_t>(out - symbols.window);
    return symbols.window + (place - distance + (distance > place ? symbols.windowSize : 0));
}

enum SymbolResult : int { kSymbolsDone, kSymbolsEndMark, kSymbolsDamaged };

// Decodes at least one symbol, and goes on while out is below outLimit and in below inLimit; kLongestSymbol + 1 bytes
// from inLimit on can be read. The room needs to be empty for the first symbol only if it is an end mark: anything else
// is damage then. After damage out is where the broken symbol would have begun, and nothing else is meaningful.
SymbolResult DecodeSymbols(SymbolState& symbols, const uint8_t* inLimit, uint8_t* outLimit);

enum TrialResult : int { kTrialNeedsInput, kTrialMatch, kTrialOther };

// Says whether the next symbol, and the byte that widens the range after it, lie before inEnd whole, and whether it is
// a match, as end marks are. Changes nothing.
TrialResult TrySymbol(const SymbolState& symbols, const uint8_t* inEnd);

} // namespace lzma
