// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_worker.h"

#include "platform/x11/x11_failure.h"
#include "platform/x11/x11_patience.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <sys/eventfd.h>
#include <sys/socket.h>

#include <algorithm>
#include <cstdint>
#include <ctime>
#include <utility>
#include <vector>

namespace platform::x11 {

namespace {

using namespace std::chrono_literals;

constexpr std::chrono::milliseconds FIRST_BACK_OFF = 100ms;
constexpr std::chrono::milliseconds LONGEST_BACK_OFF = 5s;

/// How long the server may take to answer what nobody waits for.
constexpr std::chrono::nanoseconds PATIENCE = 1s;
/// A clock that is moved by hand doesn't wake a poll.
constexpr std::chrono::nanoseconds MANUAL_SLICE = 20ms;
constexpr std::chrono::nanoseconds ENDLESS = 1h;

constexpr Capability CAPABILITIES[] = {
    Capability::Windows, Capability::WindowImages, Capability::Streams,   Capability::Pointer,
    Capability::Cursor,  Capability::Applications, Capability::Activation};

OwnedDescriptor NewEvents() {
    return OwnedDescriptor(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
}

void Drain(const OwnedDescriptor& events) {
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t got = read(events.Get(), &count, sizeof count);
}

timespec SpanOf(std::chrono::nanoseconds time) {
    const auto seconds = std::chrono::floor<std::chrono::seconds>(time);
    return {static_cast<time_t>(seconds.count()), static_cast<long>((time - seconds).count())};
}

} // namespace

std::shared_ptr<X11Worker> X11Worker::Start(HubState& hub, const std::string& display) {
    auto worker = std::make_shared<X11Worker>(hub, display);
    if (!worker->m_stops || !worker->m_wakes || !worker->m_arrivals)
        return nullptr;
    hub.BeginPhase(HubState::Phase::Connecting, worker->m_wakes.Get(), hub.point.Acquire());
    if (worker->Create("scn-x11", 0, 0, 0) == 0)
        return worker;
    hub.BeginPhase(HubState::Phase::AtRest, -1, hub.point.Acquire());
    return nullptr;
}

X11Worker::X11Worker(HubState& hub, const std::string& display)
    : m_hub(hub),
      m_display(display),
      m_stops(NewEvents()),
      m_wakes(NewEvents()),
      m_backOff(FIRST_BACK_OFF) {}

void X11Worker::End() {
    Stop(nullptr);
    const std::uint64_t one = 1;
    [[maybe_unused]] const ssize_t written = write(m_stops.Get(), &one, sizeof one);
    {
        const std::lock_guard<std::mutex> lock(m_socketMutex);
        if (m_socket >= 0)
            shutdown(m_socket, SHUT_RDWR);
    }
    Join();
}

int X11Worker::OnThreadRun() {
    while (!GetStopFlag()) {
        if (m_session)
            ServeGuarded();
        else
            Connect();
    }
    EndSession();
    return 0;
}

// ---- Finding the server

void X11Worker::Connect() {
    bool connected = false;
    CmCallGuarded("[X11Worker::Connect]>>exception: ", [&] {
        if (std::exchange(m_lossUntold, false))
            m_hub.OnLost();
        connected = BeginSession();
    });
    if (connected)
        return;
    EndSession();
    if (!GetStopFlag())
        CmCallGuarded("[X11Worker::Connect]>>exception: ", [&] { m_hub.OnLost(); });
    Pause();
}

/// False when there is no server, or none that answers.
bool X11Worker::BeginSession() {
    try {
        Link link = ConnectToDisplay(m_display, CmSteadyNow() + DEFAULT_CONNECT_DEADLINE, m_stops.Get());
        if (link.connection == nullptr)
            return false;
        m_connection.emplace(std::move(link), m_stops.Get());
        NoteSocket(m_connection->Descriptor());
        m_ticket = m_hub.moment.End();
        if (!m_arrivals.Open(m_connection->Descriptor()))
            return false;
        m_connection->SetDeadline(CmSteadyNow() + DEFAULT_CONNECT_DEADLINE);
        m_connection->Introduce();
        m_view = View();
        m_publishes = false;
        const std::string serverBefore = m_hub.memory.serverMark;
        SessionListener& listener = *this;
        m_session.emplace(*m_connection, m_hub.memory, m_hub.applications, listener);
        m_session->Begin();
        for (const Capability capability : CAPABILITIES)
            m_view.capabilities[static_cast<std::size_t>(capability)] = m_session->GetCapability(capability);
        m_hub.OnConnected(m_view, m_hub.memory.serverMark == serverBefore);
        m_publishes = true;
        for (const StreamReaderPtr& reader : m_hub.LivingReaders())
            m_session->AttachReader(reader);
    } catch (const Lost&) {
        return false;
    } catch (const Unanswered&) {
        return false;
    }
    CmTraceInfo("[X11Worker::BeginSession]>>connected, composited=", m_session->IsComposited() ? 1 : 0);
    return true;
}

/// Before the next try; in real time, since nobody moves a clock by hand to find a server.
void X11Worker::Pause() {
    pollfd wait{m_stops.Get(), POLLIN, 0};
    poll(&wait, 1, static_cast<int>(m_backOff.count()));
    m_backOff = std::min(2 * m_backOff, LONGEST_BACK_OFF);
}

void X11Worker::EndSession() {
    m_hub.moment.End(); // it looks at the socket
    m_question = {};
    m_asked = false;
    m_failure = nullptr;
    m_session.reset();
    NoteSocket(-1);
    m_arrivals.Close();
    m_connection.reset();
}

void X11Worker::NoteSocket(int socket) {
    const std::lock_guard<std::mutex> lock(m_socketMutex);
    m_socket = socket;
}

void X11Worker::Lose() {
    EndSession();
    m_backOff = FIRST_BACK_OFF;
    m_lossUntold = true;
    CmTraceWarning("[X11Worker::Lose]>>the X server is gone");
    CmCallGuarded("[X11Worker::Lose]>>exception: ", [&] {
        m_hub.OnLost();
        m_lossUntold = false;
    });
    Pause();
}

// ---- Serving

void X11Worker::ServeGuarded() {
    try {
        if (m_hub.IsStalled())
            ServeStalled();
        else
            Serve();
        return;
    } catch (const Unanswered&) {
        if (!GetStopFlag())
            CmCallGuarded("[X11Worker::ServeGuarded]>>exception: ", [&] { m_hub.OnStalled(); });
        return;
    } catch (const Lost&) { // NOLINT(bugprone-empty-catch): told below
    } catch (const std::exception& error) {
        // What the session believes may be half of a change, so it begins anew.
        CmTraceError("[X11Worker::ServeGuarded]>>exception: ", error.what());
    }
    // Whoever ends us breaks the connection.
    if (!GetStopFlag())
        Lose();
}

void X11Worker::Serve() {
    RunCommands();
    m_connection->SetDeadline(CmSteadyNow() + PATIENCE);
    m_session->DoDue();
    CatchUp(std::exchange(m_isReadable, false) ? EventsFrom::Socket : EventsFrom::Answers);
    Wait();
}

void X11Worker::CatchUp(EventsFrom from) {
    m_session->CatchUp(from);
    m_connection->Flush();
    m_session->NoteLateEvents();
}

/// Asks one thing, and nothing more until it is answered: what a server that is stopped doesn't take in has
/// no room in the socket.
void X11Worker::ServeStalled() {
    m_session->EndMoment();
    if (!m_asked) {
        m_question = m_connection->Ask<xcb_get_input_focus_reply_t>(xcb_get_input_focus(m_connection->Get()));
        m_asked = true;
    }
    m_connection->SetDeadline(CmSteadyNow());
    bool sent = true;
    try {
        m_connection->Flush();
    } catch (const Unanswered&) {
        sent = false;
    }
    bool answered = false;
    m_connection->PollReply(m_question, answered);
    if (!answered)
        return WaitForServer(sent ? POLLIN : POLLIN | POLLOUT);
    m_asked = false;
    m_connection->SetDeadline(CmSteadyNow() + PATIENCE);
    m_session->CatchUp(EventsFrom::Socket);
    m_hub.OnAnswering();
}

void X11Worker::RunCommands() {
    while (const CommandPtr command = m_hub.TakeCommand())
        RunCommand(command);
}

void X11Worker::RunCommand(const CommandPtr& command) {
    // However it ends, somebody waits for it.
    PictureOutcome outcome = PictureOutcome::Failed;
    const auto finish = [&] { m_hub.Finish(command, outcome); };
    try {
        if (Perform(command->work, command->deadline.value_or(CmSteadyNow() + PATIENCE)))
            outcome = PictureOutcome::Ok;
    } catch (const Lost&) {
        outcome = PictureOutcome::Lost;
        finish();
        throw;
    } catch (const Unanswered&) {
        outcome = GetStopFlag() ? PictureOutcome::Lost : PictureOutcome::Timeout;
        finish();
        throw;
    }
    finish();
}

/// False when it has failed by itself.
bool X11Worker::Perform(const X11Hub::Work& work, Nanoseconds deadline) {
    m_connection->SetDeadline(deadline);
    try {
        work(*m_session);
        return true;
    } catch (const Lost&) {
        throw;
    } catch (const Unanswered&) {
        throw;
    } catch (const std::exception& error) {
        m_session->EndMoment();
        CmTraceError("[X11Worker::Perform]>>exception: ", error.what());
        return false;
    }
}

// ---- Lending

/// The thread sleeps meanwhile, and what it would do after the work is done here.
Borrowing X11Worker::RunForBorrower(Nanoseconds deadline, const X11Hub::Work& work) {
    Borrowing borrowing;
    const StandingMoment::Ticket ticket = m_hub.moment.End();
    const std::uint64_t events = m_session->EventsSoFar();
    try {
        if (!m_arrivals.BeginUse())
            CmTraceWarning("[X11Worker::RunForBorrower]>>can't be undisturbed");
        if (Perform(work, deadline))
            borrowing.outcome = PictureOutcome::Ok;
        CatchUp(EventsFrom::Answers);
        borrowing.isToBeSeenTo = HasMoreToDo(events);
    } catch (const Unanswered&) {
        m_session->EndMoment();
        if (borrowing.outcome != PictureOutcome::Ok)
            borrowing.outcome = GetStopFlag() ? PictureOutcome::Lost : PictureOutcome::Timeout;
        borrowing.isUnanswered = !GetStopFlag();
    } catch (...) {
        if (borrowing.outcome != PictureOutcome::Ok)
            borrowing.outcome = PictureOutcome::Lost;
        m_failure = std::current_exception();
        borrowing.isToBeSeenTo = true;
    }
    if (!m_arrivals.EndUse()) {
        m_failure = std::make_exception_ptr(Lost());
        borrowing.isToBeSeenTo = true;
    }
    if (borrowing.outcome == PictureOutcome::Ok && !m_failure)
        LetMomentStand(ticket);
    return borrowing;
}

/// Whoever does so lets go of the connection now.
void X11Worker::LetMomentStand(StandingMoment::Ticket ticket) {
    m_hub.moment.Stand(ticket, m_session->Moment(), m_connection->Descriptor(), m_arrivals);
}

/// Something is due before the thread wakes up, or it has other things to wait on.
bool X11Worker::HasMoreToDo(std::uint64_t eventsBefore) const {
    const std::optional<Nanoseconds> due = m_session->NextDue();
    return (due && *due < m_wakeTime) ||
           (m_session->EventsSoFar() != eventsBefore && m_session->Descriptors() != m_waitedOn);
}

// ---- Sleeping

void X11Worker::Wait() {
    const Nanoseconds longest = TimeToNextDue();
    if (longest <= Nanoseconds::zero())
        return;
    std::vector<pollfd> waits = ServerWaits(POLLIN);
    waits[0].fd = m_arrivals.Descriptor();
    const auto ofSession = static_cast<std::ptrdiff_t>(waits.size());
    m_waitedOn = m_session->Descriptors();
    for (const int descriptor : m_waitedOn)
        waits.push_back({descriptor, POLLIN, 0});
    m_wakeTime = m_session->NextDue().value_or(Nanoseconds::max());
    LetMomentStand(m_ticket);
    m_hub.Lend(*this);
    WaitFor(waits, longest);
    m_hub.TakeBack();
    m_ticket = m_hub.moment.End();
    if (m_isReadable && !m_arrivals.Listen())
        throw Lost();
    if (m_failure)
        std::rethrow_exception(std::exchange(m_failure, nullptr));
    if (std::any_of(waits.begin() + ofSession, waits.end(),
                    [](const pollfd& wait) { return wait.revents != 0; }))
        m_session->OnDescriptorReady();
}

X11Worker::Nanoseconds X11Worker::TimeToNextDue() const {
    const std::optional<Nanoseconds> due = m_session->NextDue();
    if (!due)
        return ENDLESS;
    const ICmClock& clock = CmCurrentClock();
    const Nanoseconds now = clock.SteadyNow();
    if (*due <= now)
        return Nanoseconds::zero();
    return std::min(*due - now, clock.RunsByItself() ? ENDLESS : MANUAL_SLICE);
}

std::vector<pollfd> X11Worker::ServerWaits(short events) const {
    return {{m_connection->Descriptor(), events, 0}, {m_stops.Get(), POLLIN, 0}, {m_wakes.Get(), POLLIN, 0}};
}

void X11Worker::WaitForServer(short events) {
    std::vector<pollfd> waits = ServerWaits(events);
    WaitFor(waits, ENDLESS);
}

void X11Worker::WaitFor(std::vector<pollfd>& waits, Nanoseconds longest) {
    const timespec span = SpanOf(longest);
    if (ppoll(waits.data(), waits.size(), &span, nullptr) <= 0)
        return;
    m_isReadable = waits[0].revents != 0;
    if (waits[2].revents != 0)
        Drain(m_wakes);
}

// ---- What the session tells

void X11Worker::Publish() {
    if (m_publishes)
        m_hub.Publish(m_view);
}

void X11Worker::OnDisplays(std::shared_ptr<const DisplayList> displays) {
    m_view.displays = std::move(displays);
    Publish();
}

void X11Worker::OnWindows(std::shared_ptr<const WindowSnapshot> windows) {
    m_view.windows = std::move(windows);
    Publish();
}

void X11Worker::OnApplications(std::shared_ptr<const ApplicationList> applications) {
    m_view.applications = std::move(applications);
    Publish();
}

void X11Worker::OnCursor(std::shared_ptr<const CursorImage> cursor) {
    m_view.cursor = std::move(cursor);
    Publish();
}

} // namespace platform::x11
