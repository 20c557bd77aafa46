// A 128-bit hash as two 64-bit halves.
#pragma once

#include "Runtime/Core/Types.h"

struct Hash128 {
    UInt64 halves[2] = {0, 0};

    // The two halves folded into one.
    constexpr UInt64 PackToUInt64() const { return halves[0] ^ halves[1]; }

    friend constexpr bool operator==(const Hash128&, const Hash128&) = default;
};
