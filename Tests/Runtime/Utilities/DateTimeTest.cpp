#include "Runtime/Utilities/DateTime.h"

#include <gtest/gtest.h>

TEST(DateTime, TicksBecomeSecondsRoundedToward1970) {
    long before = 7, after = 7;
    ZarvoTimeToUnixTime({kUnixEpochTicks - 10'000'001}, before);
    ZarvoTimeToUnixTime({kUnixEpochTicks + 9'999'999}, after);
    EXPECT_TRUE(before == -1 && after == 0);
}
