// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_hub_state.h"

#include "platform/desktop_notices.h"

#include <unistd.h>

#include <algorithm>
#include <utility>

namespace platform::x11 {

namespace {

void WriteTo(int wakes) {
    const std::uint64_t one = 1;
    // It can only fail where it is readable already.
    [[maybe_unused]] const ssize_t written = write(wakes, &one, sizeof one);
}

} // namespace

View::View()
    : displays(std::make_shared<const DisplayList>()),
      windows(std::make_shared<const WindowSnapshot>()),
      applications(std::make_shared<const ApplicationList>()) {}

// ---- The users' side

void HubState::Wake() {
    if (m_wakes >= 0)
        WriteTo(m_wakes);
}

void HubState::Queue(CommandPtr command, const Lock&) {
    m_commands.push_back(std::move(command));
    Wake();
}

void HubState::Withdraw(const CommandPtr& command, const Lock&) {
    std::erase(m_commands, command);
}

ConnectionLender* HubState::Borrow(const Lock&) {
    if (m_lender == nullptr || m_isBorrowed || !m_commands.empty())
        return nullptr;
    m_isBorrowed = true;
    return m_lender;
}

void HubState::GiveBack(const Borrowing& borrowing) {
    Lock lock = point.Acquire();
    m_isBorrowed = false;
    if (borrowing.isUnanswered)
        Stall(lock);
    if (borrowing.isUnanswered || borrowing.isToBeSeenTo) {
        m_lender = nullptr;
        Wake();
    }
    const bool isAwaited = m_isAwaitedBack;
    lock.unlock();
    if (isAwaited)
        point.NotifyAll();
}

void HubState::Post(X11Hub::Work work, const Lock& lock) {
    const bool isLost = m_phase == Phase::Settled && m_view.life.life == Life::Lost;
    if (m_phase == Phase::AtRest || isLost || m_closed)
        return;
    const auto command = std::make_shared<Command>();
    command->work = std::move(work);
    Queue(command, lock);
}

void HubState::FailAwaitedCommands() {
    for (const CommandPtr& command : m_commands) {
        if (command->deadline)
            command->state = Command::State::Done; // with the outcome that it was made with: Lost
    }
    std::erase_if(m_commands, [](const CommandPtr& each) { return each->state == Command::State::Done; });
    point.NotifyAll();
}

void HubState::FailCommands() {
    FailAwaitedCommands();
    m_commands.clear();
}

void HubState::Stall(const Lock&) {
    if (m_view.life.life == Life::Alive)
        SetLife(Life::Stalled);
    FailAwaitedCommands();
    Wake(); // so that it looks whether the server answers
}

void HubState::SetReceiver(std::shared_ptr<NoticeReceiver>& receiver, const Lock&) {
    m_receiver.swap(receiver);
}

StreamReaderPtr HubState::NewReader(const DisplayStreamRequest& request, const Lock&) {
    auto reader = std::make_shared<StreamReader>();
    reader->id = ++m_lastReader;
    reader->request = request;
    reader->epoch = m_view.life.epoch;
    m_readers.push_back(reader);
    return reader;
}

void HubState::Close(std::shared_ptr<NoticeReceiver>& receiver, const Lock&) {
    m_closed = true;
    moment.End();
    m_receiver.swap(receiver);
    m_readers.clear();
    FailCommands();
}

void HubState::BeginPhase(Phase phase, int wakes, const Lock&) {
    m_phase = phase;
    m_wakes = wakes;
    FailCommands();
}

// ---- The thread's side

bool HubState::IsStalled() {
    const Lock lock = point.Acquire();
    return m_view.life.life == Life::Stalled;
}

CommandPtr HubState::TakeCommand() {
    const Lock lock = point.Acquire();
    if (m_commands.empty())
        return nullptr;
    CommandPtr command = std::move(m_commands.front());
    m_commands.pop_front();
    command->state = Command::State::Running;
    return command;
}

void HubState::Lend(ConnectionLender& lender) {
    const Lock lock = point.Acquire();
    m_lender = &lender;
}

void HubState::TakeBack() {
    Lock lock = point.Acquire();
    m_lender = nullptr;
    while (m_isBorrowed) {
        m_isAwaitedBack = true;
        point.Wait(lock);
    }
    m_isAwaitedBack = false;
}

void HubState::Finish(const CommandPtr& command, PictureOutcome outcome) {
    {
        const Lock lock = point.Acquire();
        command->state = Command::State::Done;
        command->outcome = outcome;
    }
    point.NotifyAll(); // whoever waits finds the lock free
}

void HubState::OnConnected(View view, bool sameServer) {
    const Lock lock = point.Acquire();
    // Nobody sees it, and the session has made its snapshot already: the generation stays.
    if (m_introduced && !sameServer)
        LoseNow(view.windows->Generation());
    const bool isReturn = m_view.life.life == Life::Lost;
    view.life = {Life::Alive, m_view.life.epoch + (isReturn ? 1U : 0U)};
    m_epoch = view.life.epoch;
    const bool changesLife = !(view.life == m_view.life);
    m_view.life = view.life;
    if (changesLife)
        Tell(NoticeKind::LifeChanged);
    PublishNow(view);
    m_introduced = true;
    m_phase = Phase::Settled;
    point.NotifyAll();
}

void HubState::Publish(const View& view) {
    const Lock lock = point.Acquire();
    PublishNow(view);
}

/// What is told follows from the difference to what was told before.
void HubState::PublishNow(const View& view) {
    std::vector<Notice> notices;
    if (m_view.displays != view.displays)
        notices = DisplayNotices(*m_view.displays, *view.displays);
    // That applications can't be seen doesn't mean that they have ended.
    if (m_view.life.life != Life::Lost && m_view.applications != view.applications) {
        const std::vector<Notice> more = ApplicationNotices(m_knownApplications, *view.applications);
        notices.insert(notices.end(), more.begin(), more.end());
        m_knownApplications = *view.applications;
    }
    const LifeState life = m_view.life;
    m_view = view;
    m_view.life = life;
    for (const Notice& notice : notices)
        Tell(notice);
}

void HubState::OnLost() {
    const Lock lock = point.Acquire();
    LoseNow(++memory.generation);
    if (!std::exchange(m_introduced, true))
        Tell(NoticeKind::LifeChanged); // nobody could know before
    m_phase = Phase::Settled;
    FailCommands();
}

void HubState::LoseNow(std::uint64_t generation) {
    View nothing;
    nothing.windows = std::make_shared<const WindowSnapshot>(generation, std::vector<WindowInfo>());
    SetLife(Life::Lost);
    PublishNow(nothing);
    // Those of another epoch never come back.
    m_readers.clear();
}

void HubState::OnStalled() {
    const Lock lock = point.Acquire();
    Stall(lock);
}

void HubState::OnAnswering() {
    const Lock lock = point.Acquire();
    if (m_view.life.life == Life::Stalled)
        SetLife(Life::Alive);
}

void HubState::OnStreamPicture(std::uint64_t stream) {
    const Lock lock = point.Acquire();
    const bool isKept = std::any_of(m_readers.begin(), m_readers.end(),
                                    [stream](const StreamReaderPtr& each) { return each->id == stream; });
    if (!isKept)
        return;
    Notice notice;
    notice.kind = NoticeKind::StreamPicture;
    notice.stream = stream;
    Tell(notice);
}

std::vector<StreamReaderPtr> HubState::LivingReaders() {
    const Lock lock = point.Acquire();
    return Readers(lock);
}

void HubState::SetLife(Life life) {
    if (m_view.life.life == life)
        return;
    m_view.life.life = life;
    moment.End();
    Tell(NoticeKind::LifeChanged);
    point.NotifyAll();
}

void HubState::Tell(const Notice& notice) {
    if (m_receiver != nullptr && m_introduced)
        m_receiver->OnNotice(notice);
}

void HubState::Tell(NoticeKind kind) {
    Notice notice;
    notice.kind = kind;
    Tell(notice);
}

} // namespace platform::x11
