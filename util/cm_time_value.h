// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

/// A duration of seconds and microseconds, normalised so that both parts carry the same sign and the
/// microseconds stay below one million in magnitude.
class CCmTimeValue {
public:
    CCmTimeValue() = default;
    CCmTimeValue(long seconds, long microseconds);
    explicit CCmTimeValue(std::chrono::nanoseconds duration);

    long GetSec() const { return m_seconds; }
    long GetUsec() const { return m_microseconds; }
    std::chrono::nanoseconds ToDuration() const;

    bool operator==(const CCmTimeValue& other) const = default;

private:
    long m_seconds = 0;
    long m_microseconds = 0;
};
