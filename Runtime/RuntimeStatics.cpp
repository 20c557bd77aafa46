// Every static object of the runtime whose order matters, in its order. They come before the static objects of a
// program, which may log, lock and register; the order within this file is that of the lines.
//
// A program takes this object from the library with the first symbol that it needs of it: g_LogHandlerListMutex for
// whoever logs, s_LastRegistered for whoever registers or runs the callbacks. So the scripting generator's
// registration, which nobody names, is there wherever it can be run.
#include "Runtime/RuntimeStatics.h"

#include "Footing/Timer.h"
#include "PlatformDependent/Linux/ClockGettimeNsecNp.h"
#include "Runtime/Math/Random/Rand.h"
#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/LogHooks.h"

// The first that is not the compiler's own.
constexpr int kBeforeAllOthers = 101;

using namespace ZarvoClassic;

constinit UInt64 Thread::mainThreadId = 0;
constinit uint64_t ZarvoClassic::nsSinceBootAtStartup = 0;
constinit Footing_Timer_TickToNanosecondConversionRatio ZarvoClassic::s_conversionRatio = {};
constinit double ZarvoClassic::Footing_Timer_TickToNanosecondsConversionFactor = 0;
constinit RegisterRuntimeInitializeAndCleanup* RegisterRuntimeInitializeAndCleanup::s_LastRegistered = nullptr;

namespace {

// Only objects of a class can be given a place in the order; plain values are set by one that runs a function.
struct RunAtStartUp {
    explicit RunAtStartUp(void (*step)()) { step(); }
};

[[gnu::init_priority(kBeforeAllOthers)]] const RunAtStartUp kSetMainThread([] {
    Thread::mainThreadId = PlatformThread::GetCurrentThreadID();
});

} // namespace

[[gnu::init_priority(kBeforeAllOthers)]] dynamic_array<core::string> relaunchArguments(kMemLabelFileList);

[[gnu::init_priority(kBeforeAllOthers)]] Mutex g_LogHandlerListMutex;

[[gnu::init_priority(kBeforeAllOthers)]] RegisterRuntimeInitializeAndCleanup
    gScriptingRandInitAndCleanup(InitScriptingRand, CleanupScriptingRand);

namespace {

[[gnu::init_priority(kBeforeAllOthers)]] const RunAtStartUp kSetStartTime([] {
    nsSinceBootAtStartup = clock_gettime_nsec_np(CLOCK_MONOTONIC_RAW);
});

[[gnu::init_priority(kBeforeAllOthers)]] const RunAtStartUp kSetConversion([] {
    s_conversionRatio = Footing_Timer_GetTicksToNanosecondsConversionRatio();
    Footing_Timer_TickToNanosecondsConversionFactor =
        static_cast<double>(s_conversionRatio.ticksToNanosecondsNumerator) /
        static_cast<double>(s_conversionRatio.ticksToNanosecondsDenominator);
});

} // namespace
