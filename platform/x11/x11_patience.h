// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

namespace platform::x11 {

/// How long somebody waits for a descriptor: up to a deadline on CmSteadyNow. A clock that is moved by hand
/// may never come to it while the thread that moves it waits for us; on such a clock a second of silence is
/// enough.
/// Threads: one, which may be interrupted by signals.
class Patience {
public:
    enum class Outcome {
        Ready,
        Woken, ///< `wakes` is readable.
        Over,
    };

    /// `wakes` of -1 is never readable.
    Patience(std::chrono::nanoseconds deadline, int wakes) : m_deadline(deadline), m_wakes(wakes) {}

    /// Until the descriptor can be read (POLLIN) or written (POLLOUT), or is broken.
    Outcome WaitFor(int descriptor, short events);
    /// For so long, in real time, and no longer than the deadline.
    Outcome Pause(std::chrono::milliseconds time);

private:
    std::chrono::milliseconds NextSlice();

    const std::chrono::nanoseconds m_deadline;
    const int m_wakes;
    std::chrono::milliseconds m_silence{0}; // on a clock that is moved by hand
};

} // namespace platform::x11
