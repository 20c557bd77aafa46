// What seeds a random generator when the system gives no entropy. Any thread.
#pragma once

#include "Runtime/Core/Types.h"
#include "Runtime/Utilities/Hash128.h"

struct RandSeedBlock {
    SInt64 time;        // ticks of the current DateTime
    UInt64 timerTicks;  // of the high-precision timer
    UInt64 versionHash; // of the engine version text, folded
    SInt64 salt;        // counts the blocks of the process, from 2
    SInt64 processId;
};
static_assert(sizeof(RandSeedBlock) == 40);

// A block of this moment. No two calls give the same block.
RandSeedBlock MakeRandSeedBlock();

// The hash of the block's bytes in memory, which becomes the generator's state.
Hash128 HashOfSeedBlock(const RandSeedBlock& block);
