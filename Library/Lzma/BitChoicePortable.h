// What a bit decides, without a branch: for any processor, by masks. BitChoiceX64.h says what the functions do.
#pragma once

#include <cstddef>
#include <cstdint>

namespace lzma {

// All ones where the bit is 0.
inline uint32_t MaskOfZero(uint32_t code, uint32_t bound) { return 0u - static_cast<uint32_t>(code < bound); }

// value0 where the mask is all ones, else value1.
inline uint32_t Choose(uint32_t mask, uint32_t value0, uint32_t value1) { return value1 ^ ((value0 ^ value1) & mask); }

inline void ChooseInTree(uint32_t bound, uint32_t& range, uint32_t& code, uint32_t probability, uint32_t& learning,
                         uint32_t next0, uint32_t& next, size_t& node) {
    const uint32_t mask = MaskOfZero(code, bound);
    range = Choose(mask, bound, range);
    code -= bound & ~mask;
    learning = Choose(mask, learning, probability);
    next = Choose(mask, next0, next);
    node += mask + 1;
}

inline void ChooseInTrees(uint32_t bound, uint32_t& range, uint32_t& code, uint32_t probability, uint32_t& learning,
                          uint32_t next0, uint32_t& next, size_t& node, size_t agreed1, size_t& agreed, size_t tree0,
                          size_t& tree) {
    const uint32_t mask = MaskOfZero(code, bound);
    agreed = Choose(mask, static_cast<uint32_t>(agreed), static_cast<uint32_t>(agreed1));
    tree = Choose(mask, static_cast<uint32_t>(tree0), static_cast<uint32_t>(tree));
    ChooseInTree(bound, range, code, probability, learning, next0, next, node);
}

inline void ChooseDirect(uint32_t bound, uint32_t& code, uint32_t& value) {
    const uint32_t mask = MaskOfZero(code, bound);
    code -= bound & ~mask;
    value += mask + 1;
}

} // namespace lzma
