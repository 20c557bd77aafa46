// Threads as the runtime sees them: who is running, and sleeping. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

namespace Thread {
extern UInt64 mainThreadId; // of the thread that ran the static initialisers; constant from then on
}

namespace PlatformThread {
// Never 0, and no other live thread's.
UInt64 GetCurrentThreadID();
} // namespace PlatformThread

namespace CurrentThread {
// See ThreadHelper::SleepInSeconds.
void SleepForSeconds(double seconds);
} // namespace CurrentThread
