#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Math/Random/Rand.h"

constinit Rand* gScriptingRand = nullptr;

void InitScriptingRand(void*) {
    Rand* random = New<Rand>(kMemLabelRandom);
    if (random != nullptr) random->RandomizeState();
    gScriptingRand = random;
}

void CleanupScriptingRand(void*) {
    Delete(gScriptingRand, kMemLabelRandom);
    gScriptingRand = nullptr;
}
