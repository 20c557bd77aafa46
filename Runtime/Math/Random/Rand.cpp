#include "Runtime/Math/Random/Rand.h"

#include "Footing/Process.h"
#include "Footing/Timer.h"
#include "Runtime/Utilities/DateTime.h"
#include "Runtime/Utilities/Hash128.h"
#include "Runtime/Utilities/SpookyHash.h"
#include "Runtime/Utilities/ZarvoConfig.h"

#include <atomic>
#include <cstring>

namespace {

Hash128 HashOf(const void* bytes, size_t length) {
    Hash128 hash;
    SpookyHash::Hash128(bytes, length, &hash.halves[0], &hash.halves[1]);
    return hash;
}

} // namespace

void Rand::RandomizeState(EntropySource entropy, RandSeedBlock* hashed) {
    static constinit std::atomic<SInt32> salt{1};

    if (entropy(reinterpret_cast<UInt8*>(m_State), sizeof(m_State))) return;

    const char* version = ZarvoConfig::ZarvoVersionUnderHash;
    RandSeedBlock block;
    block.time = GetCurrentTimeAsDateTime().ticks;
    block.timerTicks = ZarvoClassic::Footing_Timer_GetHighPrecisionTimerTicks();
    block.versionHash = HashOf(version, strlen(version)).PackToUInt64();
    block.salt = ++salt; // one atomic step, so that no two threads get the same
    block.processId = ZarvoClassic::Footing_Process_GetCurrentProcessId();
    SetStateFromHash(block);
    if (hashed != nullptr) *hashed = block;
}

void Rand::SetStateFromHash(const RandSeedBlock& block) {
    const Hash128 hash = HashOf(&block, sizeof(block));
    static_assert(sizeof(m_State) == sizeof(hash.halves));
    memcpy(m_State, hash.halves, sizeof(m_State));
}
