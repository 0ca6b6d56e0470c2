// SPDX-License-Identifier: Apache-2.0
#include "util/cm_time_value.h"

#include <limits>

namespace {

using std::chrono::nanoseconds;

constexpr long MICROSECONDS_A_SECOND = 1000000;
constexpr long NANOSECONDS_A_MICROSECOND = 1000;

} // namespace

CCmTimeValue::CCmTimeValue(long seconds, long microseconds) {
    const bool overflows = __builtin_add_overflow(seconds, microseconds / MICROSECONDS_A_SECOND, &m_seconds);
    if (overflows) {
        const bool negative = seconds < 0;
        m_seconds = negative ? std::numeric_limits<long>::min() : std::numeric_limits<long>::max();
        m_microseconds = negative ? 1 - MICROSECONDS_A_SECOND : MICROSECONDS_A_SECOND - 1;
        return;
    }
    m_microseconds = microseconds % MICROSECONDS_A_SECOND;
    if (m_seconds > 0 && m_microseconds < 0) {
        --m_seconds;
        m_microseconds += MICROSECONDS_A_SECOND;
    } else if (m_seconds < 0 && m_microseconds > 0) {
        ++m_seconds;
        m_microseconds -= MICROSECONDS_A_SECOND;
    }
}

CCmTimeValue::CCmTimeValue(nanoseconds duration)
    : m_seconds(std::chrono::duration_cast<std::chrono::seconds>(duration).count()),
      m_microseconds(std::chrono::duration_cast<std::chrono::microseconds>(duration).count() %
                     MICROSECONDS_A_SECOND) {}

nanoseconds CCmTimeValue::ToDuration() const {
    nanoseconds::rep result = 0;
    const bool overflows =
        __builtin_mul_overflow(m_seconds, MICROSECONDS_A_SECOND * NANOSECONDS_A_MICROSECOND, &result) ||
        __builtin_add_overflow(result, m_microseconds * NANOSECONDS_A_MICROSECOND, &result);
    if (overflows)
        return m_seconds < 0 ? nanoseconds::min() : nanoseconds::max();
    return nanoseconds(result);
}
