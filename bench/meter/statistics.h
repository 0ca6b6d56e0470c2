// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <vector>

/// What is told of repeated measurements. On a machine that does other things as well, the middle one says
/// more than the mean, and the range says how far to trust it.
struct Spread {
    double lowest = 0;
    double median = 0;
    double highest = 0;
};

/// All 0 without values.
inline Spread SpreadOf(std::vector<double> values) {
    if (values.empty())
        return {};
    std::sort(values.begin(), values.end());
    const std::size_t middle = values.size() / 2;
    const double median = values.size() % 2 == 1 ? values[middle] : (values[middle - 1] + values[middle]) / 2;
    return {values.front(), median, values.back()};
}
