#include "Runtime/Math/Random/Rand.h"

#include "Runtime/Math/Random/RandSeedBlock.h"
#include "Runtime/Math/Random/SystemEntropy.h"

#include <cstring>

void Rand::RandomizeState() {
    if (GetSystemEntropy(reinterpret_cast<UInt8*>(m_State), sizeof(m_State))) return;
    const Hash128 hash = HashOfSeedBlock(MakeRandSeedBlock());
    static_assert(sizeof(m_State) == sizeof(hash.halves));
    memcpy(m_State, hash.halves, sizeof(m_State));
}
