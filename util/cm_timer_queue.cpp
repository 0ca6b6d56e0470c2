// SPDX-License-Identifier: Apache-2.0
#include "util/cm_timer_queue.h"

#include "util/cm_guarded_call.h"

#include <algorithm>
#include <new>
#include <tuple>
#include <utility>

namespace {

using std::chrono::nanoseconds;

nanoseconds AddSaturated(nanoseconds time, nanoseconds interval) {
    nanoseconds::rep sum = 0;
    const bool overflows = __builtin_add_overflow(time.count(), interval.count(), &sum);
    return overflows ? nanoseconds::max() : nanoseconds(sum);
}

/// The first time after `now` that lies a whole number of intervals after `due`, which `now` has reached.
nanoseconds NextInPhase(nanoseconds due, nanoseconds interval, nanoseconds now) {
    return AddSaturated(now - (now - due) % interval, interval);
}

} // namespace

CCmTimerQueue::CCmTimerQueue(CCmWaitPoint& waitPoint) : m_waitPoint(waitPoint) {}

int CCmTimerQueue::ScheduleTimer(ICmTimerHandler* handler, void* argument, const CCmTimeValue& interval,
                                 unsigned count) {
    return Schedule({handler, nullptr, argument, interval.ToDuration(), nanoseconds::zero(), count, 0});
}

int CCmTimerQueue::ScheduleSharedTimer(std::shared_ptr<ICmTimerHandler> handler, void* argument,
                                       const CCmTimeValue& interval, unsigned count) {
    ICmTimerHandler* const plain = handler.get();
    return Schedule(
        {plain, std::move(handler), argument, interval.ToDuration(), nanoseconds::zero(), count, 0});
}

int CCmTimerQueue::CancelTimer(ICmTimerHandler* handler) {
    std::shared_ptr<ICmTimerHandler> owner; // let go without the lock
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    const auto found = Find(handler);
    if (found == m_timers.end())
        return 0;
    owner = std::move(found->owner);
    m_timers.erase(found);
    return 0;
}

void CCmTimerQueue::Stop() {
    std::vector<Timer> timers; // let go without the lock
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    m_stopped = true;
    timers.swap(m_timers);
}

std::optional<nanoseconds> CCmTimerQueue::NextDueLocked() const {
    const auto first = std::min_element(m_timers.begin(), m_timers.end(),
                                        [](const Timer& a, const Timer& b) { return a.IsBefore(b); });
    if (first == m_timers.end())
        return std::nullopt;
    return first->due;
}

void CCmTimerQueue::RunDue() {
    const nanoseconds now = CmSteadyNow();
    while (const std::optional<Timer> timer = TakeDue(now)) {
        CmCallGuarded("[CCmTimerQueue::RunDue]>>exception from a tick: ",
                      [&timer, now] { timer->handler->OnTimeout(CCmTimeValue(now), timer->argument); });
        SetNextDue(*timer, now);
    }
}

bool CCmTimerQueue::Timer::IsBefore(const Timer& other) const {
    return std::tie(due, generation) < std::tie(other.due, other.generation);
}

int CCmTimerQueue::Schedule(Timer timer) {
    if (timer.handler == nullptr || timer.interval <= nanoseconds::zero())
        return -1;
    timer.due = AddSaturated(CmSteadyNow(), timer.interval);
    if (!PutIn(timer))
        return -1;
    m_waitPoint.NotifyAll();
    return 0;
}

/// Leaves the timer that was replaced in `timer`, so that its handler's share is let go without the lock.
bool CCmTimerQueue::PutIn(Timer& timer) {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    if (m_stopped)
        return true;
    timer.generation = m_nextGeneration++;
    if (const auto former = Find(timer.handler); former != m_timers.end()) {
        std::swap(*former, timer);
        return true;
    }
    try {
        m_timers.push_back(std::move(timer));
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

/// The first timer that is due, which stays among the others unless this is its last tick.
std::optional<CCmTimerQueue::Timer> CCmTimerQueue::TakeDue(nanoseconds now) {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    const auto first = std::min_element(m_timers.begin(), m_timers.end(),
                                        [](const Timer& a, const Timer& b) { return a.IsBefore(b); });
    if (first == m_timers.end() || first->due > now)
        return std::nullopt;
    if (first->remaining == 1) {
        Timer last = std::move(*first);
        m_timers.erase(first);
        return last;
    }
    if (first->remaining > 1)
        --first->remaining;
    return *first;
}

/// Passes over what came due during the tick. A clock that was put in force meanwhile may be behind `now`.
void CCmTimerQueue::SetNextDue(const Timer& ticked, nanoseconds now) {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    const auto timer = Find(ticked.handler);
    if (timer != m_timers.end() && timer->generation == ticked.generation)
        timer->due = NextInPhase(timer->due, timer->interval, std::max(now, CmSteadyNow()));
}

std::vector<CCmTimerQueue::Timer>::iterator CCmTimerQueue::Find(const ICmTimerHandler* handler) {
    return std::find_if(m_timers.begin(), m_timers.end(),
                        [handler](const Timer& timer) { return timer.handler == handler; });
}
