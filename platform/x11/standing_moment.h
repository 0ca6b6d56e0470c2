// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/arrivals.h"

#include <chrono>
#include <cstdint>
#include <mutex>

namespace platform::x11 {

/// A moment (WindowServer::GetMoment), and for how long it may stand without a word from the server.
struct MomentSpan {
    std::uint64_t moment = 0;        ///< 0 for none.
    std::chrono::nanoseconds end{0}; ///< On CmSteadyNow.
};

/// The moment that stands, for whoever asks for it. Whoever uses the connection ends it first, and lets it
/// stand anew when he is done, with all that has come by then taken in. Meanwhile nobody reads the socket, so
/// what comes lies in it, unread, and can be seen there.
/// Threads: any.
class StandingMoment {
public:
    using Ticket = std::uint64_t;

    StandingMoment() = default;
    StandingMoment(const StandingMoment&) = delete;
    StandingMoment& operator=(const StandingMoment&) = delete;

    /// From now on none stands. The ticket is good for Stand until somebody else ends it.
    Ticket End();
    /// `socket` is the connection's, and `arrivals` are what comes over it, which nobody else touches until
    /// the moment is ended; nor is the socket closed. Nothing stands with a ticket of before the last end.
    void Stand(Ticket ticket, const MomentSpan& span, int socket, Arrivals& arrivals);
    /// 0 when none stands, or something has come meanwhile. Never waits, and reads nothing. Counts as a use
    /// of the connection otherwise.
    std::uint64_t Get() noexcept;

private:
    std::mutex m_mutex;
    Ticket m_ends = 0;
    MomentSpan m_span;
    int m_socket = -1;
    Arrivals* m_arrivals = nullptr;
};

} // namespace platform::x11
