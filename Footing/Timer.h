// The high-precision timer: ticks of the raw uptime clock. Any thread.
#pragma once

#include <cstdint>

namespace ZarvoClassic {

// Nanoseconds = ticks * numerator / denominator.
struct Footing_Timer_TickToNanosecondConversionRatio {
    uint64_t ticksToNanosecondsNumerator;
    uint64_t ticksToNanosecondsDenominator;
};

// Never goes back; stands still while the machine sleeps.
uint64_t Footing_Timer_GetHighPrecisionTimerTicks();

Footing_Timer_TickToNanosecondConversionRatio Footing_Timer_GetTicksToNanosecondsConversionRatio();

// Set by the runtime's static initialisers, and constant after them.
extern uint64_t nsSinceBootAtStartup; // the raw monotonic clock; time since start-up counts from it
extern Footing_Timer_TickToNanosecondConversionRatio s_conversionRatio;
extern double Footing_Timer_TickToNanosecondsConversionFactor; // the ratio's quotient

} // namespace ZarvoClassic
