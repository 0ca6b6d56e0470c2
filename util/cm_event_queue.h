// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_clock.h"

#include <array>
#include <condition_variable>
#include <deque>
#include <limits>
#include <optional>
#include <utility>

/// One piece of work for another thread.
/// Lifetime: made with new; the queue that takes it ends its life with OnDestorySelf, fired or not.
class ICmEvent {
public:
    explicit ICmEvent(unsigned id = 0) : m_id(id) {}

    unsigned GetId() const { return m_id; }

    /// The work, on the thread that owns the queue. The result is not looked at; an exception is traced and
    /// dropped.
    virtual int OnEventFire() = 0;

    /// Called once, when the queue is done with the event.
    virtual void OnDestorySelf() { delete this; }

protected:
    virtual ~ICmEvent() = default;

private:
    unsigned m_id;
};

/// An event that runs a callable.
template <class F>
class CCmInvokeEvent final : public ICmEvent {
public:
    explicit CCmInvokeEvent(F fn) : m_fn(std::move(fn)) {}

    int OnEventFire() override {
        m_fn();
        return 0;
    }

private:
    F m_fn;
};

/// Priorities of posted events: lower numbers run first, equal ones in the order of posting.
enum CM_EVENT_PRIORITY : int {
    CM_EVENT_PRIORITY_HIGH = 0,
    CM_EVENT_PRIORITY_NORMAL = 1,
    CM_EVENT_PRIORITY_LOW = 2,
};

/// The events that wait for one thread.
/// Threads: any.
class ICmEventQueue {
public:
    /// Queues the event and returns; the queue owns it from then on, also when it refuses it.
    /// 0 when the event will fire. -1 for a null event or when the owning thread has been told to stop; the
    /// event then never fires. Priorities outside the enumeration count as the nearest one.
    virtual int PostEvent(ICmEvent* event, int priority) = 0;

    /// Runs the event on the owning thread, behind all events of normal priority that wait already, and
    /// returns when it has fired and its life has ended. On the owning thread itself it fires at once.
    /// Results as for PostEvent. The caller must hold nothing that the owning thread waits for.
    virtual int SendEvent(ICmEvent* event) = 0;

protected:
    ~ICmEventQueue() = default;
};

/// The event queue of a task thread. It sleeps and wakes on the wait point of its thread, together with the
/// timers.
class CCmEventQueue final : public ICmEventQueue {
public:
    /// Tells the events that wait at some moment from those that come later.
    using Mark = unsigned long long;

    explicit CCmEventQueue(CCmWaitPoint& waitPoint);
    /// Ends the life of events that nobody came to fire.
    ~CCmEventQueue();
    CCmEventQueue(const CCmEventQueue&) = delete;
    CCmEventQueue& operator=(const CCmEventQueue&) = delete;

    int PostEvent(ICmEvent* event, int priority) override;
    int SendEvent(ICmEvent* event) override;

    /// Makes the calling thread the owner: SendEvent from it fires inline.
    void BindToCurrentThread();

    /// From now on every event is refused. Those taken before still fire in RunOne.
    void Close();

    /// The state as it is now. The caller holds the wait point's lock.
    bool HasEventLocked() const;
    bool IsClosedLocked() const { return m_closed; }
    Mark MarkLocked() const { return m_nextNumber; }

    /// Fires the first waiting event and ends its life; false when none waits, or when the first one has come
    /// after `mark`. Only on the owning thread. An exception from the event is traced and goes no further.
    bool RunOne(Mark mark = std::numeric_limits<Mark>::max());

private:
    struct Waiting {
        ICmEvent* event;
        bool* fired; // on the stack of a thread that waits in SendEvent, else null
        Mark number;
    };

    bool FiresInline();
    int Enqueue(ICmEvent* event, int priority, bool* fired);
    bool PutIn(const Waiting& waiting, int priority);
    std::optional<Waiting> TakeFirst(Mark mark);

    CCmWaitPoint& m_waitPoint;
    std::condition_variable m_sentFired; // goes with the wait point's mutex
    // Guarded by the wait point's mutex.
    std::array<std::deque<Waiting>, 3> m_waiting;
    Mark m_nextNumber = 0;
    bool m_closed = false;
    unsigned long m_ownerThread = 0;
};
