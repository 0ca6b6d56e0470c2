// SPDX-License-Identifier: Apache-2.0
#include "util/cm_event_queue.h"

#include "util/cm_guarded_call.h"
#include "util/cm_thread.h"

#include <algorithm>
#include <new>

namespace {

void Fire(ICmEvent* event) {
    CmCallGuarded("[CCmEventQueue::Fire]>>exception from an event: ", [event] { event->OnEventFire(); });
}

void EndLife(ICmEvent* event) {
    CmCallGuarded("[CCmEventQueue::EndLife]>>exception from an event: ", [event] { event->OnDestorySelf(); });
}

} // namespace

CCmEventQueue::CCmEventQueue(CCmWaitPoint& waitPoint) : m_waitPoint(waitPoint) {}

CCmEventQueue::~CCmEventQueue() {
    for (const std::deque<Waiting>& waiting : m_waiting) {
        for (const Waiting& one : waiting)
            EndLife(one.event);
    }
}

int CCmEventQueue::PostEvent(ICmEvent* event, int priority) {
    return Enqueue(event, priority, nullptr);
}

int CCmEventQueue::SendEvent(ICmEvent* event) {
    if (event != nullptr && FiresInline()) {
        Fire(event);
        EndLife(event);
        return 0;
    }
    bool fired = false;
    if (Enqueue(event, CM_EVENT_PRIORITY_NORMAL, &fired) != 0)
        return -1;
    CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    m_sentFired.wait(lock, [&fired] { return fired; });
    return 0;
}

void CCmEventQueue::BindToCurrentThread() {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    m_ownerThread = GetThreadSelfId();
}

void CCmEventQueue::Close() {
    {
        const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
        m_closed = true;
    }
    m_waitPoint.NotifyAll();
}

bool CCmEventQueue::HasEventLocked() const {
    return std::any_of(m_waiting.begin(), m_waiting.end(),
                       [](const auto& waiting) { return !waiting.empty(); });
}

bool CCmEventQueue::RunOne(Mark mark) {
    const std::optional<Waiting> first = TakeFirst(mark);
    if (!first)
        return false;
    Fire(first->event);
    EndLife(first->event);
    if (first->fired != nullptr) {
        // Told under the lock: the sender may take the queue down as soon as it knows.
        const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
        *first->fired = true;
        m_sentFired.notify_all();
    }
    return true;
}

bool CCmEventQueue::FiresInline() {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    return m_ownerThread == GetThreadSelfId() && !m_closed;
}

int CCmEventQueue::Enqueue(ICmEvent* event, int priority, bool* fired) {
    if (event == nullptr)
        return -1;
    if (!PutIn({event, fired, 0}, priority)) {
        EndLife(event);
        return -1;
    }
    m_waitPoint.NotifyAll();
    return 0;
}

bool CCmEventQueue::PutIn(const Waiting& waiting, int priority) {
    const int index = std::clamp<int>(priority, CM_EVENT_PRIORITY_HIGH, CM_EVENT_PRIORITY_LOW);
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    if (m_closed)
        return false;
    try {
        m_waiting[static_cast<std::size_t>(index)].push_back({waiting.event, waiting.fired, m_nextNumber});
    } catch (const std::bad_alloc&) {
        return false;
    }
    ++m_nextNumber;
    return true;
}

std::optional<CCmEventQueue::Waiting> CCmEventQueue::TakeFirst(Mark mark) {
    const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    for (std::deque<Waiting>& waiting : m_waiting) {
        if (waiting.empty())
            continue;
        const Waiting first = waiting.front();
        if (first.number >= mark)
            return std::nullopt;
        waiting.pop_front();
        return first;
    }
    return std::nullopt;
}
