// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desk.h"

#include "util/cm_guarded_call.h"
#include "util/cm_thread.h"

#include <algorithm>
#include <new>

/// How calls come in and wait, and the thread that tells what falls due later.
namespace platform {

namespace {

constexpr std::chrono::nanoseconds EVER = std::chrono::nanoseconds::max();

std::chrono::nanoseconds After(std::chrono::nanoseconds now, std::chrono::nanoseconds delay) {
    return delay > EVER - now ? EVER : now + delay;
}

} // namespace

class Desk::Thread final : public ACmThread {
public:
    explicit Thread(Desk& desk) : m_desk(desk) {}

    int OnThreadRun() override { return m_desk.RunThread(*this); }

private:
    Desk& m_desk; // joins the thread before it ends
};

std::shared_ptr<Desk> Desk::Share(SimulatedDesktop desktop) {
    return std::shared_ptr<Desk>(new Desk(std::move(desktop)), [](const Desk* desk) {
        if (!desk->InForkedChild())
            delete desk;
    });
}

Desk::~Desk() = default;

// ---- Entering

Desk::Entry Desk::Enter(SimulatedOperation operation, Nanoseconds limit) {
    if (InForkedChild())
        return {Lock(), PictureOutcome::Lost};
    const Nanoseconds asked = CmSteadyNow();
    const OperationScript::Fate fate = m_script.Enter(operation);
    Perform(fate.actions);
    Wake();
    Entry entry{m_point.Acquire(), PictureOutcome::Ok};
    CatchUp();
    if (!WaitForAnswer(entry.lock, After(asked, fate.delay), After(asked, limit)))
        entry.outcome = PictureOutcome::Timeout;
    else if (fate.fails)
        entry.outcome = fate.outcome;
    return entry;
}

Desk::Entry Desk::EnterWaiting(SimulatedOperation operation, Nanoseconds deadline) {
    if (InForkedChild())
        return {Lock(), PictureOutcome::Lost};
    const Nanoseconds asked = CmSteadyNow();
    const OperationScript::Fate fate = m_script.Enter(operation);
    Perform(fate.actions);
    Wake();
    Entry entry{m_point.Acquire(), PictureOutcome::Ok};
    CatchUp();
    const LifeState before = m_life;
    const bool wasAlive = before.life == Life::Alive;
    const bool answered =
        wasAlive && asked < deadline && WaitForAnswer(entry.lock, After(asked, fate.delay), deadline);
    if (!wasAlive || (answered && m_life != before))
        entry.outcome = PictureOutcome::Lost;
    else if (!answered)
        entry.outcome = PictureOutcome::Timeout;
    else if (fate.fails)
        entry.outcome = fate.outcome;
    return entry;
}

void Desk::Perform(const std::vector<std::function<void()>>& actions) {
    for (const std::function<void()>& action : actions)
        CmCallGuarded("[Desk::Perform]>>exception from a scripted action: ", action);
}

/// A stall that was to end by now has ended.
void Desk::CatchUp() {
    if (!m_stallEnds || CmSteadyNow() < *m_stallEnds)
        return;
    try {
        SetLifeNow(Life::Alive);
    } catch (const std::bad_alloc&) {
        m_stallEnds.reset(); // what couldn't be told now is told with the next change
    }
}

bool Desk::WaitForAnswer(Lock& lock, Nanoseconds answer, Nanoseconds deadline) {
    const LifeState before = m_life;
    const Nanoseconds end = std::min(answer, deadline);
    while (CmSteadyNow() < end && m_life == before)
        m_point.WaitUntil(lock, end);
    if (m_life != before || answer <= deadline)
        return true;
    if (CmSteadyNow() < answer)
        StallUntil(answer);
    return false;
}

void Desk::StallUntil(Nanoseconds answer) {
    if (m_life.life != Life::Alive)
        return;
    SetLifeNow(Life::Stalled);
    m_stallEnds = answer;
    m_threadWanted = true;
    m_point.NotifyAll();
}

void Desk::SetReceiver(std::shared_ptr<NoticeReceiver> receiver) {
    const Entry entry = Enter(SimulatedOperation::SetNoticeReceiver);
    if (!entry.lock.owns_lock())
        return;
    m_receiver.swap(receiver); // the old one ends behind the lock
    for (const std::shared_ptr<Reader>& reader : m_readers)
        reader->told = false; // the new one has heard nothing yet
    Settle();
}

// ---- The thread

void Desk::Wake() noexcept {
    if (!m_threadWanted || InForkedChild())
        return;
    const std::lock_guard<std::mutex> threads(m_threadMutex);
    if (m_thread != nullptr)
        return;
    try {
        const auto thread = std::make_shared<Thread>(*this);
        if (thread->Create("scn-simulated", 0, 0, 0) == 0)
            m_thread = thread;
    } catch (const std::bad_alloc&) { // NOLINT(bugprone-empty-catch): the next operation tries again
    }
}

void Desk::Rest() {
    if (InForkedChild())
        return;
    const std::lock_guard<std::mutex> threads(m_threadMutex);
    if (m_thread == nullptr)
        return;
    m_thread->Stop(nullptr);
    {
        const Lock lock = m_point.Acquire();
        m_point.NotifyAll();
    }
    m_thread->Join();
    m_thread = nullptr;
}

int Desk::RunThread(const ACmThread& thread) {
    Lock lock = m_point.Acquire();
    while (!thread.GetStopFlag()) {
        CatchUp();
        TellReaders();
        if (const std::optional<Nanoseconds> due = NextDue())
            m_point.WaitUntil(lock, *due);
        else
            m_point.Wait(lock);
    }
    return 0;
}

void Desk::Close() {
    if (InForkedChild())
        return;
    std::shared_ptr<NoticeReceiver> receiver;
    {
        const Lock lock = m_point.Acquire();
        receiver.swap(m_receiver);
        m_closed = true;
        m_life.life = Life::Lost;
        for (const std::shared_ptr<Reader>& reader : m_readers)
            reader->gone = true;
        m_readers.clear();
        m_stallEnds.reset();
        m_threadWanted = false;
        m_point.NotifyAll();
    }
    Rest();
}

} // namespace platform
