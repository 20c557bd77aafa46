// Sleeping. Any thread.
#pragma once

namespace ThreadHelper {

// Sleeps, in steps of a microsecond. A signal ends the sleep early. A negative time is not slept, and neither is one
// whose rest rounding moves out of a second (see SleepInterval.h).
void SleepInSeconds(double seconds);

} // namespace ThreadHelper
