#include "Runtime/Utilities/DateTime.h"

#include <sys/time.h>

namespace {

// Unsigned, so that times out of range wrap: some file systems store any 64-bit number as a time.
DateTime FromUnixTime(SInt64 seconds, SInt64 microseconds) {
    return {static_cast<SInt64>(static_cast<UInt64>(seconds) * UInt64{kTicksPerSecond} +
                                static_cast<UInt64>(microseconds) * UInt64{kTicksPerMicrosecond} +
                                UInt64{kUnixEpochTicks})};
}

} // namespace

DateTime GetCurrentTimeAsDateTime() {
    timeval now;
    gettimeofday(&now, nullptr);
    return FromUnixTime(now.tv_sec, now.tv_usec);
}

void UnixTimeToZarvoTime(long seconds, DateTime& time) { time = FromUnixTime(seconds, 0); }

void ZarvoTimeToUnixTime(const DateTime& time, long& seconds) {
    static_assert(kUnixEpochTicks % kTicksPerSecond == 0);
    // Divided first, so that no difference can overflow. Division truncates towards year 1; before 1970 a remainder has
    // to be rounded up, towards 1970.
    seconds = static_cast<long>(time.ticks / kTicksPerSecond - kUnixEpochTicks / kTicksPerSecond);
    if (seconds < 0 && time.ticks % kTicksPerSecond > 0) ++seconds;
}
