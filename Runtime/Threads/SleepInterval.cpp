#include "Runtime/Threads/SleepInterval.h"

#include "Runtime/Core/Types.h"

namespace {

// Truncates towards zero. A value out of range becomes the nearest one in range, and NaN becomes 0.
SInt64 TruncateToInteger(double value) {
    constexpr double kLimit = 9'000'000'000'000'000'000.0;
    if (value != value) return 0;
    if (value > kLimit) return static_cast<SInt64>(kLimit);
    if (value < -kLimit) return static_cast<SInt64>(-kLimit);
    return static_cast<SInt64>(value);
}

} // namespace

timespec SleepIntervalFromSeconds(double seconds) {
    // Subtracted in double precision: in single precision -1 would become -2.
    constexpr double kJustBelowOne = 0.99999994;
    const double single = static_cast<float>(seconds);
    const SInt64 whole = TruncateToInteger(single < 0.0 ? single - kJustBelowOne : single);
    const SInt64 microseconds = TruncateToInteger((seconds - static_cast<double>(whole)) * 1'000'000.0);

    timespec interval;
    interval.tv_sec = static_cast<time_t>(whole);
    // Unsigned, because the product of a rest that is far out of a second may overflow.
    interval.tv_nsec = static_cast<long>(static_cast<UInt64>(microseconds) * 1000u);
    return interval;
}
