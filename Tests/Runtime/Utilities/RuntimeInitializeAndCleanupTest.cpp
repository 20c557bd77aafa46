#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"

#include "Runtime/Math/Random/Rand.h"
#include "Runtime/RuntimeStatics.h"
#include "Runtime/Threads/Thread.h"
#include "Runtime/Utilities/LogAssert.h"

#include <functional>
#include <gtest/gtest.h>
#include <optional>
#include <string>

using Registration = RegisterRuntimeInitializeAndCleanup;

// What a program's static objects find before main. Were the log's lock not constructed, this would wait for ever.
static const UInt64 kSeenThread = [] {
    CleanLogHandler(kLogTypeLog, "%s", "");
    return Thread::mainThreadId;
}();

// Counts on there being no registrations but the runtime's own.
class RuntimeRegistry : public testing::Test {
protected:
    ~RuntimeRegistry() override { Registration::ExecuteCleanup(); }

    static void Init(void* name) { s_Calls += std::string("+") + static_cast<char*>(name); }
    static void Cleanup(void* name) { s_Calls += std::string("-") + static_cast<char*>(name); }

    // The callbacks that were called, in their order: + for init, - for clean-up.
    static std::string CallsOf(void (*execute)()) {
        s_Calls.clear();
        execute();
        return s_Calls;
    }

    char m_A[2] = "a", m_B[2] = "b", m_C[2] = "c";

private:
    static inline std::string s_Calls;
};

TEST_F(RuntimeRegistry, RunsByOrderAndCleansUpInReverse) {
    const Registration a(Init, Cleanup, 5, m_A), b(Init, Cleanup, -1, m_B);
    EXPECT_EQ("+b+a", CallsOf(Registration::ExecuteInitializations));
    EXPECT_EQ("-a-b", CallsOf(Registration::ExecuteCleanup));
}

TEST_F(RuntimeRegistry, EqualOrdersRunByAddress) {
    std::optional<Registration> inAddressOrder[2];
    inAddressOrder[1].emplace(Init, Cleanup, 5, m_B); // registered first
    inAddressOrder[0].emplace(Init, Cleanup, 5, m_A);
    EXPECT_EQ("+a+b", CallsOf(Registration::ExecuteInitializations));
    EXPECT_EQ("-b-a", CallsOf(Registration::ExecuteCleanup));
}

TEST_F(RuntimeRegistry, CleansUpOnlyWhatHasBeenInitialized) {
    const Registration a(Init, Cleanup, 0, m_A);
    EXPECT_EQ("", CallsOf(Registration::ExecuteCleanup));
}

TEST_F(RuntimeRegistry, SecondExecutionDoesNothing) {
    const Registration a(Init, Cleanup, 0, m_A);
    EXPECT_EQ("+a", CallsOf(Registration::ExecuteInitializations));
    EXPECT_EQ("", CallsOf(Registration::ExecuteInitializations));
    EXPECT_EQ("-a", CallsOf(Registration::ExecuteCleanup));
    EXPECT_EQ("", CallsOf(Registration::ExecuteCleanup));
}

TEST_F(RuntimeRegistry, EitherCallbackMayBeMissing) {
    const Registration a(nullptr, Cleanup, 1, m_A), b(Init, nullptr, 2, m_B);
    EXPECT_EQ("+b", CallsOf(Registration::ExecuteInitializations));
    EXPECT_EQ("-a", CallsOf(Registration::ExecuteCleanup));
}

TEST_F(RuntimeRegistry, ForgetsWhatIsDestroyed) {
    struct Case {
        size_t destroyed; // in the order of registration
        const char* calls;
    };
    for (const Case& row : {Case{.destroyed = 0, .calls = "+b+c"}, Case{.destroyed = 1, .calls = "+a+c"},
                            Case{.destroyed = 2, .calls = "+a+b"}}) {
        std::optional<Registration> all[3];
        all[0].emplace(Init, nullptr, 1, m_A);
        all[1].emplace(Init, nullptr, 2, m_B);
        all[2].emplace(Init, nullptr, 3, m_C);
        all[row.destroyed].reset();
        EXPECT_EQ(row.calls, CallsOf(Registration::ExecuteInitializations));
    }
}

TEST_F(RuntimeRegistry, ScriptingGeneratorLivesBetweenTheExecutions) {
    EXPECT_EQ(nullptr, gScriptingRand);
    Registration::ExecuteInitializations();
    ASSERT_NE(nullptr, gScriptingRand); // registered, though no program names it
    EXPECT_FALSE(*gScriptingRand == Rand());
    Registration::ExecuteCleanup();
    EXPECT_EQ(nullptr, gScriptingRand);
}

TEST(RuntimeStatics, MainThreadIsKnownBeforeMain) { EXPECT_EQ(PlatformThread::GetCurrentThreadID(), kSeenThread); }

TEST(RuntimeStatics, GeneratorIsRegisteredWithOrderZero) {
    const Registration before(nullptr, nullptr, -1), after(nullptr, nullptr, 1);
    const Registration beside(nullptr, nullptr, 0);
    EXPECT_TRUE(Registration::Sort(&before, &gScriptingRandInitAndCleanup));
    EXPECT_TRUE(Registration::Sort(&gScriptingRandInitAndCleanup, &after));
    // The address decides between equal orders.
    EXPECT_EQ(std::less<const Registration*>()(&beside, &gScriptingRandInitAndCleanup),
              Registration::Sort(&beside, &gScriptingRandInitAndCleanup));
}

TEST(RuntimeStatics, RelaunchArgumentsHaveTheLabelOfFileLists) {
    EXPECT_EQ(kMemLabelFileList, relaunchArguments.get_memory_label().identifier);
}
