// SPDX-License-Identifier: Apache-2.0
#include "util/cm_clock.h"

#include "util/cm_never_destroyed.h"

#include <pthread.h>

#include <algorithm>
#include <atomic>

namespace {

using std::chrono::nanoseconds;

class SystemClock final : public ICmClock {
public:
    nanoseconds SteadyNow() const override { return std::chrono::steady_clock::now().time_since_epoch(); }
    nanoseconds WallNow() const override { return std::chrono::system_clock::now().time_since_epoch(); }
    bool RunsByItself() const override { return true; }
};

constinit std::atomic<ICmClock*> g_replacement{nullptr};

// Wait points may be static objects of any file: what follows is there before the first and after the last of
// them.
constinit std::mutex g_waitPointsMutex;
constinit CCmWaitPoint* g_firstWaitPoint = nullptr;

// A child process that our host forks must find the list free.
[[maybe_unused]] const int g_clockForkHandlers = pthread_atfork(
    [] { g_waitPointsMutex.lock(); }, [] { g_waitPointsMutex.unlock(); }, [] { g_waitPointsMutex.unlock(); });

long long Microseconds(nanoseconds time) {
    return std::chrono::duration_cast<std::chrono::microseconds>(time).count();
}

long long SteadyMicroseconds() {
    return Microseconds(CmSteadyNow());
}

long long LastMicrosecond() {
    return Microseconds(nanoseconds::max());
}

} // namespace

ICmClock& CmCurrentClock() {
    if (ICmClock* const replacement = g_replacement.load(std::memory_order_acquire))
        return *replacement;
    static const CCmNeverDestroyed<SystemClock> systemClock;
    return *systemClock;
}

ICmClock* CmReplaceClock(ICmClock* clock) {
    ICmClock* const former = g_replacement.exchange(clock, std::memory_order_acq_rel);
    CmWakeAllWaitPoints();
    return former;
}

nanoseconds CmSteadyNow() {
    return CmCurrentClock().SteadyNow();
}

std::int64_t CmWallSeconds() {
    return std::chrono::floor<std::chrono::seconds>(CmCurrentClock().WallNow()).count();
}

CCmManualClock::CCmManualClock(nanoseconds steadyStart, nanoseconds wallStart)
    : m_steady(steadyStart),
      m_wall(wallStart) {}

nanoseconds CCmManualClock::SteadyNow() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_steady;
}

nanoseconds CCmManualClock::WallNow() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_wall;
}

void CCmManualClock::Advance(nanoseconds step) {
    if (step <= nanoseconds::zero())
        return;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_steady += step;
        m_wall += step;
    }
    CmWakeAllWaitPoints();
}

CCmWaitPoint::CCmWaitPoint() {
    const std::lock_guard<std::mutex> list(g_waitPointsMutex);
    m_next = g_firstWaitPoint;
    if (m_next != nullptr)
        m_next->m_previous = this;
    g_firstWaitPoint = this;
}

CCmWaitPoint::~CCmWaitPoint() {
    const std::lock_guard<std::mutex> list(g_waitPointsMutex);
    (m_previous != nullptr ? m_previous->m_next : g_firstWaitPoint) = m_next;
    if (m_next != nullptr)
        m_next->m_previous = m_previous;
}

void CCmWaitPoint::WaitUntil(Lock& lock, nanoseconds deadline) {
    const ICmClock& clock = CmCurrentClock();
    const nanoseconds now = clock.SteadyNow();
    if (now >= deadline)
        return;
    if (!clock.RunsByItself()) {
        m_condition.wait(lock);
        return;
    }
    // Far deadlines would overflow inside the condition; waking early is allowed.
    constexpr nanoseconds LONGEST_SLEEP = std::chrono::hours(1);
    m_condition.wait_for(lock, std::min(deadline - now, LONGEST_SLEEP));
}

void CmWakeAllWaitPoints() {
    const std::lock_guard<std::mutex> list(g_waitPointsMutex);
    for (CCmWaitPoint* point = g_firstWaitPoint; point != nullptr; point = point->m_next) {
        // A thread that has read the old time holds the mutex until it sleeps: after this it can be woken.
        { const CCmWaitPoint::Lock lock = point->Acquire(); }
        point->NotifyAll();
    }
}

long long timer_policy::now() {
    return SteadyMicroseconds();
}

long long timer_policy::max_time_value() {
    return LastMicrosecond();
}

long long tick_policy::now() {
    return SteadyMicroseconds();
}

long long tick_policy::max_time_value() {
    return LastMicrosecond();
}

long long low_tick_policy::now() {
    return SteadyMicroseconds();
}

long long low_tick_policy::max_time_value() {
    return LastMicrosecond();
}
