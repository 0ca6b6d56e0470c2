// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <ctime>
#include <mutex>

/// Every clock of the library, and every timed wait, stands on one replaceable source of time.
///
/// Threads:  all operations may be called from any thread, unless told otherwise.
/// Units:    nanoseconds inside; the three policies answer in microseconds.
/// Errors:   none; a clock always answers.
class ICmClock {
public:
    virtual ~ICmClock() = default;

    /// Monotonic time; never goes back, does not jump when the wall clock is set.
    virtual std::chrono::nanoseconds SteadyNow() const = 0;

    /// Time since 1970-01-01 UTC.
    virtual std::chrono::nanoseconds WallNow() const = 0;

    /// True when time passes by itself, so that a waiting thread may sleep until its deadline. On a clock
    /// that is moved by hand a waiting thread sleeps until the clock is moved.
    virtual bool RunsByItself() const = 0;
};

/// The clock in force. Never null.
ICmClock& CmCurrentClock();

/// Puts `clock` in force and gives the one that was; null means the system's own, both ways. All sleeping
/// threads wake up and look at the new clock. For tests and simulations: replace the clock before the threads
/// that it is to rule start, and keep it alive until they have ended.
ICmClock* CmReplaceClock(ICmClock* clock);

/// Monotonic time of the clock in force.
std::chrono::nanoseconds CmSteadyNow();

/// Whole seconds since 1970 of the clock in force: what time(nullptr) gives.
std::int64_t CmWallSeconds();

/// A clock that stands still until it is moved. Both times move together; that wakes every CCmWaitPoint.
class CCmManualClock final : public ICmClock {
public:
    explicit CCmManualClock(std::chrono::nanoseconds steadyStart = std::chrono::hours(1),
                            std::chrono::nanoseconds wallStart = std::chrono::hours(24 * 365 * 30));

    std::chrono::nanoseconds SteadyNow() const override;
    std::chrono::nanoseconds WallNow() const override;
    bool RunsByItself() const override { return false; }

    /// Moves both times forward; a step that is not above zero does nothing. Threads that wait for a time
    /// that is now reached have been woken when it returns, but need not have run yet. Must not be called
    /// while holding the mutex of a CCmWaitPoint.
    void Advance(std::chrono::nanoseconds step);

private:
    mutable std::mutex m_mutex;
    std::chrono::nanoseconds m_steady;
    std::chrono::nanoseconds m_wall;
};

/// A mutex with a condition that threads sleep on, whose timed wait follows the clock in force.
/// Lifetime: no thread may wait on it any more when it is destroyed. The thread that makes or destroys it
///           holds the mutex of no other one.
class CCmWaitPoint {
public:
    using Lock = std::unique_lock<std::mutex>;

    CCmWaitPoint();
    ~CCmWaitPoint();
    CCmWaitPoint(const CCmWaitPoint&) = delete;
    CCmWaitPoint& operator=(const CCmWaitPoint&) = delete;

    Lock Acquire() { return Lock(m_mutex); }

    /// Sleeps until notified. May also wake for no reason, so call it in a loop that tests the condition.
    void Wait(Lock& lock) { Sleep(lock, nullptr); }

    /// Sleeps until notified or until CmSteadyNow() has reached `deadline`. May also wake for no reason.
    void WaitUntil(Lock& lock, std::chrono::nanoseconds deadline);

    void NotifyAll();

private:
    friend void CmWakeAllWaitPoints();

    /// Until then on the system's steady clock; null for as long as it takes.
    void Sleep(Lock& lock, const timespec* end);

    std::mutex m_mutex;
    // What sleepers sleep on. A condition of the standard library takes its mutex as if others waited for it,
    // so each sleep costs one call of the system more.
    std::atomic<std::uint32_t> m_notices{0};
    std::atomic<std::uint32_t> m_sleepers{0};
    // The list of all wait points, guarded by a mutex of its own.
    CCmWaitPoint* m_next = nullptr;
    CCmWaitPoint* m_previous = nullptr;
};

/// Wakes every thread that sleeps on a wait point, so that it reads the clock again.
void CmWakeAllWaitPoints();

/// The clock policies: microseconds, and the value after which the count starts again.
/// All three are monotonic. tick_policy stamps frames, low_tick_policy paces the capture pass, timer_policy
/// serves stopwatches.
struct timer_policy {
    static long long now();
    static long long max_time_value();
};

struct tick_policy {
    static long long now();
    static long long max_time_value();
};

struct low_tick_policy {
    static long long now();
    static long long max_time_value();
};
