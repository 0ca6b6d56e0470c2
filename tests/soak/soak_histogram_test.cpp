// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_histogram.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <random>
#include <vector>

using std::chrono::nanoseconds;

TEST(SoakHistogram, GivesPercentilesToASixteenthAndNeverTooLow) {
    std::minstd_rand random(20261122);
    SoakHistogram histogram;
    std::vector<std::int64_t> all;
    for (int i = 0; i < 10000; ++i) {
        all.push_back(static_cast<std::int64_t>(random()) >> random() % 31);
        histogram.Add(nanoseconds(all.back()));
    }
    std::sort(all.begin(), all.end());
    for (const double part : {0.01, 0.5, 0.9, 0.99, 1.0}) {
        const auto exact = all[static_cast<std::size_t>(part * static_cast<double>(all.size())) - 1];
        const std::int64_t given = histogram.Percentile(part).count();
        EXPECT_GE(given, exact) << part;
        EXPECT_LE(given, exact + exact / 16) << part;
    }
    EXPECT_EQ(histogram.Longest().count(), all.back());
    EXPECT_EQ(histogram.Count(), all.size());
}

TEST(SoakHistogram, HoldsTheShortestAndTheLongestThereAre) {
    SoakHistogram histogram;
    EXPECT_EQ(histogram.Percentile(0.5).count(), 0);
    histogram.Add(nanoseconds(-5));
    EXPECT_EQ(histogram.Percentile(1).count(), 0);
    histogram.Add(nanoseconds(std::numeric_limits<std::int64_t>::max()));
    EXPECT_EQ(histogram.Percentile(1).count(), std::numeric_limits<std::int64_t>::max());
    EXPECT_EQ(histogram.Percentile(0.5).count(), 0);
}
