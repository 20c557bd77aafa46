#include "Runtime/Threads/Thread.h"
#include "Runtime/Threads/ThreadHelper.h"

#include <cmath>
#include <gtest/gtest.h>

// Single precision rounds 2.99999999 up and has no odd numbers where the last row is.
TEST(ThreadHelper, SleepIsWholeSecondsAndWholeMicroseconds) {
    using Row = std::tuple<double, long, long>;
    for (const auto& [seconds, whole, nanoseconds] :
         {Row(0.01, 0, 10'000'000), Row(1.5, 1, 500'000'000), Row(4e-7, 0, 0), Row(1.9e-6, 0, 1'000),
          Row(-0.5, -1, 500'000'000), Row(-1.0, -1, 0), Row(-1.25, -2, 750'000'000), Row(2.99999999, 3, 0),
          Row(NAN, 0, 0), Row(16'777'217.0, 16'777'216, 1'000'000'000)}) {
        EXPECT_EQ(ThreadHelper::IntervalFromSeconds(seconds).tv_sec, whole) << seconds;
        EXPECT_EQ(ThreadHelper::IntervalFromSeconds(seconds).tv_nsec, nanoseconds) << seconds;
    }
    CurrentThread::SleepForSeconds(-3600.0); // an hour, were the sign lost
}
