// The bits of trees without branches, for x86-64, where compilers make branches or long detours of it however it is
// written. TreeBitsPortable.h has the same in C++, and says what the functions do.
//
// One bit is one asm statement. Its longest chain of dependent instructions is 6 cycles: shift, multiplication (3),
// comparison, conditional move. All else is done beside that chain, most of all the loads of both children's
// probabilities, of which the bit then takes one: to load after the bit is known would add 4 cycles and more.
#pragma once

#include "Library/Lzma/RangeDecoder.h"

namespace lzma {

// bound = (range >> 11) * probability, after Normalise; the multiplication is left to the user, who has loads to put
// before it.
#define LZMA_SCALED_RANGE                                                                                              \
    "cmpl $0xffffff, %[range]\n\t"                                                                                     \
    "ja 1f\n\t"                                                                                                        \
    "movzbl (%[in]), %k[rest]\n\t"                                                                                     \
    "shll $8, %[code]\n\t"                                                                                             \
    "shll $8, %[range]\n\t"                                                                                            \
    "incq %[in]\n\t"                                                                                                   \
    "orl %k[rest], %[code]\n"                                                                                          \
    "1:\n\t"                                                                                                           \
    "movl %[range], %[bound]\n\t"                                                                                      \
    "shrl $11, %[bound]\n\t"

// The carry says from here on that the bit is 0. bound is free afterwards, and takes what is learnt.
#define LZMA_CHOOSE_PART                                                                                               \
    "imull %[probability], %[bound]\n\t"                                                                               \
    "movl %[code], %k[rest]\n\t"                                                                                       \
    "subl %[bound], %[range]\n\t"                                                                                      \
    "subl %[bound], %k[rest]\n\t"                                                                                      \
    "cmovbl %[bound], %[range]\n\t"                                                                                    \
    "leal -2017(%[probability]), %[bound]\n\t"                                                                         \
    "cmovael %k[rest], %[code]\n\t"

// rest is free before, and becomes the child. Uses the carry up.
#define LZMA_LEARN_AND_DESCEND                                                                                         \
    "leaq (%[node],%[node]), %[rest]\n\t"                                                                              \
    "cmovael %[probability], %[bound]\n\t"                                                                             \
    "sbbq $-1, %[rest]\n\t"                                                                                            \
    "sarl $5, %[bound]\n\t"                                                                                            \
    "subl %[bound], %[probability]\n\t"                                                                                \
    "movw %w[probability], (%[tree],%[node],2)\n\t"

static_assert(kLeastRange == 0xffffff + 1 && kProbabilityBits == 11 && kLearnsZero == 2017 && kLearningShift == 5);
static_assert(sizeof(Probability) == 2);

struct TreeBits : RangeDecoder {
    [[gnu::always_inline]] void TreeBit(Probability* tree, size_t& node, uint32_t& probability, bool isLast) {
        uint32_t next = 0, bound;
        size_t rest;
        if (isLast)
            asm volatile(LZMA_SCALED_RANGE LZMA_CHOOSE_PART LZMA_LEARN_AND_DESCEND
                         : [range] "+r"(range), [code] "+r"(code), [in] "+r"(in), [probability] "+r"(probability),
                           [rest] "=&r"(rest), [bound] "=&r"(bound)
                         : [tree] "r"(tree), [node] "r"(node)
                         : "cc", "memory");
        else
            asm volatile(LZMA_SCALED_RANGE "movzwl 2(%[tree],%[node],4), %[next]\n\t" LZMA_CHOOSE_PART
                                           "cmovbw (%[tree],%[node],4), %w[next]\n\t" LZMA_LEARN_AND_DESCEND
                         : [range] "+r"(range), [code] "+r"(code), [in] "+r"(in), [probability] "+r"(probability),
                           [rest] "=&r"(rest), [bound] "=&r"(bound), [next] "=&r"(next)
                         : [tree] "r"(tree), [node] "r"(node)
                         : "cc", "memory");
        node = rest;
        probability = next;
    }

    // As in the portable form, with places of bytes, and the trees' addresses in place of their places.
    [[gnu::always_inline]] uint32_t MatchedLiteral(Probability* trees, uint32_t matchByte) {
        size_t match = matchByte << 2;
        size_t agreed = 256 * sizeof(Probability);
        size_t chosen = match & agreed;
        auto* tree = reinterpret_cast<Probability*>(reinterpret_cast<uint8_t*>(trees) + agreed + chosen);
        size_t node = 1;
        uint32_t probability = tree[1];
#pragma GCC unroll 7
        for (int bit = 1; bit < 8; ++bit) {
            uint32_t next, bound;
            size_t rest;
            Probability *tree0, *tree1;
            asm volatile("addq %[match], %[match]\n\t"
                         "xorq %[chosen], %[agreed]\n\t" // as it is after a 0; after a 1, it is chosen
                         "movq %[match], %[tree1]\n\t"
                         "movq %[match], %[tree0]\n\t"
                         "andq %[chosen], %[tree1]\n\t"
                         "andq %[agreed], %[tree0]\n\t"
                         "addq %[trees], %[tree1]\n\t"
                         "addq %[trees], %[tree0]\n\t"
                         "addq %[chosen], %[tree1]\n\t"
                         "addq %[agreed], %[tree0]\n\t" // clang-format off
                         LZMA_SCALED_RANGE
                         "movzwl 2(%[tree1],%[node],4), %[next]\n\t"
                         LZMA_CHOOSE_PART
                         "cmovbw (%[tree0],%[node],4), %w[next]\n\t"
                         "cmovaeq %[chosen], %[agreed]\n\t"
                         "cmovaeq %[tree1], %[tree0]\n\t"
                         LZMA_LEARN_AND_DESCEND // clang-format on
                         "movq %[match], %[chosen]\n\t"
                         "andq %[agreed], %[chosen]"
                         : [range] "+r"(range), [code] "+r"(code), [in] "+r"(in), [probability] "+r"(probability),
                           [rest] "=&r"(rest), [bound] "=&r"(bound), [next] "=&r"(next), [match] "+r"(match),
                           [agreed] "+r"(agreed), [chosen] "+r"(chosen), [tree0] "=&r"(tree0), [tree1] "=&r"(tree1)
                         : [tree] "r"(tree), [node] "r"(node), [trees] "m"(trees) // in memory: there are 15 registers
                         : "cc", "memory");
            node = rest;
            tree = tree0;
            probability = next;
        }
        TreeBit(tree, node, probability, true);
        return static_cast<uint32_t>(node) - 256;
    }

    [[gnu::always_inline]] void DirectBit(uint32_t& value) {
        Normalise();
        range /= 2;
        uint32_t rest = code;
        value *= 2;
        asm("subl %[range], %[rest]\n\t"
            "cmovnsl %[rest], %[code]\n\t"
            "cmpl $0x80000000, %[rest]\n\t"
            "adcl $0, %[value]"
            : [rest] "+r"(rest), [code] "+r"(code), [value] "+r"(value)
            : [range] "r"(range)
            : "cc");
    }
};

#undef LZMA_SCALED_RANGE
#undef LZMA_CHOOSE_PART
#undef LZMA_LEARN_AND_DESCEND

} // namespace lzma
