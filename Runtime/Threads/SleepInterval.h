// How long a sleep of so many seconds is; ThreadHelper sleeps it. Any thread.
#pragma once

#include <time.h>

// The whole seconds, rounded down in single precision, and the rest, cut to whole microseconds. From some minutes on,
// single precision rounds by more than a microsecond, and the rest can be below 0 or above a second.
timespec SleepIntervalFromSeconds(double seconds);
