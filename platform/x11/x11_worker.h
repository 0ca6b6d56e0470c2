// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/arrivals.h"
#include "platform/x11/owned_descriptor.h"
#include "platform/x11/x11_hub_state.h"
#include "platform/x11/x11_session.h"
#include "util/cm_thread.h"

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace platform::x11 {

/// The thread of a window server: it owns the connection and whatever goes on over it, and keeps the hub's
/// view true. While it sleeps it lends the connection to one who needs a picture: meanwhile what comes
/// doesn't wake it.
class X11Worker final : public ACmThread, public ConnectionLender, private SessionListener {
public:
    /// Null when it can't be started. The hub is in its first try to connect then.
    static std::shared_ptr<X11Worker> Start(HubState& hub, const std::string& display);

    X11Worker(HubState& hub, const std::string& display);

    /// Ends and joins it, whatever it waits for: xcb, too, which waits without end for a server that takes
    /// nothing in.
    void End();

    int OnThreadRun() override;
    Borrowing RunForBorrower(std::chrono::nanoseconds deadline, const X11Hub::Work& work) override;

private:
    using Nanoseconds = std::chrono::nanoseconds;
    using Milliseconds = std::chrono::milliseconds;

    // Finding the server.
    void Connect();
    bool BeginSession();
    void Pause();
    void EndSession();
    void Lose();
    void NoteSocket(int socket);

    // Serving.
    void ServeGuarded();
    void Serve();
    void ServeStalled();
    void RunCommands();
    void RunCommand(const CommandPtr& command);
    bool Perform(const X11Hub::Work& work, Nanoseconds deadline);
    void CatchUp(EventsFrom from);
    void LetMomentStand(StandingMoment::Ticket ticket);
    bool HasMoreToDo(std::uint64_t eventsBefore) const;
    void Wait();
    void WaitForServer(short events);
    /// `waits` begins with those of ServerWaits.
    void WaitFor(std::vector<pollfd>& waits, Nanoseconds longest);
    std::vector<pollfd> ServerWaits(short events) const;
    Nanoseconds TimeToNextDue() const;

    // SessionListener
    void OnDisplays(std::shared_ptr<const DisplayList> displays) override;
    void OnWindows(std::shared_ptr<const WindowSnapshot> windows) override;
    void OnApplications(std::shared_ptr<const ApplicationList> applications) override;
    void OnCursor(std::shared_ptr<const CursorImage> cursor) override;
    void OnStreamPicture(std::uint64_t stream) override { m_hub.OnStreamPicture(stream); }
    void Publish();

    HubState& m_hub; // joins the thread before it ends
    const std::string m_display;
    const OwnedDescriptor m_stops; // readable when the thread is to end
    const OwnedDescriptor m_wakes; // readable when the hub has something for it
    Arrivals m_arrivals;
    std::optional<X11Connection> m_connection;
    std::optional<X11Session> m_session;
    bool m_lossUntold = false;
    Milliseconds m_backOff;
    Pending<xcb_get_input_focus_reply_t> m_question; // whether a stalled server answers
    bool m_asked = false;
    StandingMoment::Ticket m_ticket = 0; // since nobody has borrowed the connection
    Nanoseconds m_wakeTime{0};           // until when it sleeps
    std::vector<int> m_waitedOn;         // what of the session's it sleeps on
    std::exception_ptr m_failure;        // of a borrower, for the thread to see to
    bool m_isReadable = false;           // the connection has something that nobody has read
    View m_view;
    bool m_publishes = false; // not before all of a new session is there

    std::mutex m_socketMutex;
    int m_socket = -1; // the connection's, guarded by m_socketMutex
};

} // namespace platform::x11
