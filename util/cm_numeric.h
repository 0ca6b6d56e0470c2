// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <limits>

/// The whole part of a number: cut toward zero, held at the ends of an int's range; NaN gives 0.
/// All geometry goes from real to whole numbers through here: scales and sizes come from outside, and the
/// language leaves a conversion out of range undefined. A float converts to double exactly, so both are
/// served.
constexpr int CmTruncate(double value) {
    using Limits = std::numeric_limits<int>;
    if (value != value)
        return 0;
    if (value <= static_cast<double>(Limits::min()))
        return Limits::min();
    if (value >= static_cast<double>(Limits::max()))
        return Limits::max();
    return static_cast<int>(value);
}
