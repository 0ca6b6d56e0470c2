// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_patience.h"

#include "util/cm_clock.h"

#include <poll.h>

#include <algorithm>

namespace platform::x11 {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds SILENT_SLICE{20};
constexpr milliseconds LONGEST_SILENCE{1000};
constexpr milliseconds LONGEST_SLICE{60'000};

} // namespace

/// Zero when it is over.
milliseconds Patience::NextSlice() {
    const ICmClock& clock = CmCurrentClock();
    const std::chrono::nanoseconds now = clock.SteadyNow();
    if (now >= m_deadline)
        return milliseconds::zero();
    if (clock.RunsByItself())
        return std::min(std::chrono::ceil<milliseconds>(m_deadline - now), LONGEST_SLICE);
    m_silence += SILENT_SLICE;
    return m_silence <= LONGEST_SILENCE ? SILENT_SLICE : milliseconds::zero();
}

Patience::Outcome Patience::WaitFor(int descriptor, short events) {
    for (;;) {
        const milliseconds slice = NextSlice();
        pollfd waits[] = {{descriptor, events, 0}, {m_wakes, POLLIN, 0}};
        const int ready = poll(waits, 2, static_cast<int>(slice.count()));
        if (ready > 0 && waits[1].revents != 0)
            return Outcome::Woken;
        if (ready > 0)
            return Outcome::Ready;
        if (slice == milliseconds::zero())
            return Outcome::Over;
    }
}

Patience::Outcome Patience::Pause(milliseconds time) {
    const milliseconds slice = std::min(NextSlice(), time);
    pollfd wait{m_wakes, POLLIN, 0};
    if (poll(&wait, 1, static_cast<int>(slice.count())) > 0)
        return Outcome::Woken;
    return slice == milliseconds::zero() ? Outcome::Over : Outcome::Ready;
}

} // namespace platform::x11
