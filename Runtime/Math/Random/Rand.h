// The state of a random generator and its seeding.
//
//   Rand random;
//   random.RandomizeState();
//
// A generator belongs to one thread at a time; several may be seeded at once.
#pragma once

#include "Runtime/Core/Types.h"

class Rand {
public:
    // Replaces the state with the system's entropy or, if there is none, with the hash of a new RandSeedBlock. Never
    // fails.
    void RandomizeState();

    friend bool operator==(const Rand&, const Rand&) = default;

private:
    UInt32 m_State[4] = {};
};
static_assert(sizeof(Rand) == 16 && alignof(Rand) == 4);

// The scripting generator. It exists from the start-up to the clean-up callbacks; null otherwise. Main thread only.
extern Rand* gScriptingRand;

void InitScriptingRand(void* userData);
void CleanupScriptingRand(void* userData);
