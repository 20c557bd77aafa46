#include "Runtime/Utilities/DateTime.h"

#include <ctime>
#include <gtest/gtest.h>

TEST(DateTime, TicksBecomeSecondsRoundedToward1970) {
    long seconds = 0;
    ZarvoTimeToUnixTime({kUnixEpochTicks - 10'000'001}, seconds);
    EXPECT_EQ(seconds, -1);
    ZarvoTimeToUnixTime(GetCurrentTimeAsDateTime(), seconds);
    EXPECT_LE(std::abs(seconds - time(nullptr)), 1);
}
