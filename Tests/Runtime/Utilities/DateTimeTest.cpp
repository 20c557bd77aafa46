#include "Runtime/Utilities/DateTime.h"

#include <ctime>
#include <gtest/gtest.h>
#include <limits>

constexpr SInt64 kEpoch = 621'355'968'000'000'000, kGreatest = std::numeric_limits<SInt64>::max();

// The difference of the least tick count and the epoch does not fit in 64 bits; a file system may say the greatest
// number of seconds.
TEST(DateTime, TicksBecomeSecondsRoundedToward1970AndSecondsTicks) {
    using Row = std::pair<SInt64, long>;
    long seconds = 0;
    for (const auto& [ticks, expected] :
         {Row(0, -62'135'596'800), Row(1, -62'135'596'799), Row(-1, -62'135'596'800), Row(kEpoch, 0),
          Row(kEpoch - 1, 0), Row(kEpoch - 10'000'001, -1), Row(kEpoch + 9'999'999, 0), Row(kEpoch + 10'000'000, 1),
          Row(kGreatest, 860'201'606'885), Row(~kGreatest, -984'472'800'485)}) {
        ZarvoTimeToUnixTime({ticks}, seconds);
        EXPECT_EQ(seconds, expected) << ticks;
    }
    DateTime time;
    UnixTimeToZarvoTime(kGreatest, time);
    EXPECT_EQ(time.ticks, kEpoch - 10'000'000);

    const time_t before = ::time(nullptr) - 1; // time() may lag by a clock tick
    ZarvoTimeToUnixTime(GetCurrentTimeAsDateTime(), seconds);
    EXPECT_TRUE(before <= seconds && seconds <= ::time(nullptr) + 1) << before << ", " << seconds;
}
