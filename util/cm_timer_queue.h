// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_clock.h"
#include "util/cm_time_value.h"

#include <chrono>
#include <memory>
#include <optional>
#include <vector>

class ACmThread;

/// Receives the ticks of a timer.
class ICmTimerHandler {
public:
    virtual ~ICmTimerHandler() = default;

    /// One tick, on the thread that owns the timer queue. `now` is the monotonic time of the tick. An
    /// exception is traced and dropped.
    virtual void OnTimeout(const CCmTimeValue& now, void* argument) = 0;
};

/// The timers of one thread. A handler has at most one timer.
/// Threads:  any; ticks come on the owning thread only.
/// Lifetime: a handler stays alive until its timer has been cancelled on the owning thread, or the thread has
///           ended.
class ICmTimerQueue {
public:
    /// Ticks at each multiple of `interval` after now; the first tick comes one interval from now. A timer
    /// that the handler has already is replaced.
    ///
    /// Ticks that are missed are dropped, and the phase stays: ticks that come due while the handler's own
    /// tick is running never come; of those that come due while the thread is busy with something else, one
    /// comes late. `count` is the number of ticks, 0 meaning without end; dropped ticks are not counted.
    ///
    /// 0 on success, -1 for a null handler or an interval that is not above zero. On a thread that has been
    /// told to stop it succeeds and no tick ever comes.
    virtual int ScheduleTimer(ICmTimerHandler* handler, void* argument, const CCmTimeValue& interval,
                              unsigned count) = 0;

    /// Removes the handler's timer; harmless if there is none, and allowed from inside its tick. Gives 0.
    /// From the owning thread no tick follows; from another thread a tick that has begun may still be
    /// running.
    virtual int CancelTimer(ICmTimerHandler* handler) = 0;

    /// As ScheduleTimer, but the queue keeps a share of the handler for as long as it may still tick.
    virtual int ScheduleSharedTimer(std::shared_ptr<ICmTimerHandler> handler, void* argument,
                                    const CCmTimeValue& interval, unsigned count) = 0;

protected:
    ~ICmTimerQueue() = default;
};

/// The timer queue of a task thread. It sleeps and wakes on the wait point of its thread, together with the
/// events. A tick allocates nothing.
class CCmTimerQueue final : public ICmTimerQueue {
public:
    explicit CCmTimerQueue(CCmWaitPoint& waitPoint);
    CCmTimerQueue(const CCmTimerQueue&) = delete;
    CCmTimerQueue& operator=(const CCmTimerQueue&) = delete;

    int ScheduleTimer(ICmTimerHandler* handler, void* argument, const CCmTimeValue& interval,
                      unsigned count) override;
    int CancelTimer(ICmTimerHandler* handler) override;
    int ScheduleSharedTimer(std::shared_ptr<ICmTimerHandler> handler, void* argument,
                            const CCmTimeValue& interval, unsigned count) override;

    /// Removes all timers, now and for good. No tick begins after it.
    void Stop();

    /// When the next tick is due, if any. The caller holds the wait point's lock.
    std::optional<std::chrono::nanoseconds> NextDueLocked() const;

    /// Ticks every timer that is due now, once each, in the order of their due times. Only on the owning
    /// thread. An exception from a handler is traced and goes no further.
    void RunDue();

private:
    struct Timer {
        ICmTimerHandler* handler;
        std::shared_ptr<ICmTimerHandler> owner; // null when the handler's owner is somebody else
        void* argument;
        std::chrono::nanoseconds interval;
        std::chrono::nanoseconds due;
        unsigned remaining; // 0 means without end
        unsigned long long generation;

        bool IsBefore(const Timer& other) const;
    };

    int Schedule(Timer timer);
    bool PutIn(Timer& timer);
    std::optional<Timer> TakeDue(std::chrono::nanoseconds now);
    void SetNextDue(const Timer& ticked, std::chrono::nanoseconds now);
    std::vector<Timer>::iterator Find(const ICmTimerHandler* handler);

    CCmWaitPoint& m_waitPoint;
    // Guarded by the wait point's mutex.
    std::vector<Timer> m_timers;
    unsigned long long m_nextGeneration = 1;
    bool m_stopped = false;
};

class CCmTimerWrapperID;

/// Receives the ticks of a CCmTimerWrapperID.
class CCmTimerWrapperIDSink {
public:
    virtual void OnTimer(CCmTimerWrapperID* timer) = 0;

protected:
    ~CCmTimerWrapperIDSink() = default;
};

/// A timer on another thread.
/// Threads:  ScheduleInThread and Cancel from any thread; ticks come on the thread that was given.
/// Lifetime: may be destroyed on any thread, and inside its own tick; waits there as Cancel(true) does. The
///           sink outlives the last tick.
class CCmTimerWrapperID {
public:
    CCmTimerWrapperID();
    ~CCmTimerWrapperID();
    CCmTimerWrapperID(const CCmTimerWrapperID&) = delete;
    CCmTimerWrapperID& operator=(const CCmTimerWrapperID&) = delete;

    /// Ticks on `thread` as ICmTimerQueue::ScheduleTimer tells, replacing the timer that it had. Never waits
    /// for the thread, and may be called with any lock held that a tick takes. 0 on success; -1 for a null
    /// argument, a bad interval or a thread without queues, and nothing changes then. The thread may go at
    /// any time later.
    int ScheduleInThread(ACmThread* thread, CCmTimerWrapperIDSink* sink, const CCmTimeValue& interval,
                         unsigned count);

    /// After it no tick begins. With `waitForTick` a tick that is running on another thread has ended, too;
    /// then the caller must hold nothing that a tick waits for.
    void Cancel(bool waitForTick);

private:
    class Handler;
    const std::shared_ptr<Handler> m_handler;
};
