// How a run tells its caller how far it has come, and is stopped by it. One thread.
#pragma once

#include "Library/include/zarvo.h"
#include "Runtime/Core/Types.h"

#include <chrono>

constexpr auto kProgressInterval = std::chrono::milliseconds(100);

// Says when the interval is over again.
class ProgressClock {
public:
    using Clock = std::chrono::steady_clock;

    // first: when the first interval begins.
    explicit ProgressClock(Clock::time_point first, std::chrono::milliseconds interval = kProgressInterval)
        : m_Last(first), m_Interval(interval) {}

    [[nodiscard]] bool IsDue() {
        const Clock::time_point now = Clock::now();
        if (now - m_Last < m_Interval) return false;
        m_Last = now;
        return true;
    }

private:
    Clock::time_point m_Last;
    std::chrono::milliseconds m_Interval;
};

// As zarvo_progress.
struct Progress {
    UInt64 bytes = 0;
    UInt64 bytesTotal = 0;
    UInt64 files = 0;
    UInt64 filesTotal = 0;
};

// False: the run is to be stopped.
[[nodiscard]] inline bool TellProgress(const zarvo_run_options& options, const Progress& now) {
    const zarvo_progress progress = {sizeof(progress), now.bytes, now.bytesTotal, now.files, now.filesTotal};
    return options.progress == nullptr || options.progress(options.context, &progress) == 0;
}
