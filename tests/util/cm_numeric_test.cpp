// SPDX-License-Identifier: Apache-2.0
#include "util/cm_numeric.h"

#include <gtest/gtest.h>

#include <limits>

namespace {

constexpr int kLowest = std::numeric_limits<int>::min();
constexpr int kHighest = std::numeric_limits<int>::max();

TEST(CmTruncate, CutsTowardZeroOnBothSides) {
    EXPECT_EQ(CmTruncate(0.0), 0);
    EXPECT_EQ(CmTruncate(0.999999), 0);
    EXPECT_EQ(CmTruncate(-0.999999), 0);
    EXPECT_EQ(CmTruncate(-0.0), 0);
    EXPECT_EQ(CmTruncate(1.5), 1);
    EXPECT_EQ(CmTruncate(-1.5), -1);
    EXPECT_EQ(CmTruncate(2.5F), 2);
    EXPECT_EQ(CmTruncate(-2.5F), -2);
}

TEST(CmTruncate, KeepsEveryWholeNumberThatFits) {
    EXPECT_EQ(CmTruncate(static_cast<double>(kLowest)), kLowest);
    EXPECT_EQ(CmTruncate(static_cast<double>(kLowest) + 1.0), kLowest + 1);
    EXPECT_EQ(CmTruncate(static_cast<double>(kHighest) - 1.0), kHighest - 1);
    EXPECT_EQ(CmTruncate(static_cast<double>(kHighest)), kHighest);
    EXPECT_EQ(CmTruncate(static_cast<double>(kHighest) - 0.5), kHighest - 1);
    EXPECT_EQ(CmTruncate(static_cast<double>(kLowest) + 0.5), kLowest + 1);
}

TEST(CmTruncate, StopsAtTheEndsOfTheRange) {
    EXPECT_EQ(CmTruncate(2147483648.0), kHighest);
    EXPECT_EQ(CmTruncate(2147483648.0F), kHighest);
    EXPECT_EQ(CmTruncate(-2147483649.0), kLowest);
    EXPECT_EQ(CmTruncate(1e300), kHighest);
    EXPECT_EQ(CmTruncate(-1e300), kLowest);
    EXPECT_EQ(CmTruncate(std::numeric_limits<float>::max()), kHighest);
    EXPECT_EQ(CmTruncate(std::numeric_limits<double>::infinity()), kHighest);
    EXPECT_EQ(CmTruncate(-std::numeric_limits<float>::infinity()), kLowest);
}

TEST(CmTruncate, MakesNothingOfWhatIsNoNumber) {
    // Volatile: what the compiler makes of it beforehand says nothing about the machine.
    volatile double none = std::numeric_limits<double>::quiet_NaN();
    volatile float noneInSinglePrecision = -std::numeric_limits<float>::quiet_NaN();
    EXPECT_EQ(CmTruncate(none), 0);
    EXPECT_EQ(CmTruncate(noneInSinglePrecision), 0);
}

TEST(CmTruncate, CanBeAskedAtCompileTime) {
    static_assert(CmTruncate(-7.9) == -7);
    static_assert(CmTruncate(7.9F) == 7);
    static_assert(CmTruncate(1e10) == kHighest);
}

} // namespace
