#include "Runtime/Math/Random/RandSeedBlock.h"

#include "Footing/Process.h"
#include "Footing/Timer.h"
#include "Runtime/Utilities/DateTime.h"
#include "Runtime/Utilities/SpookyHash.h"
#include "Runtime/Utilities/ZarvoConfig.h"

#include <atomic>
#include <cstring>

static Hash128 HashOf(const void* bytes, size_t length) {
    Hash128 hash;
    SpookyHash::Hash128(bytes, length, &hash.halves[0], &hash.halves[1]);
    return hash;
}

RandSeedBlock MakeRandSeedBlock() {
    static constinit std::atomic<SInt32> salt{1};
    const char* version = ZarvoConfig::ZarvoVersionUnderHash;
    return {
        .time = GetCurrentTimeAsDateTime().ticks,
        .timerTicks = ZarvoClassic::Footing_Timer_GetHighPrecisionTimerTicks(),
        .versionHash = HashOf(version, strlen(version)).PackToUInt64(),
        .salt = ++salt, // one atomic step, so that no two threads get the same
        .processId = ZarvoClassic::Footing_Process_GetCurrentProcessId(),
    };
}

Hash128 HashOfSeedBlock(const RandSeedBlock& block) { return HashOf(&block, sizeof(block)); }
