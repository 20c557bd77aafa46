#include "Runtime/Utilities/DateTime.h"

#include <gtest/gtest.h>

TEST(DateTime, TicksBecomeSecondsRoundedToward1970) {
    struct Case {
        SInt64 ticksAfter1970;
        long seconds;
    };
    constexpr Case kCases[] = {
        {.ticksAfter1970 = -10'000'001, .seconds = -1},
        {.ticksAfter1970 = -9'999'999, .seconds = 0},
        {.ticksAfter1970 = 9'999'999, .seconds = 0},
        {.ticksAfter1970 = 10'000'000, .seconds = 1},
    };
    for (const Case& row : kCases) {
        long seconds = 7;
        ZarvoTimeToUnixTime({kUnixEpochTicks + row.ticksAfter1970}, seconds);
        EXPECT_EQ(row.seconds, seconds) << row.ticksAfter1970;
    }
}
