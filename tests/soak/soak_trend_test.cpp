// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_trend.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <random>
#include <vector>

namespace {

constexpr std::size_t SAMPLES = 1800;
constexpr double LEVEL = 1000;
constexpr double ALLOWED = 8;

/// A counter with peaks of that height, which come and go.
std::vector<double> Busy(double height, unsigned seed) {
    std::minstd_rand random(seed);
    std::vector<double> samples;
    for (std::size_t i = 0; i < SAMPLES; ++i)
        samples.push_back(LEVEL +
                          (random() % 3 == 0 ? 0 : height * static_cast<double>(random() % 100) / 100));
    return samples;
}

/// The same with some more from sample to sample.
std::vector<double> Leaking(double height, double all, unsigned seed) {
    std::vector<double> samples = Busy(height, seed);
    for (std::size_t i = 0; i < SAMPLES; ++i)
        samples[i] += all * static_cast<double>(i) / SAMPLES;
    return samples;
}

} // namespace

TEST(SoakTrend, CallsACounterThatComesBackLevelHoweverHighItsPeaks) {
    for (unsigned seed = 1; seed <= 100; ++seed) {
        const SoakTrend trend = JudgeTrend(Busy(100000, seed), ALLOWED);
        EXPECT_FALSE(trend.grows) << "seed " << seed << ": " << trend.growth;
        EXPECT_EQ(trend.level, LEVEL);
        EXPECT_GT(trend.peak, LEVEL);
    }
}

TEST(SoakTrend, CallsACounterLevelThatFallsDeepNowAndThen) {
    for (unsigned seed = 1; seed <= 100; ++seed) {
        std::minstd_rand random(seed);
        std::vector<double> samples;
        for (std::size_t i = 0; i < SAMPLES; ++i)
            samples.push_back(LEVEL - (random() % 20 == 0 ? static_cast<double>(random() % 500) : 0));
        const SoakTrend trend = JudgeTrend(samples, ALLOWED);
        EXPECT_FALSE(trend.grows) << "seed " << seed << ": " << trend.growth;
        EXPECT_EQ(trend.level, LEVEL);
    }
}

TEST(SoakTrend, SeesALeakThatIsSmallBesideThePeaks) {
    for (unsigned seed = 1; seed <= 100; ++seed) {
        const SoakTrend trend = JudgeTrend(Leaking(1000, 60, seed), ALLOWED);
        EXPECT_TRUE(trend.grows) << "seed " << seed << ": " << trend.growth;
        EXPECT_NEAR(trend.growth, 30, 5) << "seed " << seed;
    }
}

TEST(SoakTrend, LeavesGrowthWithinWhatIsAllowedAlone) {
    EXPECT_FALSE(JudgeTrend(Leaking(0, 2 * ALLOWED - 1, 1), ALLOWED).grows);
    EXPECT_TRUE(JudgeTrend(Leaking(0, 2 * ALLOWED + 3, 1), ALLOWED).grows);
}

TEST(SoakTrend, ForgetsTheFirstHalf) {
    std::vector<double> samples(SAMPLES, LEVEL);
    for (std::size_t i = 0; i < SAMPLES / 2; ++i)
        samples[i] = static_cast<double>(i);
    EXPECT_FALSE(JudgeTrend(samples, ALLOWED).grows);
    EXPECT_EQ(JudgeTrend(samples, ALLOWED).growth, 0);
}

TEST(SoakTrend, IsNotTiltedByASinglePeakThatLasts) {
    std::vector<double> samples(SAMPLES, LEVEL);
    for (std::size_t i = SAMPLES - SAMPLES / 10; i < SAMPLES; ++i)
        samples[i] = 50 * LEVEL;
    EXPECT_FALSE(JudgeTrend(samples, ALLOWED).grows);
    EXPECT_EQ(JudgeTrend(samples, ALLOWED).peak, 50 * LEVEL);
}

TEST(SoakTrend, IsNotTiltedByASingleStep) {
    for (std::size_t step = SAMPLES / 2; step < SAMPLES; step += 100) {
        std::vector<double> samples(SAMPLES, LEVEL);
        for (std::size_t i = step; i < SAMPLES; ++i)
            samples[i] = 2 * LEVEL;
        EXPECT_EQ(JudgeTrend(samples, ALLOWED).growth, 0) << "step at " << step;
    }
}

TEST(SoakTrend, SeesAStaircase) {
    std::vector<double> samples;
    for (std::size_t i = 0; i < SAMPLES; ++i)
        samples.push_back(static_cast<double>(i / 100)); // nine steps in the second half
    EXPECT_TRUE(JudgeTrend(samples, 4).grows);
}

TEST(SoakTrend, JudgesAsFewSamplesAsARunMayHave) {
    std::vector<double> samples;
    for (std::size_t i = 0; i < SOAK_FEWEST_SAMPLES; ++i)
        samples.push_back(static_cast<double>(i));
    EXPECT_TRUE(JudgeTrend(samples, ALLOWED).grows);
    EXPECT_FALSE(JudgeTrend(std::vector<double>(SOAK_FEWEST_SAMPLES, LEVEL), ALLOWED).grows);
    EXPECT_FALSE(JudgeTrend({}, ALLOWED).grows);
}
