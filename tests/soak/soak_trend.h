// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

/// What became of a counter that should stay where it is.
struct SoakTrend {
    double level = 0;  ///< Where it rests, in the middle of the second half.
    double growth = 0; ///< Of that level, from the beginning of the second half to its end.
    double peak = 0;   ///< The highest sample of the second half.
    bool grows = false;
};

/// Fewer samples than these are no ground for a verdict.
constexpr std::size_t SOAK_FEWEST_SAMPLES = 40;

/// Judges samples that were taken at equal distances.
///
/// The first half may still fill caches, so only the second one counts. It is cut into twenty blocks of one
/// length (of two samples at least, so fewer where there are few), and of each block only the lower quartile
/// is kept: load comes and goes in peaks, now and then something is let go of for a moment, while what was
/// lost never comes back, and so raises the level that a counter falls back to. The slope between any two of
/// these levels is looked at, and the one that six in ten exceed is that of the half. So neither a few blocks
/// that are far out count nor one step up, wherever it is, which can't be said of the median of these slopes.
/// The counter grows when, along that slope, it rises by more than `allowed`.
SoakTrend JudgeTrend(const std::vector<double>& samples, double allowed);
