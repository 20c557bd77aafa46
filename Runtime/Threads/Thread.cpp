#include "Runtime/Threads/Thread.h"

#include "Runtime/Threads/ThreadHelper.h"

#include <pthread.h>

UInt64 PlatformThread::GetCurrentThreadID() { return static_cast<UInt64>(pthread_self()); }

void CurrentThread::SleepForSeconds(double seconds) { ThreadHelper::SleepInSeconds(seconds); }
