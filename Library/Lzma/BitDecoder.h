// What symbols are made of: single bits, trees of bits, literals, and bits of even chance. BitDecoder decodes them and
// learns from them; TrialDecoder only goes through them.
#pragma once

#if defined(__x86_64__) && !defined(ZARVO_LZMA_PORTABLE)
#include "Library/Lzma/TreeBitsX64.h"
#else
#include "Library/Lzma/TreeBitsPortable.h"
#endif

#include <array>

namespace lzma {

// The bits of a node's place below the leading one, the first of them lowest.
constexpr std::array<uint8_t, 2 << kMostTreeBits> kReversed = [] {
    std::array<uint8_t, 2 << kMostTreeBits> reversed = {};
    for (size_t node = 2; node < reversed.size(); ++node) {
        for (size_t bits = node; bits > 1; bits /= 2)
            reversed[node] = static_cast<uint8_t>(2 * reversed[node] + bits % 2);
    }
    return reversed;
}();

struct BitDecoder : TreeBits {
    static constexpr bool kIsTrial = false;

    template <int kBits>
    [[gnu::always_inline]] uint32_t Tree(Probability* tree) {
        return static_cast<uint32_t>(DescendTree<kBits>(tree)) - (1u << kBits);
    }

    // Of bits levels, 1 to kMostTreeBits, the lowest bit first.
    [[gnu::always_inline]] uint32_t ReverseTree(Probability* tree, int bits) {
        size_t node = 1;
        uint32_t probability = tree[1];
        for (; bits != 0; --bits)
            TreeBit(tree, node, probability, false); // what the last bit loads is in the table, and is not used
        return kReversed[node];
    }

    [[gnu::always_inline]] uint32_t AlignTree(Probability* tree) { return kReversed[DescendTree<kAlignBits>(tree)]; }

    // Puts bits (1 at least) of even chance below value.
    [[gnu::always_inline]] uint32_t DirectBits(uint32_t value, int bits) {
        do {
            DirectBit(value);
        } while (--bits != 0);
        return value;
    }

private:
    template <int kBits>
    [[gnu::always_inline]] size_t DescendTree(Probability* tree) {
        size_t node = 1;
        uint32_t probability = tree[1];
#pragma GCC unroll 8
        for (int bit = 1; bit <= kBits; ++bit)
            TreeBit(tree, node, probability, bit == kBits);
        return node;
    }
};

// Once the input is used up it goes on with zeros, and says so.
struct TrialDecoder {
    static constexpr bool kIsTrial = true;

    uint32_t range;
    uint32_t code;
    const uint8_t* in;
    const uint8_t* inEnd;
    bool isShort;

    void Normalise() {
        if (range >= kLeastRange) return;
        range <<= 8;
        code <<= 8;
        if (in == inEnd)
            isShort = true;
        else
            code |= *in++;
    }

    bool Bit(Probability probability) {
        Normalise();
        const uint32_t bound = (range >> kProbabilityBits) * probability;
        const bool bit = code >= bound;
        range = bit ? range - bound : bound;
        code -= bit ? bound : 0;
        return bit;
    }

    template <int kBits>
    uint32_t Tree(const Probability* tree) {
        return static_cast<uint32_t>(DescendTree(tree, kBits)) - (1u << kBits);
    }

    uint32_t ReverseTree(const Probability* tree, int bits) { return kReversed[DescendTree(tree, bits)]; }
    uint32_t AlignTree(const Probability* tree) { return ReverseTree(tree, kAlignBits); }

    uint32_t MatchedLiteral(const Probability* trees, uint32_t matchByte) {
        uint32_t node = 1;
        uint32_t agreed = 256;
        for (uint32_t match = matchByte << 1; node < 256; match *= 2) {
            const uint32_t chosen = match & agreed;
            const bool bit = Bit(trees[agreed + chosen + node]);
            node = 2 * node + bit;
            agreed = bit ? chosen : agreed ^ chosen;
        }
        return node - 256;
    }

    uint32_t DirectBits(uint32_t value, int bits) {
        for (; bits != 0; --bits) {
            Normalise();
            range /= 2;
            const bool bit = (code - range) >> 31 == 0;
            code -= bit ? range : 0;
            value = 2 * value + bit;
        }
        return value;
    }

private:
    size_t DescendTree(const Probability* tree, int bits) {
        size_t node = 1;
        for (; bits != 0; --bits)
            node = 2 * node + Bit(tree[node]);
        return node;
    }
};

} // namespace lzma
