// SPDX-License-Identifier: Apache-2.0
#include "util/cm_thread.h"
#include "util/cm_timer_queue.h"

#include <algorithm>
#include <bit>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <utility>
#include <vector>

/// What the thread's timer queue ticks, in the place of the timer object, which may be gone at any time.
class CCmTimerWrapperID::Handler final : public ICmTimerHandler,
                                         public std::enable_shared_from_this<CCmTimerWrapperID::Handler> {
public:
    explicit Handler(CCmTimerWrapperID* timer) : m_timer(timer) { m_tickingThreads.reserve(2); }

    int Schedule(ACmThread& thread, CCmTimerWrapperIDSink* sink, const CCmTimeValue& interval,
                 unsigned count);
    void Cancel(bool waitForTick);

    void OnTimeout(const CCmTimeValue& now, void* argument) override;

private:
    /// Goes through the timer queue as the argument of each tick: ticks of a former schedule are told by it.
    using Ticket = std::uintptr_t;

    class Tick;

    CCmTimerWrapperID* const m_timer; // only handed on
    std::mutex m_mutex;
    std::condition_variable m_tickEnded;
    // Guarded by m_mutex.
    Ticket m_ticket = 0;
    CCmTimerWrapperIDSink* m_sink = nullptr;
    std::weak_ptr<ACmThread> m_thread;
    std::vector<CmThreadId> m_tickingThreads; // more than one only after the timer has changed threads
};

namespace {

void CancelOn(const std::shared_ptr<ACmThread>& thread, ICmTimerHandler* handler) {
    if (thread != nullptr && thread->GetTimerQueue() != nullptr)
        thread->GetTimerQueue()->CancelTimer(handler);
}

} // namespace

/// A tick of the schedule in force, for as long as it runs.
class CCmTimerWrapperID::Handler::Tick {
public:
    Tick(Handler& handler, Ticket ticket) : m_handler(handler) {
        const std::lock_guard<std::mutex> lock(handler.m_mutex);
        if (ticket != handler.m_ticket)
            return;
        handler.m_tickingThreads.push_back(GetThreadSelfId());
        m_sink = handler.m_sink;
    }

    ~Tick() {
        if (m_sink == nullptr)
            return;
        const std::lock_guard<std::mutex> lock(m_handler.m_mutex);
        std::erase(m_handler.m_tickingThreads, GetThreadSelfId());
        m_handler.m_tickEnded.notify_all();
    }

    Tick(const Tick&) = delete;
    Tick& operator=(const Tick&) = delete;

    /// Null when the tick is none.
    CCmTimerWrapperIDSink* Sink() const { return m_sink; }

private:
    Handler& m_handler;
    CCmTimerWrapperIDSink* m_sink = nullptr;
};

int CCmTimerWrapperID::Handler::Schedule(ACmThread& thread, CCmTimerWrapperIDSink* sink,
                                         const CCmTimeValue& interval, unsigned count) {
    ICmTimerQueue* const queue = thread.GetTimerQueue();
    const std::shared_ptr<ACmThread> next = thread.weak_from_this().lock();
    if (queue == nullptr || next == nullptr)
        return -1;
    std::shared_ptr<ACmThread> former; // let go without the lock
    // Held over the calls of the queues: of two threads that schedule at once, one must win on both counts.
    const std::lock_guard<std::mutex> lock(m_mutex);
    const Ticket ticket = m_ticket + 1;
    if (queue->ScheduleSharedTimer(shared_from_this(), std::bit_cast<void*>(ticket), interval, count) != 0)
        return -1;
    former = m_thread.lock();
    if (former != next)
        CancelOn(former, this);
    m_ticket = ticket;
    m_sink = sink;
    m_thread = next;
    return 0;
}

void CCmTimerWrapperID::Handler::Cancel(bool waitForTick) {
    std::shared_ptr<ACmThread> former; // let go without the lock
    std::unique_lock<std::mutex> lock(m_mutex);
    ++m_ticket;
    former = std::exchange(m_thread, {}).lock();
    CancelOn(former, this);
    if (!waitForTick)
        return;
    m_tickEnded.wait(lock, [this, self = GetThreadSelfId()] {
        return std::all_of(m_tickingThreads.begin(), m_tickingThreads.end(),
                           [self](CmThreadId thread) { return thread == self; });
    });
}

void CCmTimerWrapperID::Handler::OnTimeout(const CCmTimeValue&, void* argument) {
    const Tick tick(*this, std::bit_cast<Ticket>(argument));
    if (tick.Sink() != nullptr)
        tick.Sink()->OnTimer(m_timer);
}

CCmTimerWrapperID::CCmTimerWrapperID() : m_handler(std::make_shared<Handler>(this)) {}

CCmTimerWrapperID::~CCmTimerWrapperID() {
    m_handler->Cancel(true);
}

int CCmTimerWrapperID::ScheduleInThread(ACmThread* thread, CCmTimerWrapperIDSink* sink,
                                        const CCmTimeValue& interval, unsigned count) {
    if (thread == nullptr || sink == nullptr)
        return -1;
    return m_handler->Schedule(*thread, sink, interval, count);
}

void CCmTimerWrapperID::Cancel(bool waitForTick) {
    m_handler->Cancel(waitForTick);
}
