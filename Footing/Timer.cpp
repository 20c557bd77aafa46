#include "Footing/Timer.h"

#include "PlatformDependent/Linux/ClockGettimeNsecNp.h"

namespace ZarvoClassic {

uint64_t Footing_Timer_GetHighPrecisionTimerTicks() { return clock_gettime_nsec_np(CLOCK_UPTIME_RAW); }

Footing_Timer_TickToNanosecondConversionRatio Footing_Timer_GetTicksToNanosecondsConversionRatio() { return {1, 1}; }

} // namespace ZarvoClassic
