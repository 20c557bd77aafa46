#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

#include "Footing/Timer.h"
#include "Runtime/Math/Random/Rand.h"
#include "Runtime/RuntimeStatics.h"
#include "Runtime/Threads/Thread.h"

#include <gtest/gtest.h>
#include <optional>
#include <string>

using Registration = RegisterRuntimeInitializeAndCleanup;

static std::string gCalls;

static void Init(void* userData) { gCalls += std::string("+") + static_cast<char*>(userData); }
static void Cleanup(void* userData) { gCalls += std::string("-") + static_cast<char*>(userData); }

static std::string Started() { return gCalls.clear(), Registration::ExecuteInitializations(), gCalls; }
static std::string CleanedUp() { return gCalls.clear(), Registration::ExecuteCleanup(), gCalls; }

TEST(RuntimeRegistry, RunsByOrderThenAddressAndCleansUpInReverse) {
    char names[5][2] = {"a", "b", "c", "d", "e"};
    const SInt32 orders[] = {5, 5, -1, 6, 7};
    std::optional<Registration> all[5]; // whose addresses ascend
    for (int i = 0; i < 5; ++i)
        all[i].emplace(i == 3 ? nullptr : Init, i == 4 ? nullptr : Cleanup, orders[i], names[i]);
    EXPECT_EQ(CleanedUp(), ""); // nothing has been started
    EXPECT_EQ(Started(), "+c+a+b+e");
    EXPECT_TRUE(gScriptingRand != nullptr && *gScriptingRand != Rand()); // registered though no program names it
    all[2].reset();                                                      // from the middle of the list
    all[2].emplace(Init, Cleanup, 0, names[2]);
    EXPECT_EQ(Started(), "+c");
    EXPECT_EQ(CleanedUp(), "-d-b-a-c");
    EXPECT_EQ(CleanedUp(), "");
    all[2].reset(); // the newest
    all[0].reset(); // the oldest
    EXPECT_EQ(Started(), "+b+e");
    EXPECT_EQ(CleanedUp(), "-d-b");
    EXPECT_EQ(gScriptingRand, nullptr);
}

// What a program's static objects find when they are constructed, before main and in any file.
static const struct SeenBeforeMain {
    UInt64 mainThreadId = Thread::mainThreadId;
    UInt64 startTime = ZarvoClassic::nsSinceBootAtStartup;
    double conversion = ZarvoClassic::Footing_Timer_TickToNanosecondsConversionFactor;
    int logged = (CleanLogHandler(kLogTypeLog, "%s", ""), 1); // waits for ever on a lock that is not constructed
} kSeenBeforeMain;

TEST(RuntimeStatics, ExistBeforeTheStaticObjectsOfAProgram) {
    EXPECT_EQ(kSeenBeforeMain.mainThreadId, PlatformThread::GetCurrentThreadID());
    EXPECT_LE(kSeenBeforeMain.startTime - 1, ZarvoClassic::Footing_Timer_GetHighPrecisionTimerTicks()); // nor 0
    EXPECT_EQ(kSeenBeforeMain.conversion, 1.0);
    EXPECT_EQ(relaunchArguments.get_memory_label(), MemLabelId(kMemLabelFileList));
}
