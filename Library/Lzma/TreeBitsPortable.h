// The bits of trees without branches, for any processor: what a bit decides is chosen by masks.
#pragma once

#include "Library/Lzma/RangeDecoder.h"

namespace lzma {

struct TreeBits : RangeDecoder {
    // Decodes the bit of a node, and goes on to its child. probability is the node's, and becomes the child's; a node
    // of the last level has no children.
    void TreeBit(Probability* tree, size_t& node, uint32_t& probability, bool isLast) {
        Probability& place = tree[node];
        node *= 2;
        DecodeBit(place, node, probability, isLast ? 0 : tree[node], isLast ? 0 : tree[node + 1]);
    }

    // A literal in three trees of 256, the second and third for the match byte's bit being 0 and 1.
    uint32_t MatchedLiteral(Probability* trees, uint32_t matchByte) {
        uint32_t match = matchByte << 1; // its next bit has the value 256
        uint32_t agreed = 256;           // 0 once a bit differs
        uint32_t chosen = match & agreed;
        uint32_t tree = agreed + chosen;
        size_t node = 1;
        uint32_t probability = trees[tree + 1];
        for (int bit = 1; bit <= 8; ++bit) {
            Probability& place = trees[tree + node];
            node *= 2;
            match *= 2;
            const uint32_t agreed0 = agreed ^ chosen, agreed1 = chosen;
            const uint32_t tree0 = agreed0 + (match & agreed0), tree1 = agreed1 + (match & agreed1);
            const bool isLast = bit == 8;
            const uint32_t mask = DecodeBit(place, node, probability, isLast ? 0 : trees[tree0 + node],
                                            isLast ? 0 : trees[tree1 + node + 1]);
            agreed = Choose(mask, agreed0, agreed1);
            tree = Choose(mask, tree0, tree1);
            chosen = tree - agreed;
        }
        return static_cast<uint32_t>(node) - 256;
    }

    // A bit of even chance, below value. The sign decides, and not which is more: for a damaged stream that differs.
    void DirectBit(uint32_t& value) {
        Normalise();
        range /= 2;
        code -= range;
        const uint32_t mask = 0u - (code >> 31);
        code += range & mask;
        value = 2 * value + 1 + mask;
    }

private:
    // value0 where the mask is all ones, value1 where it is 0.
    static uint32_t Choose(uint32_t mask, uint32_t value0, uint32_t value1) {
        return value1 ^ ((value0 ^ value1) & mask);
    }

    // node comes as twice itself. Returns all ones for a 0.
    uint32_t DecodeBit(Probability& place, size_t& node, uint32_t& probability, uint32_t next0, uint32_t next1) {
        Normalise();
        const uint32_t bound = (range >> kProbabilityBits) * probability;
        const uint32_t mask = 0u - static_cast<uint32_t>(code < bound);
        range = Choose(mask, bound, range - bound);
        code -= bound & ~mask;
        const auto learning = static_cast<int32_t>(probability - (kLearnsZero & mask));
        place = static_cast<Probability>(static_cast<int32_t>(probability) - (learning >> kLearningShift));
        node += mask + 1;
        probability = Choose(mask, next0, next1);
        return mask;
    }
};

} // namespace lzma
