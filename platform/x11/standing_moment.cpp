// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/standing_moment.h"

#include "util/cm_clock.h"

#include <sys/socket.h>

#include <cerrno>

namespace platform::x11 {

namespace {

/// A connection that is broken isn't silent.
bool IsSilent(int socket) {
    char byte = 0;
    return recv(socket, &byte, sizeof byte, MSG_PEEK | MSG_DONTWAIT) < 0 && errno == EAGAIN;
}

} // namespace

StandingMoment::Ticket StandingMoment::End() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_span = {};
    m_socket = -1;
    m_arrivals = nullptr;
    return ++m_ends;
}

void StandingMoment::Stand(Ticket ticket, const MomentSpan& span, int socket, Arrivals& arrivals) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (ticket != m_ends)
        return;
    m_span = span;
    m_socket = socket;
    m_arrivals = &arrivals;
}

std::uint64_t StandingMoment::Get() noexcept {
    const std::unique_lock<std::mutex> lock(m_mutex, std::try_to_lock);
    if (!lock.owns_lock() || m_span.moment == 0)
        return 0;
    const ICmClock& clock = CmCurrentClock();
    // Nobody may close the socket meanwhile: he would have to end the moment first.
    const bool stands = clock.RunsByItself() && clock.SteadyNow() < m_span.end && IsSilent(m_socket);
    if (!stands)
        return 0;
    m_arrivals->NoteUse();
    return m_span.moment;
}

} // namespace platform::x11
