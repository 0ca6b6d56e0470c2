// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_session.h"

#include "util/cm_clock.h"
#include "util/cm_numeric.h"

#include <xcb/xfixes.h>

#include <algorithm>

namespace platform::x11 {

namespace {

using Nanoseconds = std::chrono::nanoseconds;

/// Events that don't end are taken in by so many turns; then others get theirs.
constexpr int MOST_TURNS = 8;
/// How often processes are looked after that can't be waited for.
constexpr Nanoseconds REAP_PERIOD = std::chrono::seconds(1);
/// Memory of streams that has lain idle for so long is let go.
constexpr Nanoseconds IDLE_TIME = std::chrono::seconds(5);

/// The earlier of two times that may not be there.
void TakeEarlier(std::optional<Nanoseconds>& time, const std::optional<Nanoseconds>& other) {
    if (other && (!time || *other < *time))
        time = other;
}

bool IsOrdinary(const TopLevel& window) {
    const bool peopleWorkInIt = window.type == WindowType::Normal || window.type == WindowType::Unset;
    return window.managed && peopleWorkInIt && !window.overrideRedirect;
}

bool AreAlike(const ApplicationWindow& one, const ApplicationWindow& other) {
    return one.pid == other.pid && one.windowClass == other.windowClass && one.ordinary == other.ordinary;
}

} // namespace

X11Session::X11Session(X11Connection& connection, Memory& memory, ApplicationWatch& applications,
                       SessionListener& listener)
    : m_connection(connection),
      m_memory(memory),
      m_applications(applications),
      m_listener(listener),
      m_storages(connection),
      m_tree(connection, memory, m_storages),
      m_displays(connection, memory),
      m_streams(connection),
      m_pointer(connection, memory) {}

// ---- Beginning

void X11Session::Begin() {
    WatchCompositor();
    ReadCompositor();
    m_tree.Select();
    m_displays.Select();
    m_pointer.Select();
    m_displays.Read();
    m_tree.SetDisplays(*m_displays.Displays(), m_displays.Origin());
    // A compositor may show what was there before us for a while.
    m_generations.emplace_back(Nanoseconds::min(), m_memory.generation);
    {
        const ServerGrab grab(m_connection);
        m_storages.Redirect(m_composited);
        m_tree.Begin();
    }
    m_pointer.Read();
    CatchUp(EventsFrom::Socket);
}

/// A compositor tells that it is there by owning a selection.
void X11Session::WatchCompositor() {
    if (!m_connection.Has().xfixes)
        return;
    xcb_xfixes_select_selection_input(m_connection.Get(), m_connection.Root(),
                                      m_connection.Atom(AtomName::NET_WM_CM_S0),
                                      XCB_XFIXES_SELECTION_EVENT_MASK_SET_SELECTION_OWNER |
                                          XCB_XFIXES_SELECTION_EVENT_MASK_SELECTION_WINDOW_DESTROY |
                                          XCB_XFIXES_SELECTION_EVENT_MASK_SELECTION_CLIENT_CLOSE);
}

void X11Session::ReadCompositor() {
    const auto reply = m_connection.Fetch<xcb_get_selection_owner_reply_t>(
        xcb_get_selection_owner(m_connection.Get(), m_connection.Atom(AtomName::NET_WM_CM_S0)));
    m_compositorUnknown = false;
    SetComposited(reply != nullptr && reply->owner != XCB_WINDOW_NONE);
}

void X11Session::SetComposited(bool composited) {
    m_composited = composited;
    m_tree.SetComposited(composited);
    m_storages.SetComposited(composited);
}

// ---- Events in

void X11Session::Dispatch(const xcb_generic_event_t& event) {
    ++m_events;
    EndMoment();
    const std::uint8_t fixes = m_connection.Has().xfixesEvent;
    if (fixes != 0 && (event.response_type & 0x7F) == fixes + XCB_XFIXES_SELECTION_NOTIFY) {
        m_compositorUnknown = true;
        return;
    }
    // Each may have to do with it.
    m_tree.OnEvent(event);
    m_displays.OnEvent(event);
    if (m_storages.OnEvent(event) || m_streams.OnEvent(event))
        return;
    if (m_pointer.OnEvent(event))
        m_streams.OnPointerChanged();
}

void X11Session::Drain(EventsFrom from) {
    const bool reads = from == EventsFrom::Socket;
    while (const Event event = reads ? m_connection.NextEvent() : m_connection.NextQueuedEvent())
        Dispatch(*event);
    NoteGeneration();
}

void X11Session::NoteGeneration() {
    if (m_generations.empty() || m_generations.back().second != m_tree.Generation())
        m_generations.emplace_back(CmSteadyNow(), m_tree.Generation());
    // Without a compositor nobody reads them.
    const Nanoseconds shown = CmSteadyNow() - COMPOSITOR_LAG;
    while (m_generations.size() > 1 && m_generations[1].first <= shown)
        m_generations.pop_front();
}

/// Of the oldest stack that the screen may still show.
std::uint64_t X11Session::OldestShown() {
    NoteGeneration();
    return m_composited ? m_generations.front().second : m_tree.Generation();
}

/// Whether the screen shows windows' own pixels there and nothing of what lies behind them.
bool X11Session::IsPainted(CGDirectDisplayID display) {
    const CGPoint origin = m_displays.Origin();
    for (const DisplayInfo& each : *m_displays.Displays()) {
        if (each.id != display)
            continue;
        const int left = CmTruncate(each.bounds.origin.x + origin.x);
        const int top = CmTruncate(each.bounds.origin.y + origin.y);
        const PixelRect place{left, top, left + CmTruncate(each.bounds.size.width),
                              top + CmTruncate(each.bounds.size.height)};
        if (!m_storages.ArePainted(place, m_tree, [this] { Drain(EventsFrom::Socket); }))
            return false;
    }
    return !m_composited || m_storages.LastPainted() <= CmSteadyNow() - COMPOSITOR_LAG;
}

/// Finds out what events have left unknown.
void X11Session::Settle() {
    if (m_compositorUnknown)
        ReadCompositor();
    m_tree.Settle();
    m_pointer.Settle();
}

void X11Session::CatchUp(EventsFrom from) {
    // What is waited for brings more events with it, and nobody may sleep while there are any.
    m_unfinished = true;
    Drain(from);
    for (int turn = 0; turn < MOST_TURNS && m_unfinished; ++turn) {
        Settle();
        const Event next = m_connection.NextQueuedEvent();
        m_unfinished = next != nullptr;
        if (next == nullptr)
            break;
        Dispatch(*next);
        Drain(from);
    }
    Publish();
}

void X11Session::NoteLateEvents() {
    const Event event = m_connection.NextQueuedEvent();
    if (event == nullptr)
        return;
    m_unfinished = true;
    Dispatch(*event);
}

// ---- Views out

void X11Session::Publish() {
    if (m_tree.Revision() != m_treeRevision) {
        m_displays.SetStruts(m_tree.Struts());
        UpdateApplications();
    }
    PublishDisplays();
    m_treeRevision = m_tree.Revision();
    if (const auto windows = m_tree.Snapshot(); windows != m_toldWindows) {
        m_toldWindows = windows;
        EndMoment();
        m_listener.OnWindows(windows);
    }
    if (const auto applications = m_applications.Applications(); applications != m_toldApplications) {
        m_toldApplications = applications;
        EndMoment();
        m_listener.OnApplications(applications);
    }
    if (const auto cursor = m_pointer.Cursor(); cursor != m_toldCursor) {
        m_toldCursor = cursor;
        EndMoment();
        m_listener.OnCursor(cursor);
    }
    NoteGeneration();
}

void X11Session::PublishDisplays() {
    const std::shared_ptr<const DisplayList> displays = m_displays.Displays();
    m_tree.SetDisplays(*displays, m_displays.Origin());
    if (displays == m_toldDisplays)
        return;
    m_toldDisplays = displays;
    EndMoment();
    m_streams.OnDisplaysChanged(*displays);
    m_listener.OnDisplays(displays);
}

void X11Session::UpdateApplications() {
    std::vector<ApplicationWindow> windows;
    for (const TopLevel* const window : m_tree.FrontFirst()) {
        if (window->IsListed() && window->owner != 0)
            windows.push_back({window->owner, window->windowClass, IsOrdinary(*window)});
    }
    if (std::equal(windows.begin(), windows.end(), m_applicationWindows.begin(), m_applicationWindows.end(),
                   AreAlike) &&
        m_toldApplications != nullptr)
        return;
    m_applicationWindows = std::move(windows);
    m_applications.Update(m_applicationWindows);
}

// ---- In time

std::optional<Nanoseconds> X11Session::NextDue() const {
    if (m_unfinished)
        return CmSteadyNow();
    std::optional<Nanoseconds> due = m_displays.NextDue();
    TakeEarlier(due, m_storages.NextDue());
    TakeEarlier(due, m_streams.NextDue());
    TakeEarlier(due, m_nextReap);
    TakeEarlier(due, m_nextDrop);
    return due;
}

void X11Session::DoDue() {
    const Nanoseconds now = CmSteadyNow();
    m_displays.DoDue();
    if (m_storages.DoDue())
        EndMoment();
    ReapApplications(now);
    Publish();
    m_streams.DoDue([this](std::uint64_t stream) { m_listener.OnStreamPicture(stream); });
    if (!m_nextDrop || now < *m_nextDrop)
        return;
    m_streams.Drop(now - IDLE_TIME);
    m_nextDrop.reset();
    if (now < m_lastTake + IDLE_TIME)
        m_nextDrop = m_lastTake + IDLE_TIME;
}

void X11Session::ReapApplications(Nanoseconds now) {
    if (std::exchange(m_processEnded, false) || (m_nextReap && now >= *m_nextReap)) {
        m_applications.Reap();
        m_nextReap.reset();
    }
    if (!m_applications.NeedsPolling())
        m_nextReap.reset();
    else if (!m_nextReap)
        m_nextReap = now + REAP_PERIOD;
}

// ---- Operations

Availability X11Session::GetCapability(Capability capability) const {
    const Extensions& has = m_connection.Has();
    bool can = true;
    if (capability == Capability::WindowImages)
        can = has.composite && has.damage && has.xfixes;
    else if (capability == Capability::Streams)
        can = has.damage;
    else if (capability == Capability::Cursor)
        can = has.xfixes;
    return can ? Availability::Yes : Availability::No;
}

std::optional<CGPoint> X11Session::InPoints(const std::optional<CGPoint>& ofRoot) const {
    if (!ofRoot)
        return std::nullopt;
    return CGPoint{ofRoot->x - m_displays.Origin().x, ofRoot->y - m_displays.Origin().y};
}

std::optional<CGPoint> X11Session::PointerPosition() {
    return InPoints(AskedPosition());
}

/// Whoever hears that a client has warped the pointer finds it there in the next picture, too.
std::optional<CGPoint> X11Session::AskedPosition() {
    const std::optional<CGPoint> position = m_pointer.Position();
    if (position != m_pointer.PositionSoFar()) {
        EndMoment();
        m_lastAnswered.reset();
    }
    return position;
}

/// Whether what is known is all that there is to know: nothing has come since the server last answered, which
/// isn't long ago, and a pointer that moves would be told.
bool X11Session::IsQuiet() const {
    return m_lastAnswered && m_events == m_eventsAnswered && m_pointer.PositionSoFar() &&
           CmCurrentClock().RunsByItself() && CmSteadyNow() < *m_lastAnswered + QUIET_LIMIT;
}

/// What was painted before the question has been heard of then, and a server that doesn't answer gives no
/// pictures, not even of what needn't be fetched.
std::optional<CGPoint> X11Session::AskForPointer() {
    const bool isTimed = CmCurrentClock().RunsByItself();
    const Nanoseconds asked = CmSteadyNow();
    m_eventsAnswered = m_events;
    m_lastAnswered.reset();
    const PointerWatch::BytesAhead ahead = m_storages.AskAhead();
    const std::optional<CGPoint> pointerSoFar = m_pointer.PositionSoFar();
    const std::optional<CGPoint> pointer = m_pointer.WatchedPosition(ahead);
    if (pointer != pointerSoFar)
        EndMoment();
    if (isTimed)
        m_lastAnswered = asked;
    CatchUp(EventsFrom::Answers);
    return pointer;
}

WindowPictureResult X11Session::TakeWindowPicture(const WindowPictureRequest& request) {
    CatchUp(EventsFrom::Socket);
    const std::optional<CGPoint> pointer = IsQuiet() ? m_pointer.PositionSoFar() : AskForPointer();
    TakenPicture taken =
        m_storages.Take(request, m_tree, InPoints(pointer), [this] { Drain(EventsFrom::Answers); });
    const std::uint64_t events = m_events;
    // Whoever has the picture finds the snapshot that it shows.
    CatchUp(EventsFrom::Answers);
    if (m_events == events)
        NameMoment(taken);
    return {taken.outcome, std::move(taken.picture)};
}

/// Pictures of others who ask keep the moment that they have, as long as this one has changed nothing for
/// them.
void X11Session::NameMoment(TakenPicture& taken) {
    if (taken.hasFetched)
        EndMoment();
    if (taken.picture == nullptr || !taken.standsUntil || *taken.standsUntil <= CmSteadyNow())
        return;
    if (m_moment == 0 || CmSteadyNow() >= m_momentEnds) {
        m_moment = NewMoment();
        m_momentEnds = *taken.standsUntil;
    }
    m_momentEnds = std::min(m_momentEnds, *taken.standsUntil);
    taken.picture->moment = Moment().moment;
}

MomentSpan X11Session::Moment() const {
    if (m_moment == 0 || m_unfinished || !m_tree.IsSettled() || !IsQuiet())
        return {};
    return {m_moment, std::min(m_momentEnds, *m_lastAnswered + QUIET_LIMIT)};
}

void X11Session::AttachReader(const StreamReaderPtr& reader) {
    if (reader->gone)
        return;
    m_streams.Attach(reader);
    m_streams.OnDisplaysChanged(*m_displays.Displays());
}

void X11Session::DetachReader(const StreamReaderPtr& reader) {
    m_streams.Detach(reader);
}

DisplayPictureResult X11Session::TakeNewest(StreamReader& reader) {
    CatchUp(EventsFrom::Socket);
    StreamMoment moment;
    const std::shared_ptr<const DisplayList> displays = m_displays.Displays();
    moment.displays = displays.get();
    moment.origin = m_displays.Origin();
    if (reader.request.withPointer)
        moment.pointer = AskedPosition();
    moment.cursor = m_pointer.Cursor();
    const bool isKnown = IsPainted(reader.request.display) && !m_tree.ShowsUnlisted();
    moment.generationBefore = isKnown ? OldestShown() : 0;
    moment.generation = m_tree.Generation();
    moment.generationAfter = [this] {
        Drain(EventsFrom::Socket);
        return m_tree.Generation();
    };
    m_lastTake = CmSteadyNow();
    if (!m_nextDrop)
        m_nextDrop = m_lastTake + IDLE_TIME;
    DisplayPictureResult result = m_streams.Take(reader, moment);
    Publish();
    return result;
}

bool X11Session::BringToFront(pid_t pid) {
    EndMoment();
    CatchUp(EventsFrom::Socket);
    return ActivateWindowsOf(m_connection, m_tree, pid);
}

} // namespace platform::x11
