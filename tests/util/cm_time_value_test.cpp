// SPDX-License-Identifier: Apache-2.0
#include "util/cm_time_value.h"

#include <gtest/gtest.h>

#include <limits>

using namespace std::chrono_literals;

namespace {

constexpr long LONGEST = std::numeric_limits<long>::max();
constexpr long SHORTEST = std::numeric_limits<long>::min();

struct Case {
    long seconds;
    long microseconds;
    long normalSeconds;
    long normalMicroseconds;
};

} // namespace

TEST(CCmTimeValue, IsZeroAtFirst) {
    const CCmTimeValue zero;
    EXPECT_EQ(zero.GetSec(), 0);
    EXPECT_EQ(zero.GetUsec(), 0);
    EXPECT_EQ(zero.ToDuration(), 0ns);
}

TEST(CCmTimeValue, GivesBothPartsOneSignAndLessThanASecondOfMicroseconds) {
    constexpr Case CASES[] = {
        {2, 0, 2, 0},
        {0, 999999, 0, 999999},
        {0, 1000000, 1, 0},
        {1, 2500000, 3, 500000},
        {3, -1, 2, 999999},
        {-3, 1, -2, -999999},
        {1, -1000001, 0, -1},
        {-1, 1000001, 0, 1},
        {0, -2500000, -2, -500000},
        {-1, -999999, -1, -999999},
        {LONGEST, 999999, LONGEST, 999999},
        {SHORTEST, 1, SHORTEST + 1, -999999},
    };
    for (const Case& c : CASES) {
        SCOPED_TRACE(testing::Message() << c.seconds << " s and " << c.microseconds << " us");
        const CCmTimeValue value(c.seconds, c.microseconds);
        EXPECT_EQ(value.GetSec(), c.normalSeconds);
        EXPECT_EQ(value.GetUsec(), c.normalMicroseconds);
    }
}

TEST(CCmTimeValue, StaysAtTheEndsOfItsRange) {
    EXPECT_EQ(CCmTimeValue(LONGEST, 1000000), CCmTimeValue(LONGEST, 999999));
    EXPECT_EQ(CCmTimeValue(SHORTEST, -1000000), CCmTimeValue(SHORTEST, -999999));
}

TEST(CCmTimeValue, CutsNanosecondsTowardZero) {
    EXPECT_EQ(CCmTimeValue(1500ms + 999ns), CCmTimeValue(1, 500000));
    EXPECT_EQ(CCmTimeValue(-1500ms - 999ns), CCmTimeValue(-1, -500000));
}

TEST(CCmTimeValue, GivesTheDurationThatItWasMadeOf) {
    EXPECT_EQ(CCmTimeValue(2, 1).ToDuration(), 2s + 1us);
    EXPECT_EQ(CCmTimeValue(-2, -1).ToDuration(), -2s - 1us);
    EXPECT_EQ(CCmTimeValue(33333us).ToDuration(), 33333us);
}

TEST(CCmTimeValue, GivesTheFarthestDurationForWhatNoDurationCanHold) {
    EXPECT_EQ(CCmTimeValue(LONGEST, 0).ToDuration(), std::chrono::nanoseconds::max());
    EXPECT_EQ(CCmTimeValue(SHORTEST, 0).ToDuration(), std::chrono::nanoseconds::min());
    EXPECT_EQ(CCmTimeValue(9223372036, 999999).ToDuration(), std::chrono::nanoseconds::max());
}

TEST(CCmTimeValue, DiffersWhenEitherPartDiffers) {
    EXPECT_EQ(CCmTimeValue(1, 2), CCmTimeValue(0, 1000002));
    EXPECT_NE(CCmTimeValue(1, 2), CCmTimeValue(1, 3));
    EXPECT_NE(CCmTimeValue(1, 2), CCmTimeValue(2, 2));
}
