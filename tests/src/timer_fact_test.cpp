// SPDX-License-Identifier: Apache-2.0
#include "src/timer_fact.h"

#include "tests/support/threads.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>

#include <chrono>
#include <limits>

// Elapsed times, over the clock policies and over a clock that starts again early.

namespace {

using namespace std::chrono_literals;

/// A clock that is set by hand and starts again after 9 999 999 microseconds, unless told otherwise.
struct SmallClock {
    static long long now() { return s_now; }
    static long long max_time_value() { return s_max; }

    static inline long long s_now = 0;
    static inline long long s_max = 0;
};

constexpr long long LOWEST = std::numeric_limits<long long>::min();
constexpr long long HIGHEST = std::numeric_limits<long long>::max();

class TimerFact : public testing::Test {
protected:
    void SetUp() override { SetClock(0, 9'999'999); }

    static void SetClock(long long now, long long max) {
        SmallClock::s_now = now;
        SmallClock::s_max = max;
    }
};

template <class Policy>
class TimerFactOverPolicy : public testing::Test {};

using Policies = testing::Types<timer_policy, tick_policy, low_tick_policy>;
TYPED_TEST_SUITE(TimerFactOverPolicy, Policies);

} // namespace

TYPED_TEST(TimerFactOverPolicy, StartsNowForATagOfMinusOne) {
    CManualClockScope clock;
    timer_fact<TypeParam> timer(-1);
    EXPECT_EQ(timer.latest_tag(), TypeParam::now());
    EXPECT_EQ(timer.elapsed(), 0);
    clock->Advance(2'345'678us);
    EXPECT_EQ(timer.elapsed(), 2'345'678);
    timer.reset(-1);
    EXPECT_EQ(timer.latest_tag(), TypeParam::now());
    EXPECT_EQ(timer.elapsed(), 0);
}

TYPED_TEST(TimerFactOverPolicy, GivesTheClocksOwnValueForATagOfZero) {
    const CManualClockScope clock;
    const timer_fact<TypeParam> timer(0);
    EXPECT_EQ(timer.latest_tag(), 0);
    EXPECT_EQ(timer.elapsed(), TypeParam::now());
    EXPECT_EQ(timer.elapsed(), 3'600'000'000);
    EXPECT_EQ(timer.elapsed_mills(), 3'600'000);
    EXPECT_EQ(timer.elapsed_sec(), 3'600);
    EXPECT_EQ(timer_fact<TypeParam>::now(), TypeParam::now());
}

TYPED_TEST(TimerFactOverPolicy, WrapsAtTheEndOfTheClock) {
    const CManualClockScope clock;
    const long long max = TypeParam::max_time_value();
    const timer_fact<TypeParam> timer(max - 5);
    EXPECT_EQ(timer.elapsed(), TypeParam::now() + 5);
}

TEST_F(TimerFact, KeepsAnyOtherTag) {
    timer_fact<SmallClock> timer(17);
    EXPECT_EQ(timer.latest_tag(), 17);
    timer.reset(-2);
    EXPECT_EQ(timer.latest_tag(), -2);
    EXPECT_EQ(timer.elapsed(), 2);
}

TEST_F(TimerFact, IsOverTimeFromTheLimitOn) {
    const timer_fact<SmallClock> timer(0);
    SetClock(2'999'999, 9'999'999);
    EXPECT_TRUE(timer.overtime(2'999'999));
    EXPECT_FALSE(timer.overtime(3'000'000));
    EXPECT_TRUE(timer.overtime_mills(2'999));
    EXPECT_FALSE(timer.overtime_mills(3'000));
    EXPECT_TRUE(timer.overtime_sec(2));
    EXPECT_FALSE(timer.overtime_sec(3));
}

TEST_F(TimerFact, IsOverALimitOfNothingAtOnceAndAfterAWrap) {
    timer_fact<SmallClock> timer(0);
    for (const long long tag : {0LL, 5LL, 7'500'000LL}) {
        timer.reset(tag);
        EXPECT_TRUE(timer.overtime(0)) << tag;
        EXPECT_TRUE(timer.overtime_mills(0)) << tag;
        EXPECT_TRUE(timer.overtime_mills(-1)) << tag;
        EXPECT_TRUE(timer.overtime_sec(0)) << tag;
    }
}

TEST_F(TimerFact, CutsTagAndClockBeforeItSubtracts) {
    const timer_fact<SmallClock> timer(1'999'999);
    SetClock(2'000'000, 9'999'999);
    EXPECT_EQ(timer.elapsed(), 1);
    EXPECT_EQ(timer.elapsed_mills(), 1);
    EXPECT_EQ(timer.elapsed_sec(), 1);
}

TEST_F(TimerFact, AddsWhatWasLeftOfAClockThatStartedAgain) {
    const timer_fact<SmallClock> timer(7'500'000);
    SetClock(1'200'000, 9'999'999);
    EXPECT_EQ(timer.elapsed(), 1'200'000 + 2'499'999);
    EXPECT_EQ(timer.elapsed_mills(), 1'200 + 2'499);
    EXPECT_EQ(timer.elapsed_sec(), 1 + 2);
}

TEST_F(TimerFact, DoesNotWrapFromTheClocksLastValue) {
    const timer_fact<SmallClock> timer(9'999'999);
    SetClock(4, 9'999'999);
    EXPECT_EQ(timer.elapsed(), 4 - 9'999'999);
    EXPECT_EQ(timer.elapsed_mills(), 0 - 9'999);
    EXPECT_EQ(timer.elapsed_sec(), 0 - 9);
}

TEST_F(TimerFact, DoesNotWrapWhenLessThanAUnitWasLeft) {
    const timer_fact<SmallClock> timer(9'999'100);
    SetClock(4'000, 9'999'999);
    EXPECT_EQ(timer.elapsed(), 4'000 + 899);
    EXPECT_EQ(timer.elapsed_mills(), 4 - 9'999);
    EXPECT_EQ(timer.elapsed_sec(), 0 - 9);
}

TEST_F(TimerFact, SeesNoWrapWithinAUnit) {
    const timer_fact<SmallClock> timer(5'000'900);
    SetClock(5'000'100, 9'999'999);
    EXPECT_EQ(timer.elapsed(), 5'000'100 + 4'999'099);
    EXPECT_EQ(timer.elapsed_mills(), 0);
    EXPECT_EQ(timer.elapsed_sec(), 0);
}

TEST_F(TimerFact, GoesRoundTheEndsOfItsRange) {
    timer_fact<SmallClock> timer(LOWEST);
    SetClock(HIGHEST, HIGHEST);
    EXPECT_EQ(timer.elapsed(), -1);
    EXPECT_EQ(timer.elapsed_mills(), HIGHEST / 1000 - LOWEST / 1000);
    timer.reset(HIGHEST);
    SetClock(LOWEST, LOWEST + 1);
    EXPECT_EQ(timer.elapsed(), LOWEST + 2);
    EXPECT_EQ(timer.elapsed_mills(), LOWEST / 1000 - HIGHEST / 1000);
    SetClock(LOWEST, HIGHEST);
    EXPECT_EQ(timer.elapsed(), 1);
}
