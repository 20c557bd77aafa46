#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Math/Random/Rand.h"

constinit Rand* gScriptingRand = nullptr;

void InitScriptingRand(void*) {
    gScriptingRand = RequireMemory(New<Rand>(kMemLabelRandom));
    gScriptingRand->RandomizeState();
}

void CleanupScriptingRand(void*) {
    Delete(gScriptingRand, kMemLabelRandom);
    gScriptingRand = nullptr;
}
