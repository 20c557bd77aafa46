// A point in time: 100-nanosecond ticks since 0001-01-01 00:00:00. The default, 0, means "not known".
#pragma once

#include "Runtime/Core/Types.h"

struct DateTime {
    SInt64 ticks = 0;

    friend constexpr bool operator==(const DateTime&, const DateTime&) = default;
};

constexpr SInt64 kTicksPerSecond = 10'000'000;
constexpr SInt64 kTicksPerMicrosecond = 10;
constexpr SInt64 kUnixEpochTicks = 621'355'968'000'000'000; // 1970-01-01 00:00:00
static_assert(kUnixEpochTicks == 0x089F7FF5F7B58000);

// The time of day (gettimeofday), to the microsecond.
DateTime GetCurrentTimeAsDateTime();

// Seconds since the Unix epoch to ticks; a result out of range wraps.
void UnixTimeToZarvoTime(long seconds, DateTime& time);

// Ticks to seconds since the Unix epoch, rounded toward 1970.
void ZarvoTimeToUnixTime(const DateTime& time, long& seconds);
