// SPDX-License-Identifier: Apache-2.0
#include "util/cm_clock.h"

#include "tests/support/clock_moved_during_read.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

using namespace std::chrono_literals;

namespace {

/// Sleeps on `point` until the clock in force has reached `deadline`.
void SleepUntil(CCmWaitPoint& point, std::chrono::nanoseconds deadline) {
    CCmWaitPoint::Lock lock = point.Acquire();
    while (CmSteadyNow() < deadline)
        point.WaitUntil(lock, deadline);
}

/// Stands still at one second, and tells how often it was asked.
class ReadCountingClock final : public ICmClock {
public:
    std::chrono::nanoseconds SteadyNow() const override {
        m_reads.Add();
        return 1s;
    }
    std::chrono::nanoseconds WallNow() const override { return 1s; }
    bool RunsByItself() const override { return false; }

    mutable CTally m_reads;
};

} // namespace

TEST(CmCurrentClock, IsTheSystemsUntilAnotherOneIsPutInForce) {
    EXPECT_TRUE(CmCurrentClock().RunsByItself());
    CCmManualClock clock;
    EXPECT_EQ(CmReplaceClock(&clock), nullptr);
    EXPECT_EQ(&CmCurrentClock(), &clock);
    EXPECT_EQ(CmReplaceClock(nullptr), &clock);
    EXPECT_TRUE(CmCurrentClock().RunsByItself());
}

TEST(CmCurrentClock, OfTheSystemRunsOnAndNeverBack) {
    const std::chrono::nanoseconds start = CmSteadyNow();
    std::chrono::nanoseconds last = start;
    while (last == start) {
        const std::chrono::nanoseconds now = CmSteadyNow();
        ASSERT_GE(now, last);
        last = now;
    }
}

TEST(CmCurrentClock, OfTheSystemTellsTheWallTime) {
    const std::time_t before = std::time(nullptr);
    const std::int64_t seconds = CmWallSeconds();
    const std::time_t after = std::time(nullptr);
    // time() may read a coarser clock, which lags.
    EXPECT_GE(seconds, before);
    EXPECT_LE(seconds, after + 1);
}

TEST(CCmManualClock, StandsStillUntilItIsMoved) {
    CCmManualClock clock(5s, 70s);
    EXPECT_FALSE(clock.RunsByItself());
    EXPECT_EQ(clock.SteadyNow(), 5s);
    EXPECT_EQ(clock.WallNow(), 70s);
    clock.Advance(1500ms);
    EXPECT_EQ(clock.SteadyNow(), 6500ms);
    EXPECT_EQ(clock.WallNow(), 71500ms);
}

TEST(CCmManualClock, NeverGoesBack) {
    CCmManualClock clock(5s, 70s);
    clock.Advance(-1s);
    clock.Advance(0s);
    EXPECT_EQ(clock.SteadyNow(), 5s);
    EXPECT_EQ(clock.WallNow(), 70s);
}

TEST(CmWallSeconds, RoundsDownOnBothSidesOf1970) {
    CCmManualClock late(0s, 1999ms);
    CCmManualClock early(0s, -1ms);
    CmReplaceClock(&late);
    EXPECT_EQ(CmWallSeconds(), 1);
    CmReplaceClock(&early);
    EXPECT_EQ(CmWallSeconds(), -1);
    CmReplaceClock(nullptr);
}

TEST(ClockPolicies, CountTheMicrosecondsOfTheClockInForce) {
    CCmManualClock clock(7s + 1999ns);
    CmReplaceClock(&clock);
    EXPECT_EQ(timer_policy::now(), 7000001);
    EXPECT_EQ(tick_policy::now(), 7000001);
    EXPECT_EQ(low_tick_policy::now(), 7000001);
    clock.Advance(1ns);
    EXPECT_EQ(timer_policy::now(), 7000002);
    EXPECT_EQ(tick_policy::now(), 7000002);
    EXPECT_EQ(low_tick_policy::now(), 7000002);
    CmReplaceClock(nullptr);
}

TEST(ClockPolicies, EndWhereTheNanosecondsEnd) {
    const long long last = 9223372036854775;
    EXPECT_EQ(timer_policy::max_time_value(), last);
    EXPECT_EQ(tick_policy::max_time_value(), last);
    EXPECT_EQ(low_tick_policy::max_time_value(), last);
}

TEST(CCmWaitPoint, DoesNotSleepForATimeThatHasPassed) {
    const CManualClockScope clock;
    CCmWaitPoint point;
    CCmWaitPoint::Lock lock = point.Acquire();
    point.WaitUntil(lock, CmSteadyNow());
    point.WaitUntil(lock, CmSteadyNow() - 1s);
    EXPECT_TRUE(lock.owns_lock());
}

