#include "common/clock.h"

#include <QElapsedTimer>

#include <gtest/gtest.h>

#include <thread>

namespace {

TEST(Clock, ScaleZeroAdvancesTheClockWithoutWaiting)
{
    Clock::SetScale(0.0);
    QElapsedTimer real;
    real.start();
    Clock::Timer timer;
    for (int i = 0; i < 600; ++i)
        Clock::Sleep(1000);
    EXPECT_GE(timer.Elapsed(), 600000);
    EXPECT_LT(real.elapsed(), 5000);

    const qint64 before = timer.Elapsed();
    Clock::Sleep(0);
    Clock::Sleep(-50);
    EXPECT_LT(timer.Elapsed() - before, 1000);
}

TEST(Clock, SkippedTimeBelongsToTheSleepingThreadOnly)
{
    Clock::SetScale(0.0);
    const qint64 before = Clock::Now();
    std::thread([] { Clock::Sleep(10000000); }).join();
    EXPECT_LT(Clock::Now() - before, 1000000);
}

} // namespace
