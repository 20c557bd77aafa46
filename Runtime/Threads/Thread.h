// The current thread: its id, and sleeping. Any thread.
#pragma once

#include "Footing/Thread.h"
#include "Runtime/Core/Types.h"

namespace Thread {
extern UInt64 mainThreadId; // the id of the thread that ran the static initialisers; constant after them
}

namespace PlatformThread {
// The base library's id: never 0, and unique among live threads.
inline UInt64 GetCurrentThreadID() { return ZarvoClassic::Footing_Thread_GetCurrentThreadId(); }
} // namespace PlatformThread

namespace CurrentThread {
// See ThreadHelper::SleepInSeconds.
void SleepForSeconds(double seconds);
} // namespace CurrentThread
