// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/arrivals.h"

#include "util/cm_clock.h"

#include <sys/epoll.h>
#include <sys/timerfd.h>

namespace platform::x11 {

namespace {

/// A lease that lasts for so long isn't made longer yet.
constexpr std::chrono::nanoseconds LONG_ENOUGH = Arrivals::LEASE / 2;

/// In real time, whatever the clock in force: a poll isn't woken by another.
bool SetTimer(int timer, std::chrono::nanoseconds time) {
    itimerspec span{};
    span.it_value.tv_nsec = static_cast<long>(time.count());
    return timerfd_settime(timer, 0, &span, nullptr) == 0;
}

} // namespace

static_assert(Arrivals::LEASE < std::chrono::seconds(1));

Arrivals::Arrivals()
    : m_set(epoll_create1(EPOLL_CLOEXEC)),
      m_timer(timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK)) {
    epoll_event event{};
    event.events = EPOLLIN;
    m_works = m_set && m_timer && epoll_ctl(m_set.Get(), EPOLL_CTL_ADD, m_timer.Get(), &event) == 0;
}

bool Arrivals::Open(int socket) {
    epoll_event event{};
    event.events = EPOLLIN;
    m_lastUse = {};
    m_socket = socket;
    return epoll_ctl(m_set.Get(), EPOLL_CTL_ADD, socket, &event) == 0;
}

void Arrivals::Close() {
    if (m_socket < 0)
        return;
    epoll_event event{};
    epoll_ctl(m_set.Get(), EPOLL_CTL_DEL, m_socket, &event);
    SetTimer(m_timer.Get(), {});
    m_isLeased = false;
    m_socket = -1;
}

bool Arrivals::Hear(std::uint32_t events) noexcept {
    epoll_event event{};
    event.events = events;
    return epoll_ctl(m_set.Get(), EPOLL_CTL_MOD, m_socket, &event) == 0;
}

bool Arrivals::BeginUse() {
    return m_isLeased || Hear(0);
}

bool Arrivals::EndUse() {
    const bool isRegular = IsRegular();
    m_lastUse = CmSteadyNow();
    if (m_isLeased || isRegular)
        m_isLeased = Prolong();
    return m_isLeased || Hear(EPOLLIN);
}

void Arrivals::NoteUse() noexcept {
    m_lastUse = CmSteadyNow();
    if (m_isLeased)
        Prolong(); // else it ends as it would have
}

/// The next use may be expected within a lease. On a clock that is moved by hand nobody can tell.
bool Arrivals::IsRegular() const noexcept {
    const ICmClock& clock = CmCurrentClock();
    return clock.RunsByItself() && m_lastUse.count() != 0 && clock.SteadyNow() - m_lastUse < LEASE;
}

bool Arrivals::Prolong() noexcept {
    if (m_isLeased && m_leaseEnds - m_lastUse > LONG_ENOUGH)
        return true;
    m_leaseEnds = m_lastUse + LEASE;
    return SetTimer(m_timer.Get(), LEASE);
}

bool Arrivals::Listen() {
    if (!m_isLeased)
        return true;
    SetTimer(m_timer.Get(), {}); // and it isn't readable any more
    m_isLeased = false;
    return Hear(EPOLLIN);
}

} // namespace platform::x11
