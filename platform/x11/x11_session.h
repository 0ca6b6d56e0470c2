// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/application_watch.h"
#include "platform/x11/display_mirror.h"
#include "platform/x11/display_streams.h"
#include "platform/x11/pointer_watch.h"
#include "platform/x11/standing_moment.h"
#include "platform/x11/window_storages.h"
#include "platform/x11/window_tree.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"

#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

namespace platform::x11 {

/// What a session has to tell. Called on the X thread, each only when something is different.
class SessionListener {
public:
    virtual ~SessionListener() = default;
    virtual void OnDisplays(std::shared_ptr<const DisplayList> displays) = 0;
    virtual void OnWindows(std::shared_ptr<const WindowSnapshot> windows) = 0;
    virtual void OnApplications(std::shared_ptr<const ApplicationList> applications) = 0;
    virtual void OnCursor(std::shared_ptr<const CursorImage> cursor) = 0;
    virtual void OnStreamPicture(std::uint64_t stream) = 0; ///< StreamReader::id
};

/// Which events are taken in.
enum class EventsFrom {
    Answers, ///< Those that the last answer has brought with it: all that the server sent before it.
    Socket,  ///< Also what has come since.
};

/// All that goes on over one connection: events in, look-ups out, pictures on demand.
/// Threads: the X thread.
/// Errors:  those of X11Connection; after Unanswered it can go on, after Lost it is to be destroyed.
class X11Session {
public:
    /// How long a compositor may lag behind the stack; measured, see docs/platforms.md.
    static constexpr std::chrono::nanoseconds COMPOSITOR_LAG = std::chrono::milliseconds(700);
    /// For how long pictures are taken without a word to the server, as long as it has nothing to tell: a
    /// server that stands still is found out so late, and so is a pointer that a client has warped.
    static constexpr std::chrono::nanoseconds QUIET_LIMIT = std::chrono::seconds(1);

    X11Session(X11Connection& connection, Memory& memory, ApplicationWatch& applications,
               SessionListener& listener);

    /// Reads everything and tells it.
    void Begin();
    /// Takes in the events that are here and tells what is new.
    void CatchUp(EventsFrom from);
    /// Sending may have read more: if so, something is due at once. To be called before anybody sleeps.
    void NoteLateEvents();
    std::optional<std::chrono::nanoseconds> NextDue() const;
    void DoDue();
    /// Grows with each event that was taken in.
    std::uint64_t EventsSoFar() const { return m_events; }
    /// What else than the connection is to be waited on. When one is readable, DoDue has something to do.
    std::vector<int> Descriptors() const { return m_applications.Descriptors(); }
    void OnDescriptorReady() { m_processEnded = true; }

    /// The moment that what has been told is of, if nothing need be asked to know that; NoteLateEvents comes
    /// first.
    MomentSpan Moment() const;
    /// Work has failed half way.
    void EndMoment() { m_moment = 0; }

    Availability GetCapability(Capability capability) const;
    std::optional<CGPoint> PointerPosition(); ///< In points.
    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request);
    void AttachReader(const StreamReaderPtr& reader);
    void DetachReader(const StreamReaderPtr& reader);
    DisplayPictureResult TakeNewest(StreamReader& reader);
    bool BringToFront(pid_t pid);

    /// For what is reported to people: window manager, compositor, extensions.
    bool IsComposited() const { return m_composited; }

private:
    void WatchCompositor();
    void ReadCompositor();
    void SetComposited(bool composited);
    void Dispatch(const xcb_generic_event_t& event);
    void Drain(EventsFrom from);
    void Settle();
    void NoteGeneration();
    void Publish();
    void PublishDisplays();
    void UpdateApplications();
    void ReapApplications(std::chrono::nanoseconds now);
    std::optional<CGPoint> InPoints(const std::optional<CGPoint>& ofRoot) const;
    bool IsQuiet() const;
    void NameMoment(TakenPicture& taken);
    std::optional<CGPoint> AskedPosition();
    std::optional<CGPoint> AskForPointer();
    std::uint64_t OldestShown();
    bool IsPainted(CGDirectDisplayID display);

    X11Connection& m_connection;
    Memory& m_memory;
    ApplicationWatch& m_applications;
    SessionListener& m_listener;
    WindowStorages m_storages;
    WindowTree m_tree;
    DisplayMirror m_displays;
    DisplayStreams m_streams;
    PointerWatch m_pointer;
    bool m_composited = false;
    bool m_compositorUnknown = false; // another one may be there, or none
    std::uint64_t m_events = 0;
    // When a picture was last begun with a question that the server has answered, and what had come by then.
    // Nothing on a clock that is moved by hand.
    std::optional<std::chrono::nanoseconds> m_lastAnswered;
    std::uint64_t m_eventsAnswered = 0;
    bool m_unfinished = false; // more came than was taken in
    // Of what has been told and taken since it was named; 0 for none, as whenever anything changes.
    std::uint64_t m_moment = 0;
    std::chrono::nanoseconds m_momentEnds{0}; // by what its pictures show
    std::uint64_t m_treeRevision = 0;
    std::vector<ApplicationWindow> m_applicationWindows;
    bool m_processEnded = false;
    std::optional<std::chrono::nanoseconds> m_nextReap; // where processes can't be waited for
    std::optional<std::chrono::nanoseconds> m_nextDrop;
    std::chrono::nanoseconds m_lastTake{0};
    /// When which generation came into force; the newest last.
    std::deque<std::pair<std::chrono::nanoseconds, std::uint64_t>> m_generations;
    // What has been told.
    std::shared_ptr<const DisplayList> m_toldDisplays;
    std::shared_ptr<const WindowSnapshot> m_toldWindows;
    std::shared_ptr<const ApplicationList> m_toldApplications;
    std::shared_ptr<const CursorImage> m_toldCursor;
};

} // namespace platform::x11
