// clock_gettime_nsec_np, as other systems name it: a clock's time in nanoseconds, or 0 if the system lacks the clock.
#pragma once

#include <cstdint>
#include <time.h>

// The clock that is not adjusted and stands still while the machine sleeps; this system has it under another name.
constexpr clockid_t CLOCK_UPTIME_RAW = CLOCK_MONOTONIC_RAW;

inline uint64_t clock_gettime_nsec_np(clockid_t clock) {
    timespec now;
    if (clock_gettime(clock, &now) != 0) return 0;
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000u + static_cast<uint64_t>(now.tv_nsec);
}
