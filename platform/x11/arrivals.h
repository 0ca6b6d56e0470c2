// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/owned_descriptor.h"

#include <chrono>
#include <cstdint>

namespace platform::x11 {

/// What the thread of a connection sleeps on to hear that something has come over it. It hears nothing while
/// somebody else uses the connection; and if that is done all the time, also not in between, since whoever
/// comes next takes in what has come: that is a lease. It ends LEASE after its last use, and then the thread
/// is woken to listen itself. That the connection has broken is heard at once, whoever uses it.
/// Threads: one at a time.
class Arrivals {
public:
    /// What comes isn't heard later than that.
    static constexpr std::chrono::nanoseconds LEASE = std::chrono::milliseconds(100);

    Arrivals();
    /// Whether it can be used at all.
    explicit operator bool() const { return m_works; }
    /// To be polled.
    int Descriptor() const { return m_set.Get(); }

    /// Begins with a connection; false when it can't.
    bool Open(int socket);
    /// Before the socket is closed: a forked child may still have it open.
    void Close();

    /// Somebody uses the connection. False when he may be disturbed.
    bool BeginUse();
    /// He is done. False when the thread can't hear any more.
    bool EndUse();
    /// Somebody has seen that nothing has come, which is as good as a use.
    void NoteUse() noexcept;
    /// The thread was woken by it, and listens. False when it can't.
    bool Listen();

private:
    bool IsRegular() const noexcept;
    bool Hear(std::uint32_t events) noexcept;
    bool Prolong() noexcept;

    const OwnedDescriptor m_set; // of the socket and the timer
    const OwnedDescriptor m_timer;
    bool m_works = false;
    int m_socket = -1;
    bool m_isLeased = false;                 // the thread doesn't listen, and the timer runs
    std::chrono::nanoseconds m_leaseEnds{0}; // not before
    std::chrono::nanoseconds m_lastUse{0};   // 0 for none
};

} // namespace platform::x11
