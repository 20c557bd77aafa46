#include "Runtime/Threads/Thread.h"

#include "Runtime/Threads/ThreadHelper.h"

void CurrentThread::SleepForSeconds(double seconds) { ThreadHelper::SleepInSeconds(seconds); }
