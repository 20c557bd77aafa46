// The static objects of the runtime whose order matters. They are constructed in the order of the lines, before the
// static objects of any program, which may log, lock and register.
//
// A linker takes this file from the library when a program needs any of its symbols: g_LogHandlerListMutex for logging,
// s_LastRegistered for registering and running callbacks. So every program that can run the scripting generator's
// registration has it, although no program names it.
#include "Runtime/RuntimeStatics.h"

#include "Footing/Timer.h"
#include "PlatformDependent/Linux/ClockGettimeNsecNp.h"
#include "Runtime/Math/Random/Rand.h"
#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/LogHooks.h"

// The highest priority that is not reserved for the implementation.
constexpr int kBeforeAllOthers = 101;

using namespace ZarvoClassic;

constinit UInt64 Thread::mainThreadId = 0;
constinit uint64_t ZarvoClassic::nsSinceBootAtStartup = 0;
constinit Footing_Timer_TickToNanosecondConversionRatio ZarvoClassic::s_conversionRatio = {};
constinit double ZarvoClassic::Footing_Timer_TickToNanosecondsConversionFactor = 0;
constinit RegisterRuntimeInitializeAndCleanup* RegisterRuntimeInitializeAndCleanup::s_LastRegistered = nullptr;

namespace {

// A step between the objects. Only an object of a class has a place in the order, so plain values are set by its
// constructor.
struct StartUpStep {
    explicit StartUpStep(void (*run)()) { run(); }
};

[[gnu::init_priority(kBeforeAllOthers)]] const StartUpStep kMainThreadStep([] {
    Thread::mainThreadId = PlatformThread::GetCurrentThreadID();
});

} // namespace

[[gnu::init_priority(kBeforeAllOthers)]] dynamic_array<core::string> relaunchArguments(kMemLabelFileList);

[[gnu::init_priority(kBeforeAllOthers)]] Mutex g_LogHandlerListMutex;

[[gnu::init_priority(kBeforeAllOthers)]] RegisterRuntimeInitializeAndCleanup
    gScriptingRandInitAndCleanup(InitScriptingRand, CleanupScriptingRand);

namespace {

[[gnu::init_priority(kBeforeAllOthers)]] const StartUpStep kStartTimeStep([] {
    nsSinceBootAtStartup = clock_gettime_nsec_np(CLOCK_MONOTONIC_RAW);
});

[[gnu::init_priority(kBeforeAllOthers)]] const StartUpStep kConversionStep([] {
    s_conversionRatio = Footing_Timer_GetTicksToNanosecondsConversionRatio();
    Footing_Timer_TickToNanosecondsConversionFactor =
        static_cast<double>(s_conversionRatio.ticksToNanosecondsNumerator) /
        static_cast<double>(s_conversionRatio.ticksToNanosecondsDenominator);
});

} // namespace
