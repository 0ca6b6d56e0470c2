// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_trend.h"

#include <algorithm>
#include <utility>

namespace {

constexpr std::size_t MOST_BLOCKS = 20;
constexpr std::size_t FEWEST_IN_BLOCK = 2;
constexpr double LOWER_QUARTILE = 0.25;
constexpr double MIDDLE = 0.5;
constexpr double EXCEEDED_BY_SIX_IN_TEN = 0.4;

/// The value that so large a part of them lies below; 0 of none.
double ValueAt(double part, std::vector<double> values) {
    if (values.empty())
        return 0;
    const auto place =
        values.begin() + static_cast<std::ptrdiff_t>(part * static_cast<double>(values.size()));
    std::nth_element(values.begin(), place, values.end());
    return *place;
}

/// Where it rests within each block. What doesn't fill a block is left out at the beginning.
std::vector<double> LevelsOf(const std::vector<double>& samples) {
    const std::size_t size = std::max(samples.size() / MOST_BLOCKS, FEWEST_IN_BLOCK);
    std::vector<double> levels;
    for (std::size_t first = samples.size() % size; first < samples.size(); first += size) {
        const auto begin = samples.begin() + static_cast<std::ptrdiff_t>(first);
        levels.push_back(ValueAt(LOWER_QUARTILE, {begin, begin + static_cast<std::ptrdiff_t>(size)}));
    }
    return levels;
}

/// How much they rise from one to the next.
double SlopeOf(const std::vector<double>& levels) {
    std::vector<double> slopes;
    for (std::size_t i = 0; i < levels.size(); ++i) {
        for (std::size_t j = i + 1; j < levels.size(); ++j)
            slopes.push_back((levels[j] - levels[i]) / static_cast<double>(j - i));
    }
    return ValueAt(EXCEEDED_BY_SIX_IN_TEN, std::move(slopes));
}

} // namespace

SoakTrend JudgeTrend(const std::vector<double>& samples, double allowed) {
    const auto half = static_cast<std::ptrdiff_t>(samples.size() / 2);
    const std::vector<double> counted(samples.begin() + half, samples.end());
    if (counted.empty())
        return {};
    const std::vector<double> levels = LevelsOf(counted);
    SoakTrend trend;
    trend.level = ValueAt(MIDDLE, levels);
    trend.growth = levels.size() < 2 ? 0 : SlopeOf(levels) * static_cast<double>(levels.size() - 1);
    trend.peak = *std::max_element(counted.begin(), counted.end());
    trend.grows = trend.growth > allowed;
    return trend;
}
