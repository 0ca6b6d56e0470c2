// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/x11_atoms.h"
#include "platform/x11/x11_handshake.h"

#include <xcb/xcb.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <type_traits>
#include <utility>

namespace platform::x11 {

struct FreeMalloced {
    void operator()(void* memory) const noexcept { std::free(memory); }
};
template <class T>
using Malloced = std::unique_ptr<T, FreeMalloced>;
using Event = Malloced<xcb_generic_event_t>;

/// Takes over what libxcb has received. Null when that is less than the fixed part of such a reply, which
/// some have longer than the 32 bytes that every reply has: a field would be read behind the end.
template <class Reply>
Malloced<Reply> WholeReply(void* received) {
    Malloced<void> owned(received);
    if constexpr (!std::is_void_v<Reply>) {
        constexpr std::size_t SHORTEST = 32;
        const auto* const head = static_cast<const xcb_generic_reply_t*>(received);
        if (head != nullptr && SHORTEST + std::size_t{head->length} * 4 < sizeof(Reply))
            return nullptr;
    }
    return Malloced<Reply>(static_cast<Reply*>(owned.release()));
}

/// What the server can, and where its events begin. 0 for an extension that is missing; such events are
/// never taken for another's.
struct Extensions {
    bool composite = false;
    bool damage = false;
    bool shm = false;   ///< With descriptors (1.2).
    bool randr = false; ///< With monitors (1.5).
    bool xfixes = false;
    bool shape = false;
    bool xres = false;   ///< With client ids (1.2).
    bool xinput = false; ///< With raw events whoever has grabbed the device, of touches too (2.2).
    std::uint8_t damageEvent = 0;
    std::uint8_t randrEvent = 0;
    std::uint8_t xfixesEvent = 0;
    std::uint8_t shapeEvent = 0;
    std::uint8_t xinputOpcode = 0; ///< Its events are general ones, which tell it.
};

/// A request whose answer is not here yet. Dropped, it tells the connection to throw the answer away.
template <class Reply>
class Pending {
public:
    Pending() = default;
    Pending(xcb_connection_t* connection, unsigned sequence)
        : m_connection(connection),
          m_sequence(sequence) {}
    Pending(Pending&& other) noexcept : m_connection(other.m_connection), m_sequence(other.Take()) {}
    Pending& operator=(Pending&& other) noexcept {
        Discard();
        m_connection = other.m_connection;
        m_sequence = other.Take();
        return *this;
    }
    ~Pending() { Discard(); }

    unsigned Sequence() const { return m_sequence; }
    unsigned Take() noexcept { return std::exchange(m_sequence, 0); }

private:
    void Discard() noexcept {
        if (m_sequence != 0)
            xcb_discard_reply(m_connection, m_sequence);
    }

    xcb_connection_t* m_connection = nullptr;
    unsigned m_sequence = 0;
};

/// A live connection to an X server. Everything that waits has a deadline: a server that is stopped must not
/// stop us.
///
/// Threads: one, which owns it.
/// Errors:  Lost when the connection is broken, Unanswered when the deadline has passed or the thread is to
///          end. A request that the server refuses gives null; what is not asked with Ask reports its error
///          as an event of type 0, which NextEvent drops.
class X11Connection {
public:
    /// `link` holds a connection. `wakes` becomes readable when the thread is to end: then nothing is awaited
    /// any more; -1 for never.
    X11Connection(Link link, int wakes);
    X11Connection(const X11Connection&) = delete;
    X11Connection& operator=(const X11Connection&) = delete;

    /// For requests: whoever has it may have asked for something, until the next Flush or Await.
    xcb_connection_t* Get() const {
        m_mayHoldRequests = true;
        return m_connection.get();
    }
    const xcb_setup_t& Setup() const { return *xcb_get_setup(m_connection.get()); }
    const xcb_screen_t& Screen() const { return *m_screen; }
    int ScreenNumber() const { return m_screenNumber; }
    xcb_window_t Root() const { return m_screen->root; }
    const Extensions& Has() const { return m_extensions; }
    xcb_atom_t Atom(AtomName name) const { return m_atoms[static_cast<std::size_t>(name)]; }
    /// Lost when there are none. Unlike xcb's own ids it doesn't wait without end when ids are used again.
    std::uint32_t NewId();

