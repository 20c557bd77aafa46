// What a bit decides, without a branch: for x86-64, where compilers make branches of it however it is written.
#pragma once

#include <cstddef>
#include <cstdint>

namespace lzma {

// Each function subtracts bound from code, of which the carry says that the bit is 0, and then chooses by it.

// range comes as it is after a 1. learning and next come as they are for a 1 and a 0, node as twice itself.
[[gnu::always_inline]] inline void ChooseInTree(uint32_t bound, uint32_t& range, uint32_t& code, uint32_t probability,
                                                uint32_t& learning, uint32_t next0, uint32_t& next, size_t& node) {
    uint32_t rest = code;
    asm("subl %[bound], %[rest]\n\t"
        "cmovbl %[bound], %[range]\n\t"
        "cmovael %[rest], %[code]\n\t"
        "cmovbl %[next0], %[next]\n\t"
        "cmovael %[probability], %[learning]\n\t"
        "sbbq $-1, %[node]"
        : [rest] "+r"(rest), [range] "+r"(range), [code] "+r"(code), [learning] "+r"(learning), [next] "+r"(next),
          [node] "+r"(node)
        : [bound] "r"(bound), [probability] "r"(probability), [next0] "r"(next0)
        : "cc");
}

// The same, with what chooses among the trees of a matched literal.
[[gnu::always_inline]] inline void ChooseInTrees(uint32_t bound, uint32_t& range, uint32_t& code, uint32_t probability,
                                                 uint32_t& learning, uint32_t next0, uint32_t& next, size_t& node,
                                                 size_t agreed1, size_t& agreed, size_t tree0, size_t& tree) {
    uint32_t rest = code;
    asm("subl %[bound], %[rest]\n\t"
        "cmovbl %[bound], %[range]\n\t"
        "cmovael %[rest], %[code]\n\t"
        "cmovbl %[next0], %[next]\n\t"
        "cmovaeq %[agreed1], %[agreed]\n\t"
        "cmovbq %[tree0], %[tree]\n\t"
        "cmovael %[probability], %[learning]\n\t"
        "sbbq $-1, %[node]"
        : [rest] "+r"(rest), [range] "+r"(range), [code] "+r"(code), [learning] "+r"(learning), [next] "+r"(next),
          [node] "+r"(node), [agreed] "+r"(agreed), [tree] "+r"(tree)
        : [bound] "r"(bound), [probability] "rm"(probability), [next0] "rm"(next0), [agreed1] "rm"(agreed1),
          [tree0] "rm"(tree0)
        : "cc");
}

// A bit of even chance: value comes as twice itself.
[[gnu::always_inline]] inline void ChooseDirect(uint32_t bound, uint32_t& code, uint32_t& value) {
    uint32_t rest = code;
    asm("subl %[bound], %[rest]\n\t"
        "cmovael %[rest], %[code]\n\t"
        "sbbl $-1, %[value]"
        : [rest] "+r"(rest), [code] "+r"(code), [value] "+r"(value)
        : [bound] "r"(bound)
        : "cc");
}

} // namespace lzma
