#include "Library/Lzma/SymbolLoop.h"
#include "Library/Lzma/BitDecoder.h"

#include <cstring>

namespace lzma {

namespace {

constexpr uint32_t kEndMark = 0xFFFFFFFF; // as a distance less one

template <class Decoder>
[[gnu::always_inline]] inline uint32_t DecodeLength(Decoder& decoder, Probability* length, uint32_t positionState) {
    if (!decoder.Bit(length[kLengthIsLong]))
        return kShortestMatch + decoder.template Tree<3>(length + kLengthShort + 8 * positionState);
    if (!decoder.Bit(length[kLengthIsLonger]))
        return kShortestMatch + 8 + decoder.template Tree<3>(length + kLengthMiddle + 8 * positionState);
    return kShortestMatch + 16 + decoder.template Tree<8>(length + kLengthHigh);
}

// Returns the distance less one, of a match at out.
template <class Decoder>
[[gnu::always_inline]] inline uint32_t DecodeDistance(Decoder& decoder, Probability* table, uint32_t length,
                                                      const uint8_t* out) {
    const uint32_t choice =
        length < kShortestMatch + kLengthsWithSlots ? length - kShortestMatch : kLengthsWithSlots - 1;
    const uint32_t slot = decoder.template Tree<kSlotBits>(table + kSlot + (choice << kSlotBits));
    if (slot < kFirstTreeSlot) return slot;
    const int bits = static_cast<int>(slot / 2) - 1;
    const uint32_t highest = 2 | (slot & 1);
    if (slot < kFirstDirectSlot) {
        Probability* const tree = table + kTreeSlots + ((slot - kFirstTreeSlot) << kMostTreeBits);
        return (highest << bits) + decoder.ReverseTree(tree, bits);
    }
    const uint32_t direct = decoder.DirectBits(highest, bits - kAlignBits);
    // What the match copies begins within 16 bytes of here, and is under way before the last bits are known: 1 to 2 %
    // of the time on streams larger than the processor's nearer caches.
    const size_t middle = (size_t{direct} << kAlignBits) + (1 << kAlignBits) / 2;
    if constexpr (!Decoder::kIsTrial)
        __builtin_prefetch(reinterpret_cast<const void*>(reinterpret_cast<uintptr_t>(out) - middle));
    return (direct << kAlignBits) + decoder.AlignTree(table + kAlign);
}

// Copies count bytes, at least one, that begin distance back. The ranges may overlap: bytes that are written are read.
[[gnu::always_inline]] inline uint8_t* CopyMatch(const SymbolState& symbols, uint8_t* out, uint32_t distance,
                                                 uint32_t count) {
    const uint8_t* match = FindMatch(symbols, out, distance);
    uint8_t* const end = out + count;
    const size_t unwrapped = symbols.windowSize - static_cast<size_t>(match - symbols.window);
    if (distance >= kWideCopy && end <= symbols.wideEnd && count <= unwrapped) {
        do {
            memcpy(out, match, kWideCopy);
            out += kWideCopy;
            match += kWideCopy;
        } while (out < end);
        return end;
    }
    for (const uint8_t* const windowEnd = symbols.window + symbols.windowSize; out != end;) {
        *out++ = *match++;
        if (match == windowEnd) match = symbols.window;
    }
    return end;
}

// Damage: what came before it is there.
inline SymbolResult StopAt(uint8_t* out, SymbolState* after) {
    after->out = out;
    return kSymbolsDamaged;
}

// DecodeSymbols, or TrySymbol, with which after is null and outLimit is not looked at.
template <class Decoder>
[[gnu::always_inline]] inline int DecodeWith(Decoder decoder, const SymbolState& symbols, const uint8_t* inLimit,
                                             uint8_t* outLimit, SymbolState* after) {
    // Locals: what is written through a pointer to bytes may be anything, and would have to be loaded again.
    Probability* const table = symbols.table;
    const uint32_t literalContextBits = symbols.literalContextBits;
    const uint32_t literalPositionMask = symbols.literalPositionMask;
    const uint32_t positionMask = symbols.positionMask;
    const uintptr_t origin = symbols.origin;
    uint8_t* out = symbols.out;
    uint32_t state = symbols.state;
    uint32_t distance0 = symbols.distances[0];
    uint32_t distance1 = symbols.distances[1];
    uint32_t distance2 = symbols.distances[2];
    uint32_t distance3 = symbols.distances[3];
    uint32_t pending = 0;
    SymbolResult result = kSymbolsDone;

    uint32_t previous = reinterpret_cast<uintptr_t>(out) == origin ? 0 : *FindMatch(symbols, out, 1);
    do {
        const size_t position = reinterpret_cast<uintptr_t>(out) - origin;
        const uint32_t positionState = static_cast<uint32_t>(position) & positionMask;

        if (!decoder.Bit(table[kIsMatch + state * kPositionStates + positionState])) {
            const uint32_t choice = ((static_cast<uint32_t>(position) & literalPositionMask) << literalContextBits) +
                                    (previous >> (8 - literalContextBits));
            Probability* const trees = table + kLiteral + size_t{kLiteralProbabilities} * choice;
            if (state < kFirstMatchedState)
                previous = decoder.template Tree<8>(trees);
            else
                previous = decoder.MatchedLiteral(trees, *FindMatch(symbols, out, distance0));
            if constexpr (Decoder::kIsTrial) break;
            *out++ = static_cast<uint8_t>(previous);
            state = kAfterLiteral[state];
            continue;
        }

        uint32_t length;
        if (!decoder.Bit(table[kIsRepeat + state])) {
            length = DecodeLength(decoder, table + kMatchLength, positionState);
            const uint32_t distance = DecodeDistance(decoder, table, length, out);
            if constexpr (Decoder::kIsTrial) {
                result = kSymbolsEndMark;
                break;
            }
            if (distance == kEndMark) {
                result = kSymbolsEndMark;
                break;
            }
            const size_t reach = position < symbols.dictionarySize ? position : symbols.dictionarySize;
            if (distance >= reach) return StopAt(out, after);
            distance3 = distance2;
            distance2 = distance1;
            distance1 = distance0;
            distance0 = distance + 1;
            state = kAfterMatch[state];
        } else {
            if (!Decoder::kIsTrial && position == 0) return StopAt(out, after);
            if (!decoder.Bit(table[kIsNotLatest + state])) {
                if (!decoder.Bit(table[kIsLong + state * kPositionStates + positionState])) {
                    if constexpr (Decoder::kIsTrial) break;
                    if (out == outLimit) return StopAt(out, after);
                    previous = *FindMatch(symbols, out, distance0);
                    *out++ = static_cast<uint8_t>(previous);
                    state = kAfterShortRepeat[state];
                    continue;
                }
            } else {
                uint32_t distance = distance1;
                if (decoder.Bit(table[kIsNotSecond + state])) {
                    distance = distance2;
                    if (decoder.Bit(table[kIsNotThird + state])) {
                        distance = distance3;
                        distance3 = distance2;
                    }
                    distance2 = distance1;
                }
                distance1 = distance0;
                distance0 = distance;
            }
            length = DecodeLength(decoder, table + kRepeatLength, positionState);
            if constexpr (Decoder::kIsTrial) break;
            state = kAfterRepeat[state];
        }

        const size_t room = static_cast<size_t>(outLimit - out);
        if (room == 0) return StopAt(out, after);
        uint32_t count = length;
        if (count > room) {
            count = static_cast<uint32_t>(room);
            pending = length - count;
        }
        out = CopyMatch(symbols, out, distance0, count);
        previous = *FindMatch(symbols, out - 1, distance0); // what out[-1] is, without waiting for the copy
    } while (out < outLimit && decoder.in < inLimit);

    decoder.Normalise();
    if constexpr (Decoder::kIsTrial) {
        if (decoder.isShort) return kTrialNeedsInput;
        return result == kSymbolsEndMark ? kTrialMatch : kTrialOther;
    }
    after->in = decoder.in;
    after->range = decoder.range;
    after->code = decoder.code;
    after->state = state;
    after->distances[0] = distance0;
    after->distances[1] = distance1;
    after->distances[2] = distance2;
    after->distances[3] = distance3;
    after->pending = pending;
    after->out = out;
    return result;
}

} // namespace

SymbolResult DecodeSymbols(SymbolState& symbols, const uint8_t* inLimit, uint8_t* outLimit) {
    BitDecoder decoder;
    decoder.range = symbols.range;
    decoder.code = symbols.code;
    decoder.in = symbols.in;
    return static_cast<SymbolResult>(DecodeWith(decoder, symbols, inLimit, outLimit, &symbols));
}

TrialResult TrySymbol(const SymbolState& symbols, const uint8_t* inEnd) {
    const TrialDecoder decoder = {symbols.range, symbols.code, symbols.in, inEnd, false};
    return static_cast<TrialResult>(DecodeWith(decoder, symbols, inEnd, nullptr, nullptr));
}

} // namespace lzma
