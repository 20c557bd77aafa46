// The state of a random generator and its seeding.
//
//   Rand random;
//   random.RandomizeState();
//
// A generator is one thread's; different ones may be seeded on different threads.
#pragma once

#include "Runtime/Core/Types.h"
#include "Runtime/Math/Random/SystemEntropy.h"

// What a state is made from when the system gives no entropy: hashed as it lies in memory.
struct RandSeedBlock {
    SInt64 time;        // ticks of the current DateTime
    UInt64 timerTicks;  // the high-precision timer
    UInt64 versionHash; // of the engine version text, folded
    SInt64 salt;        // differs between any two blocks of a process
    SInt64 processId;
};
static_assert(sizeof(RandSeedBlock) == 40);

class Rand {
public:
    using EntropySource = bool (*)(UInt8* buffer, size_t length);

    // Replaces the state with the system's entropy or, when that is not to be had, with the hash of a seed block. Never
    // fails; two calls never hash the same block. *hashed, where given, gets the block if one was hashed.
    void RandomizeState(EntropySource entropy = GetSystemEntropy, RandSeedBlock* hashed = nullptr);

    // Replaces the state with the hash of block.
    void SetStateFromHash(const RandSeedBlock& block);

    friend bool operator==(const Rand&, const Rand&) = default;

private:
    UInt32 m_State[4] = {};
};
static_assert(sizeof(Rand) == 16 && alignof(Rand) == 4);

// The scripting generator: there between the start-up and the clean-up callbacks, null otherwise (and when memory was
// refused). The main thread's.
extern Rand* gScriptingRand;

void InitScriptingRand(void* userData);
void CleanupScriptingRand(void* userData);
