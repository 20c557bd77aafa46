#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

#include "Runtime/Math/Random/Rand.h"
#include "Runtime/RuntimeStatics.h"
#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/LogAssert.h"

#include <functional>
#include <gtest/gtest.h>
#include <optional>

using Registration = RegisterRuntimeInitializeAndCleanup;

static std::string gCalls;
static void Init(void* userData) { (gCalls += '+') += static_cast<char*>(userData); }
static void Cleanup(void* userData) { (gCalls += '-') += static_cast<char*>(userData); }

// What a program's static objects find before main. Were the log's lock not constructed, this would wait for ever.
static const UInt64 kSeenThread = (CleanLogHandler(kLogTypeLog, "%s", ""), Thread::mainThreadId);

TEST(RuntimeRegistry, RunsByOrderThenAddressAndCleansUpInReverse) {
    const auto callsOf = [](void (*execute)()) { return gCalls.clear(), execute(), gCalls; };
    char names[5][2] = {"a", "b", "c", "d", "e"};
    const SInt32 orders[] = {5, 5, -1, 6, 7};
    std::optional<Registration> all[5]; // whose addresses ascend
    for (int i = 0; i < 5; ++i)
        all[i].emplace(i == 3 ? nullptr : Init, i == 4 ? nullptr : Cleanup, orders[i], names[i]);
    EXPECT_EQ(callsOf(Registration::ExecuteCleanup), ""); // nothing has been started
    EXPECT_EQ(callsOf(Registration::ExecuteInitializations), "+c+a+b+e");
    EXPECT_TRUE(gScriptingRand != nullptr && *gScriptingRand != Rand());        // registered though no program names it
    all[2].reset(), all[1].reset(), all[2].emplace(Init, Cleanup, 0, names[2]); // from the middle of the list
    EXPECT_EQ(callsOf(Registration::ExecuteInitializations), "+c");
    EXPECT_TRUE(callsOf(Registration::ExecuteCleanup) == "-d-a-c" && gScriptingRand == nullptr);
    all[2].reset(), all[0].reset(); // the newest, the oldest
    EXPECT_EQ(callsOf(Registration::ExecuteInitializations), "+e");
    EXPECT_EQ(kSeenThread, PlatformThread::GetCurrentThreadID());
}

TEST(RuntimeStatics, GeneratorIsRegisteredWithOrderZero) {
    const Registration before(nullptr, nullptr, -1), beside(nullptr, nullptr, 0), after(nullptr, nullptr, 1);
    EXPECT_TRUE(Registration::Sort(&before, &gScriptingRandInitAndCleanup));
    EXPECT_TRUE(Registration::Sort(&gScriptingRandInitAndCleanup, &after));
    // Between equal orders the address decides.
    EXPECT_EQ(std::less<const Registration*>()(&beside, &gScriptingRandInitAndCleanup),
              Registration::Sort(&beside, &gScriptingRandInitAndCleanup));
}

TEST(RuntimeStatics, RelaunchArgumentsHaveTheLabelOfFileLists) {
    EXPECT_EQ(kMemLabelFileList, relaunchArguments.get_memory_label().identifier);
}
