// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_hub.h"

#include "platform/x11/x11_hub_state.h"
#include "platform/x11/x11_session.h"
#include "platform/x11/x11_worker.h"
#include "util/cm_guarded_call.h"

#include <pthread.h>

#include <algorithm>
#include <csignal>
#include <utility>

namespace platform::x11 {

namespace {

using Lock = HubState::Lock;
using Phase = HubState::Phase;

/// Our own threads have it so. A client's may not, and would end its process when it writes to a connection
/// that has just been closed.
bool IsBrokenPipeBlocked() {
    sigset_t blocked;
    sigemptyset(&blocked);
    return pthread_sigmask(SIG_BLOCK, nullptr, &blocked) == 0 && sigismember(&blocked, SIGPIPE) == 1;
}

} // namespace

std::shared_ptr<X11Hub> X11Hub::Share(std::string display) {
    return std::shared_ptr<X11Hub>(new X11Hub(std::move(display)), [](const X11Hub* hub) {
        if (!hub->InForkedChild())
            delete hub;
    });
}

X11Hub::X11Hub(std::string display) : m_display(std::move(display)), m_state(std::make_unique<HubState>()) {}

X11Hub::~X11Hub() {
    Close();
}

// ---- Looking

/// False when there is no view: it is closed, can't be started, or the deadline passes before the first try
/// to connect is over.
bool X11Hub::AwaitSettled(Lock& lock, Nanoseconds deadline) {
    if (m_state->PhaseNow(lock) == Phase::Settled)
        return !m_state->IsClosed(lock);
    const Nanoseconds end = std::min(deadline, CmSteadyNow() + DEFAULT_CONNECT_DEADLINE);
    while (!m_state->IsClosed(lock) && m_state->PhaseNow(lock) != Phase::Settled) {
        if (m_state->PhaseNow(lock) == Phase::AtRest) {
            lock.unlock();
            const bool isStarted = StartThread();
            lock.lock();
            if (!isStarted)
                return false;
        } else if (CmSteadyNow() < end) {
            m_state->point.WaitUntil(lock, end);
        } else {
            return false;
        }
    }
    return !m_state->IsClosed(lock);
}

/// Of the view; where there is none, of a lost one.
template <class Part>
auto X11Hub::LookAt(Part part) -> decltype(part(std::declval<const View&>())) {
    if (!InForkedChild()) {
        Lock lock = m_state->point.Acquire();
        if (AwaitSettled(lock, Nanoseconds::max()))
            return part(m_state->Now(lock));
    }
    View lost = m_lost;
    lost.life.epoch = m_state->Epoch();
    return part(lost);
}

View X11Hub::Look() {
    return LookAt([](const View& view) { return view; });
}

LifeState X11Hub::Life() {
    return LookAt([](const View& view) { return view.life; });
}

Availability X11Hub::Of(Capability capability) {
    return LookAt([capability](const View& view) { return view.Of(capability); });
}

std::shared_ptr<const DisplayList> X11Hub::Displays() {
    return LookAt([](const View& view) { return view.displays; });
}

std::shared_ptr<const WindowSnapshot> X11Hub::Windows() {
    return LookAt([](const View& view) { return view.windows; });
}

std::shared_ptr<const ApplicationList> X11Hub::Applications() {
    return LookAt([](const View& view) { return view.applications; });
}

std::shared_ptr<const CursorImage> X11Hub::Cursor() {
    return LookAt([](const View& view) { return view.cursor; });
}

std::uint64_t X11Hub::Moment() const {
    return InForkedChild() ? 0 : m_state->moment.Get();
}

/// False when there is none and none can be started. Also true when another one has ended it meanwhile.
bool X11Hub::StartThread() {
    const std::lock_guard<std::mutex> threads(m_state->threadMutex);
    if (m_state->thread != nullptr)
        return true;
    if (m_state->IsClosed(m_state->point.Acquire()))
        return false;
    return CmCallGuarded("[X11Hub::StartThread]>>exception: ",
                         [&] { m_state->thread = X11Worker::Start(*m_state, m_display); }) &&
           m_state->thread != nullptr;
}

// ---- Work

/// Why work can't be run; nothing when it can.
std::optional<PictureOutcome> X11Hub::WhyNot(Lock& lock, Nanoseconds deadline) {
    AwaitSettled(lock, deadline);
    if (m_state->IsLost(lock))
        return PictureOutcome::Lost;
    if (CmSteadyNow() >= deadline)
        return PictureOutcome::Timeout;
    if (!m_state->IsAlive(lock))
        return PictureOutcome::Lost;
    return std::nullopt;
}

PictureOutcome X11Hub::Run(Nanoseconds deadline, Work work) {
    if (InForkedChild())
        return PictureOutcome::Lost;
    const auto command = std::make_shared<Command>();
    command->work = std::move(work);
    command->deadline = deadline;
    Lock lock = m_state->point.Acquire();
    if (const std::optional<PictureOutcome> reason = WhyNot(lock, deadline))
        return *reason;
    const std::uint64_t epoch = m_state->Epoch();
    const PictureOutcome outcome = RunThere(lock, command);
    AwaitTelling(lock, outcome, epoch, deadline);
    return outcome;
}

PictureOutcome X11Hub::RunHereOrThere(Nanoseconds deadline, const Work& work) {
    if (InForkedChild())
        return PictureOutcome::Lost;
    ConnectionLender* lender = nullptr;
    std::uint64_t epoch = 0;
    if (IsBrokenPipeBlocked()) {
        Lock lock = m_state->point.Acquire();
        if (const std::optional<PictureOutcome> reason = WhyNot(lock, deadline))
            return *reason;
        lender = m_state->Borrow(lock);
        epoch = m_state->Epoch();
    }
    if (lender == nullptr)
        return Run(deadline, work);
    const Borrowing borrowing = lender->RunForBorrower(deadline, work);
    m_state->GiveBack(borrowing);
    Lock lock = m_state->point.Acquire();
    AwaitTelling(lock, borrowing.outcome, epoch, deadline);
    return borrowing.outcome;
}

/// Whoever hears that the server is lost and looks what has become of it isn't told that it is alive. The
/// thread sees to that, and is at it.
void X11Hub::AwaitTelling(Lock& lock, PictureOutcome outcome, std::uint64_t epoch, Nanoseconds deadline) {
    while (outcome == PictureOutcome::Lost && m_state->IsAlive(lock) && m_state->Epoch() == epoch &&
           CmSteadyNow() < deadline)
        m_state->point.WaitUntil(lock, deadline);
}

PictureOutcome X11Hub::RunThere(Lock& lock, const CommandPtr& command) {
    const Nanoseconds deadline = *command->deadline;
    m_state->Queue(command, lock);
    while (command->state != Command::State::Done && CmSteadyNow() < deadline)
        m_state->point.WaitUntil(lock, deadline);
    if (command->state == Command::State::Done)
        return command->outcome;
    m_state->Withdraw(command, lock);
    m_state->Stall(lock);
    return PictureOutcome::Timeout;
}

// ---- Notices and streams

void X11Hub::SetReceiver(std::shared_ptr<NoticeReceiver> receiver) {
    if (InForkedChild())
        return;
    const bool listens = receiver != nullptr;
    {
        const Lock lock = m_state->point.Acquire();
        if (m_state->IsClosed(lock))
            return;
        m_state->SetReceiver(receiver, lock); // the old one ends behind the lock
        // The new one has heard nothing yet.
        m_state->Post(
            [readers = m_state->Readers(lock)](X11Session&) {
                for (const StreamReaderPtr& reader : readers)
                    reader->told = false;
            },
            lock);
    }
    // Whoever listens hears of all that changes from now on, so it must be known what there is now.
    if (listens)
        Look();
}

StreamReaderPtr X11Hub::NewReader(const DisplayStreamRequest& request) {
    if (InForkedChild())
        return nullptr;
    const Lock lock = m_state->point.Acquire();
    if (!m_state->IsAlive(lock))
        return nullptr;
    StreamReaderPtr reader = m_state->NewReader(request, lock);
    m_state->Post([reader](X11Session& session) { session.AttachReader(reader); }, lock);
    return reader;
}

bool X11Hub::IsOver(std::uint64_t epoch) const {
    if (InForkedChild())
        return false;
    const Lock lock = m_state->point.Acquire();
    return m_state->IsClosed(lock) || m_state->Now(lock).life.life == Life::Lost ||
           m_state->Now(lock).life.epoch != epoch;
}

void X11Hub::Forget(const StreamReaderPtr& reader) {
    if (InForkedChild())
        return;
    const Lock lock = m_state->point.Acquire();
    m_state->Forget(reader, lock);
    m_state->Post([reader](X11Session& session) { session.DetachReader(reader); }, lock);
}

// ---- Ends

void X11Hub::Rest() {
    if (InForkedChild())
        return;
    const std::lock_guard<std::mutex> threads(m_state->threadMutex);
    if (m_state->thread == nullptr)
        return;
    m_state->thread->End();
    {
        const Lock lock = m_state->point.Acquire();
        m_state->BeginPhase(Phase::AtRest, -1, lock);
    }
    m_state->thread = nullptr;
    m_state->applications.CloseDescriptors();
}

void X11Hub::Close() {
    if (InForkedChild())
        return;
    std::shared_ptr<NoticeReceiver> receiver;
    {
        const Lock lock = m_state->point.Acquire();
        m_state->Close(receiver, lock);
    }
    Rest();
}

} // namespace platform::x11