TEST(CCmWaitPoint, SleepsUntilTheSystemsClockHasReachedTheDeadline) {
    CCmWaitPoint point;
    const std::chrono::nanoseconds deadline = CmSteadyNow() + 2ms;
    SleepUntil(point, deadline);
    EXPECT_GE(CmSteadyNow(), deadline);
}

TEST(CCmWaitPoint, SleepsUntilTheManualClockHasReachedTheDeadline) {
    CManualClockScope clock;
    CCmWaitPoint point;
    const std::chrono::nanoseconds deadline = CmSteadyNow() + 10ms;
    CTally awake;
    std::thread sleeper([&] {
        SleepUntil(point, deadline);
        awake.Add();
    });
    clock->Advance(9ms);
    EXPECT_EQ(awake.Count(), 0);
    clock->Advance(1ms);
    EXPECT_TRUE(awake.Reaches(1));
    sleeper.join();
}

TEST(CCmWaitPoint, CanBeNotifiedLongBeforeTheFarthestDeadline) {
    CCmWaitPoint point;
    bool done = false;
    std::thread sleeper([&] {
        CCmWaitPoint::Lock lock = point.Acquire();
        while (!done)
            point.WaitUntil(lock, std::chrono::nanoseconds::max());
    });
    {
        const CCmWaitPoint::Lock lock = point.Acquire();
        done = true;
    }
    point.NotifyAll();
    sleeper.join();
}

TEST(CmReplaceClock, WakesSleepersToLookAtTheNewClock) {
    ReadCountingClock slow;
    CCmManualClock fast(10s);
    CmReplaceClock(&slow);
    CCmWaitPoint point;
    CTally awake;
    std::thread sleeper([&] {
        SleepUntil(point, 5s);
        awake.Add();
    });
    // It reads the clock twice on its way to sleep, and gives up the mutex only to sleep.
    ASSERT_TRUE(slow.m_reads.Reaches(2));
    { const CCmWaitPoint::Lock asleep = point.Acquire(); }
    EXPECT_EQ(CmReplaceClock(&fast), &slow);
    EXPECT_TRUE(awake.Reaches(1));
    sleeper.join();
    CmReplaceClock(nullptr);
}

TEST(CmWakeAllWaitPoints, ReachesEachWaitPointThatIsStillThere) {
    CManualClockScope clock;
    CCmWaitPoint first;
    auto between = std::make_unique<CCmWaitPoint>();
    CCmWaitPoint last;
    between.reset();
    const std::chrono::nanoseconds deadline = CmSteadyNow() + 1ms;
    CTally awake;
    std::thread one([&] {
        SleepUntil(first, deadline);
        awake.Add();
    });
    std::thread two([&] {
        SleepUntil(last, deadline);
        awake.Add();
    });
    clock->Advance(1ms);
    EXPECT_TRUE(awake.Reaches(2));
    one.join();
    two.join();
}

/// Two threads that take turns: a notice that one of them misses on its way to sleep leaves both asleep. One
/// in some fifty thousand would be missed if nobody counted them.
TEST(CCmWaitPoint, MissesNoNoticeOnTheWayToSleep) {
    const int turns = TestRounds(400'000);
    const std::chrono::nanoseconds enough = CmSteadyNow() + 3s; // on a machine that has other work
    CCmWaitPoint point;
    int turn = 0;
    std::atomic<bool> missed{false};
    const auto take = [&](int mine) {
        while (!missed) {
            const std::chrono::nanoseconds now = CmSteadyNow();
            const std::chrono::nanoseconds limit = now + 30s;
            CCmWaitPoint::Lock lock = point.Acquire();
            while (turn < turns && turn % 2 != mine && !missed) {
                point.WaitUntil(lock, limit);
                missed = missed || CmSteadyNow() >= limit;
            }
            if (turn >= turns)
                break;
            turn = now < enough ? turn + 1 : turns;
            lock.unlock();
            point.NotifyAll(); // from outside, when the other one may be anywhere
        }
        point.NotifyAll();
    };
    std::thread other([&] { take(1); });
    take(0);
    other.join();
    EXPECT_FALSE(missed) << "at turn " << turn;
}

TEST(CCmWaitPoint, MissesNoMoveOfTheClockOnTheWayToSleep) {
    CClockMovedDuringRead clock;
    CmReplaceClock(&clock);
    CCmWaitPoint point;
    const std::chrono::nanoseconds deadline = CmSteadyNow() + 10ms;
    clock.MoveDuring(2, 10ms); // the reading that WaitUntil falls asleep on
    CTally awake;
    std::thread sleeper([&] {
        SleepUntil(point, deadline);
        awake.Add();
    });
    EXPECT_TRUE(awake.Reaches(1));
    point.NotifyAll();
    sleeper.join();
    CmReplaceClock(nullptr);
}
