// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_histogram.h"

#include <algorithm>
#include <bit>
#include <cmath>

std::size_t SoakHistogram::PlaceOf(std::uint64_t value) {
    if (value < STEPS)
        return static_cast<std::size_t>(value);
    const int shift = static_cast<int>(std::bit_width(value)) - 1 - STEP_BITS;
    return static_cast<std::size_t>(shift) * STEPS + static_cast<std::size_t>(value >> shift);
}

std::uint64_t SoakHistogram::HighestAt(std::size_t place) {
    if (place < 2 * STEPS)
        return place;
    const std::size_t shift = place / STEPS - 1;
    return ((place % STEPS + STEPS + 1) << shift) - 1;
}

void SoakHistogram::Add(std::chrono::nanoseconds duration) {
    const std::int64_t value = std::max<std::int64_t>(duration.count(), 0);
    ++m_counts[PlaceOf(static_cast<std::uint64_t>(value))];
    ++m_count;
    std::int64_t longest = m_longest;
    while (value > longest && !m_longest.compare_exchange_weak(longest, value)) {
    }
}

std::chrono::nanoseconds SoakHistogram::Percentile(double part) const {
    const auto wanted = static_cast<std::uint64_t>(std::ceil(part * static_cast<double>(m_count)));
    std::uint64_t seen = 0;
    for (std::size_t place = 0; place < ROOM; ++place) {
        seen += m_counts[place];
        if (seen > 0 && seen >= wanted)
            return std::min(Longest(), std::chrono::nanoseconds(static_cast<std::int64_t>(HighestAt(place))));
    }
    return std::chrono::nanoseconds(0);
}
