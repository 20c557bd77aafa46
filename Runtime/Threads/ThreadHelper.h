// Sleeping. Any thread.
#pragma once

#include <time.h>

namespace ThreadHelper {

// The interval that SleepInSeconds sleeps: whole seconds as single precision sees them, and the rest cut to whole
// microseconds. Where single precision rounds by more than a microsecond (from some minutes on) the rest can fall
// outside of [0, 1) second.
timespec IntervalFromSeconds(double seconds);

// Sleeps for IntervalFromSeconds(seconds). A signal ends the sleep early; an interval that is negative, or whose rest
// lies outside of a second, is not slept at all.
void SleepInSeconds(double seconds);

} // namespace ThreadHelper