    /// Looks up extensions, their versions and atoms; the first thing to be done.
    void Introduce();

    /// When all that is awaited from now on has to be there, on CmSteadyNow; an hour from now for none.
    void SetDeadline(std::chrono::nanoseconds deadline) { m_deadline = deadline; }

    /// `Ask<xcb_get_geometry_reply_t>(xcb_get_geometry(connection.Get(), window))`
    template <class Reply, class Cookie>
    Pending<Reply> Ask(Cookie cookie) {
        return {m_connection.get(), cookie.sequence};
    }
    /// Null when the server has refused, or has sent less than such a reply has.
    template <class Reply>
    Malloced<Reply> Await(Pending<Reply>& pending) {
        return WholeReply<Reply>(AwaitReply(pending.Take()));
    }
    template <class Reply, class Cookie>
    Malloced<Reply> Fetch(Cookie cookie) {
        Pending<Reply> pending = Ask<Reply>(cookie);
        return Await(pending);
    }
    /// The reply when it is here, without waiting; `answered` tells whether there was one or a refusal, and
    /// the request is then no longer pending.
    void* PollReply(unsigned sequence, bool& answered);
    template <class Reply>
    Malloced<Reply> PollReply(Pending<Reply>& pending, bool& answered) {
        Malloced<Reply> reply = WholeReply<Reply>(PollReply(pending.Sequence(), answered));
        if (answered)
            pending.Take();
        return reply;
    }

    /// Waits until the server has done all that was asked so far.
    void RoundTrip();
    /// Sends what has been asked for since the last time.
    void Flush();
    /// The same, and where the answers bring many `bytes` of pixels, sleeps for as long as it takes to copy
    /// them and a quarter of a millisecond more. A server writes each answer by itself, so who waits for
    /// several is woken as often; most of the time all of them are there behind this. Where they bring few,
    /// they are there sooner than a sleep would end.
    void LetAnswersGather(std::size_t bytes);

    /// Everything that has come, in its order; null when there is nothing more. Reads the socket.
    Event NextEvent();
    /// Only what the last answer brought with it; doesn't read the socket.
    Event NextQueuedEvent();

    /// Lost if the connection is broken.
    void Check() const;
    int Descriptor() const;

private:
    void* AwaitReply(unsigned sequence);
    void Send();
    void AskForFreeIds();
    void LookUpExtensions();
    void LookUpVersions();
    void LookUpAtoms();

    const XcbConnection m_connection;
    const int m_screenNumber;
    const int m_wakes;
    mutable bool m_mayHoldRequests = true;
    const xcb_screen_t* m_screen = nullptr;
    Extensions m_extensions;
    std::array<xcb_atom_t, static_cast<std::size_t>(AtomName::Count)> m_atoms{};
    std::chrono::nanoseconds m_deadline{std::chrono::nanoseconds::max()};
    // Ids that may be given out; none when the next one is 0.
    std::uint32_t m_nextId;
    std::uint32_t m_lastId;
    std::uint32_t m_idStep;
};

/// Holds the server for this connection for a scope: nothing changes meanwhile. Keep it short.
class ServerGrab {
public:
    explicit ServerGrab(X11Connection& connection) : m_connection(connection) {
        xcb_grab_server(m_connection.Get());
    }
    ~ServerGrab() {
        xcb_ungrab_server(m_connection.Get());
        xcb_flush(m_connection.Get());
    }
    ServerGrab(const ServerGrab&) = delete;
    ServerGrab& operator=(const ServerGrab&) = delete;

private:
    X11Connection& m_connection;
};

} // namespace platform::x11
