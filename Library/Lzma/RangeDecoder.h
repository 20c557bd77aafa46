// The range decoder: bits out of the input.
//
// The input is one long binary fraction. range is the width of the part of it that is still possible, and code says
// where in that part the fraction lies. A bit splits the range in proportion to its probability, the part of a 0 first,
// and code tells in which part it is. Before that a range that has become less than 2^24 is widened by 8 bits, and code
// takes the next byte of the input. The probability then goes a 32nd of the way to what it has just seen.
#pragma once

#include "Library/Lzma/Model.h"
#if defined(__x86_64__) && !defined(ZARVO_LZMA_PORTABLE)
#include "Library/Lzma/BitChoiceX64.h"
#else
#include "Library/Lzma/BitChoicePortable.h"
#endif

namespace lzma {

constexpr uint32_t kLeastRange = 1 << 24;
constexpr uint32_t kCertain = 1 << kProbabilityBits;
constexpr int kLearningShift = 5;
// A probability p becomes p + ((kCertain - p) >> 5) after a 0 and p - (p >> 5) after a 1. Both are p - (learning >> 5),
// with learning being p - kLearnsZero or p, and a shift that keeps the sign.
constexpr uint32_t kLearnsZero = kCertain - (1 << kLearningShift) + 1;

struct RangeDecoder {
    static constexpr bool kIsTrial = false;

    uint32_t range;
    uint32_t code;
    const uint8_t* in;

    // A branch, as it is seldom taken: the same by conditional moves took 6 % more time on text and programs.
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

    // The bits of trees are hard to guess: each is decided by conditional moves, which take 6 cycles where a wrong
    // guess takes 15 or more. The probabilities of both possible next bits are loaded meanwhile.
    template <int kBits>
    [[gnu::always_inline]] uint32_t Tree(Probability* tree) {
        size_t node = 1;
        uint32_t probability = tree[1];
#pragma GCC unroll 8
        for (int bit = 1; bit <= kBits; ++bit)
            TreeBit(tree, node, probability, bit == kBits);
        return static_cast<uint32_t>(node) - (1u << kBits);
    }

    [[gnu::always_inline]] uint32_t ReverseTree(Probability* tree, int bits) {
        size_t node = 1;
        uint32_t probability = tree[1];
        uint32_t value = 0;
        for (int bit = 0; bit < bits; ++bit) {
            TreeBit(tree, node, probability, false);
            value |= static_cast<uint32_t>(node & 1) << bit;
        }
        return value;
    }

    // A literal in three trees of 256. Without a branch too: how long it agrees with the match byte can't be guessed.
    [[gnu::always_inline]] uint32_t MatchedLiteral(Probability* trees, uint32_t matchByte) {
        size_t match = matchByte << 1; // its next bit has the value 256
        size_t agreed = 256;           // 0 once a bit differs
        size_t chosen = match & agreed;
        size_t tree = agreed + chosen;
        size_t node = 1;
        uint32_t probability = trees[tree + 1];
#pragma GCC unroll 8
        for (int bit = 1; bit <= 8; ++bit) {
            Probability& place = trees[tree + node];
            match *= 2;
            const size_t agreed1 = chosen;
            agreed ^= chosen;
            const size_t tree0 = agreed + (match & agreed);
            tree = agreed1 + (match & agreed1);
            const bool isLast = bit == 8;
            const uint32_t next0 = isLast ? 0 : trees[tree0 + 2 * node];
            uint32_t next = isLast ? 0 : trees[tree + 2 * node + 1];
            const uint32_t bound = Split(probability);
            uint32_t learning = probability - kLearnsZero;
            node *= 2;
            ChooseInTrees(bound, range, code, probability, learning, next0, next, node, agreed1, agreed, tree0, tree);
            place = Learnt(probability, learning);
            probability = next;
            chosen = tree - agreed;
        }
        return static_cast<uint32_t>(node) - 256;
    }

    // Puts bits (1 at least) of even chance below value.
    [[gnu::always_inline]] uint32_t DirectBits(uint32_t value, int bits) {
        do {
            Normalise();
            range /= 2;
            value *= 2;
            ChooseDirect(range, code, value);
        } while (--bits != 0);
        return value;
    }

private:
    // Returns how much of the range stands for a 0, and takes it off.
    [[gnu::always_inline]] uint32_t Split(uint32_t probability) {
        Normalise();
        const uint32_t bound = (range >> kProbabilityBits) * probability;
        range -= bound;
        return bound;
    }

    static Probability Learnt(uint32_t probability, uint32_t learning) {
        return static_cast<Probability>(probability -
                                        static_cast<uint32_t>(static_cast<int32_t>(learning) >> kLearningShift));
    }

    [[gnu::always_inline]] void TreeBit(Probability* tree, size_t& node, uint32_t& probability, bool isLast) {
        Probability& place = tree[node];
        const uint32_t next0 = isLast ? 0 : tree[2 * node];
        uint32_t next = isLast ? 0 : tree[2 * node + 1];
        const uint32_t bound = Split(probability);
        uint32_t learning = probability - kLearnsZero;
        node *= 2;
        ChooseInTree(bound, range, code, probability, learning, next0, next, node);
        place = Learnt(probability, learning);
        probability = next;
    }
};

// Goes through a symbol without learning from it; once the input is used up it goes on with zeros, and says so.
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
        uint32_t node = 1;
        for (int bit = 0; bit < kBits; ++bit)
            node = 2 * node + Bit(tree[node]);
        return node - (1u << kBits);
    }

    uint32_t ReverseTree(const Probability* tree, int bits) {
        uint32_t node = 1;
        uint32_t value = 0;
        for (int bit = 0; bit < bits; ++bit) {
            node = 2 * node + Bit(tree[node]);
            value |= (node & 1) << bit;
        }
        return value;
    }

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
            const bool bit = code >= range;
            code -= bit ? range : 0;
            value = 2 * value + bit;
        }
        return value;
    }
};

} // namespace lzma
