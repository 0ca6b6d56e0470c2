// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>

/// Durations in a room that doesn't grow with their number: what watches for growth must not grow. Each is
/// kept to a sixteenth of itself.
/// Threads: any.
class SoakHistogram {
public:
    void Add(std::chrono::nanoseconds duration);

    std::uint64_t Count() const { return m_count; }
    /// At most a sixteenth above the duration that so large a part of them doesn't exceed; 0 without any.
    std::chrono::nanoseconds Percentile(double part) const;
    /// To the nanosecond.
    std::chrono::nanoseconds Longest() const { return std::chrono::nanoseconds(m_longest); }

private:
    static constexpr int STEP_BITS = 4;
    static constexpr std::size_t STEPS = 1U << STEP_BITS; // from one power of two to the next
    static constexpr std::size_t ROOM = (64 - STEP_BITS + 1) * STEPS;

    static std::size_t PlaceOf(std::uint64_t value);
    static std::uint64_t HighestAt(std::size_t place);

    std::array<std::atomic<std::uint64_t>, ROOM> m_counts{};
    std::atomic<std::uint64_t> m_count{0};
    std::atomic<std::int64_t> m_longest{0};
};
