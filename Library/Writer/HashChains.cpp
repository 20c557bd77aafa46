#include "Library/Writer/HashChains.h"

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <lzma/LzHash.h>

namespace {

constexpr UInt32 kHashedBytes = 4;
constexpr size_t kAhead = 8; // bytes from one that is looked for to the one whose chains are fetched

IMatchFinder MakeSdkFinder() {
    CMatchFinder chains;
    MatchFinder_Construct(&chains);
    chains.btMode = 0;
    IMatchFinder functions;
    MatchFinder_CreateVTable(&chains, &functions);
    return functions;
}

// The SDK's own functions. They also read on, move the window, and start again at the begin of the cyclic buffer.
const IMatchFinder& SdkFinder() {
    static const IMatchFinder finder = MakeSdkFinder();
    return finder;
}

// Whether so many bytes can be passed before any of that is due. If so, at least the longest match's bytes follow them.
bool CanPass(const CMatchFinder& finder, UInt32 bytes) {
    return finder.lenLimit >= kHashedBytes && finder.posLimit - finder.pos > bytes;
}

// Where the last positions are kept that had the same two, three and (but for collisions) four bytes.
struct Heads {
    Heads(const CMatchFinder& finder, const Byte* at) {
        const UInt32 two = finder.crc[at[0]] ^ at[1];
        const UInt32 three = two ^ (UInt32{at[2]} << 8);
        const UInt32 four = three ^ (finder.crc[at[3]] << 5);
        ofTwo = finder.hash + (two & (kHash2Size - 1));
        ofThree = finder.hash + kFix3HashSize + (three & (kHash3Size - 1));
        ofFour = finder.hash + kFix4HashSize + (four & finder.hashMask);
    }

    void SetTo(UInt32 position) { *ofTwo = *ofThree = *ofFour = position; }

    UInt32* ofTwo;
    UInt32* ofThree;
    UInt32* ofFour;
};

void Fetch(const CMatchFinder& finder, const Byte* at) {
    const Heads heads(finder, at);
    __builtin_prefetch(heads.ofThree, 1);
    __builtin_prefetch(heads.ofFour, 1);
}

// How many bytes are the same, of which the first `length` are known to be.
UInt32 CompareFrom(UInt32 length, const Byte* bytes, const Byte* earlier, UInt32 limit) {
    constexpr UInt32 kWord = sizeof(uint64_t);
    for (; limit - length >= kWord; length += kWord) {
        uint64_t word, earlierWord;
        memcpy(&word, bytes + length, kWord);
        memcpy(&earlierWord, earlier + length, kWord);
        if (word != earlierWord) return length + static_cast<UInt32>(std::countr_zero(word ^ earlierWord)) / 8;
    }
    while (length < limit && bytes[length] == earlier[length])
        ++length;
    return length;
}

// The matches of the current position, as pairs of a length and a distance less 1; lengths grow. Passes one byte.
UInt32 GetMatches(void* object, UInt32* pairs) {
    auto& finder = *static_cast<CMatchFinder*>(object);
    if (!CanPass(finder, 1)) return SdkFinder().GetMatches(object, pairs);

    const Byte* const bytes = finder.buffer++;
    const UInt32 position = finder.pos++;
    const UInt32 cyclicPosition = finder.cyclicBufferPos++;
    const UInt32 window = finder.cyclicBufferSize;
    const UInt32 limit = finder.lenLimit;
    Fetch(finder, bytes + kAhead);
    Heads heads(finder, bytes);
    UInt32 distance = position - *heads.ofTwo;
    const UInt32 distanceOfThree = position - *heads.ofThree;
    UInt32 candidate = *heads.ofFour;
    heads.SetTo(position);
    finder.son[cyclicPosition] = candidate;

    // The same first byte and hash mean that all two or three bytes are the same.
    const auto isMatch = [&](UInt32 back) { return back < window && *(bytes - back) == *bytes; };
    UInt32* end = pairs;
    const auto put = [&](UInt32 length, UInt32 back) {
        *end++ = length;
        *end++ = back - 1;
    };
    UInt32 longest = 1;
    if (isMatch(distance)) put(longest = 2, distance);
    if (distanceOfThree != distance && isMatch(distanceOfThree)) put(longest = 3, distance = distanceOfThree);
    if (end != pairs) {
        longest = CompareFrom(longest, bytes, bytes - distance, limit);
        end[-2] = longest;
        if (longest == limit) return static_cast<UInt32>(end - pairs);
    }
    if (longest < kHashedBytes - 1) longest = kHashedBytes - 1;

    for (UInt32 steps = finder.cutValue; steps != 0; --steps) {
        distance = position - candidate;
        if (distance >= window) break;
        const Byte* const earlier = bytes - distance;
        candidate = finder.son[cyclicPosition - distance + (distance > cyclicPosition ? window : 0)];
        if (earlier[longest] != bytes[longest] || *earlier != *bytes) continue;
        const UInt32 length = CompareFrom(1, bytes, earlier, limit);
        if (length <= longest) continue;
        put(longest = length, distance);
        if (length == limit) break;
    }
    return static_cast<UInt32>(end - pairs);
}

void Skip(void* object, UInt32 count) {
    auto& finder = *static_cast<CMatchFinder*>(object);
    if (!CanPass(finder, count)) return SdkFinder().Skip(object, count);
    for (; count != 0; --count) {
        const Byte* const bytes = finder.buffer++;
        Fetch(finder, bytes + kAhead);
        Heads heads(finder, bytes);
        finder.son[finder.cyclicBufferPos++] = *heads.ofFour;
        heads.SetTo(finder.pos++);
    }
}

} // namespace

extern "C" void ChooseMatchFinder(CMatchFinder* finder, IMatchFinder* functions) {
    MatchFinder_CreateVTable(finder, functions);
    if (finder->btMode != 0) return;
    functions->GetMatches = GetMatches;
    functions->Skip = Skip;
}
