// SPDX-License-Identifier: Apache-2.0
#pragma once

/// How long ago something was, by one of the clock policies of util/cm_clock.h.
///
/// Policy:  a class with the static operations now() and max_time_value(), the value after which the clock
///          starts again.
/// Units:   the policy's, microseconds.
/// Threads: an object belongs to one thread at a time.
/// Errors:  none. A tag ahead of the clock counts as one from before the clock started again.
template <class Policy>
class timer_fact {
public:
    /// Measures from `tag`, or from now on if that is -1.
    explicit timer_fact(long long tag) { reset(tag); }

    void reset(long long tag) { m_tag = tag == -1 ? Policy::now() : tag; }

    long long elapsed() const {
        const long long now = Policy::now();
        if (now >= m_tag)
            return Difference(now, m_tag);
        const long long max = Policy::max_time_value();
        if (max == m_tag)
            return Difference(now, m_tag);
        return Sum(now, Difference(max, m_tag));
    }

    // Tag and clock are cut to the larger unit before they are compared, so these may differ by one from what
    // elapsed() gives in that unit.
    long long elapsed_mills() const { return ElapsedIn(1000); }
    long long elapsed_sec() const { return ElapsedIn(1000000); }

    static long long now() { return Policy::now(); }

    bool overtime(long long limit) const { return elapsed() >= limit; }
    bool overtime_mills(long long limit) const { return elapsed_mills() >= limit; }
    bool overtime_sec(long long limit) const { return elapsed_sec() >= limit; }

    long long latest_tag() const { return m_tag; }

private:
    using Bits = unsigned long long;

    // A tag may be any number, and the far ends of the range must not overflow.
    static long long Sum(long long a, long long b) {
        return static_cast<long long>(static_cast<Bits>(a) + static_cast<Bits>(b));
    }
    static long long Difference(long long a, long long b) {
        return static_cast<long long>(static_cast<Bits>(a) - static_cast<Bits>(b));
    }

    long long ElapsedIn(long long unit) const {
        const long long now = Policy::now() / unit;
        const long long tag = m_tag / unit;
        if (now >= tag)
            return now - tag;
        const long long untilWrap = Difference(Policy::max_time_value(), m_tag) / unit;
        return untilWrap != 0 ? now + untilWrap : now - tag;
    }

    long long m_tag;
};
