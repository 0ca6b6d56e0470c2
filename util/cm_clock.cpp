// SPDX-License-Identifier: Apache-2.0
#include "util/cm_clock.h"

#include "util/cm_never_destroyed.h"

#include <linux/futex.h>
#include <pthread.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <ctime>

namespace {

using std::chrono::nanoseconds;

/// What the clocks of std::chrono tell, without the way through a library that a tick needs for nothing else.
nanoseconds Read(clockid_t clock) {
    timespec now{};
    clock_gettime(clock, &now);
    return std::chrono::seconds(now.tv_sec) + nanoseconds(now.tv_nsec);
}

timespec ToTimespec(nanoseconds time) {
    const auto seconds = std::chrono::floor<std::chrono::seconds>(time);
    return {seconds.count(), (time - seconds).count()};
}

class SystemClock final : public ICmClock {
public:
    nanoseconds SteadyNow() const override { return Read(CLOCK_MONOTONIC); }
    nanoseconds WallNow() const override { return Read(CLOCK_REALTIME); }
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
    // Whoever watches the order of locks would take the next mutex that lies here for this one.
    pthread_mutex_destroy(m_mutex.native_handle());
}

void CCmWaitPoint::WaitUntil(Lock& lock, nanoseconds deadline) {
    const ICmClock& clock = CmCurrentClock();
    const nanoseconds now = clock.SteadyNow();
    if (now >= deadline)
        return;
    if (!clock.RunsByItself()) {
        Wait(lock);
        return;
    }
    // Far deadlines would overflow; waking early is allowed.
    constexpr nanoseconds LONGEST_SLEEP = std::chrono::hours(1);
    const timespec end = ToTimespec(now + std::min(deadline - now, LONGEST_SLEEP));
    Sleep(lock, &end);
}

/// Who notifies counts first and then looks for sleepers, and who goes to sleep is a sleeper first: then
/// either is seen by the other, and the system puts nobody to sleep whose count isn't the last one any more.
void CCmWaitPoint::Sleep(Lock& lock, const timespec* end) {
    const std::uint32_t notices = m_notices.load();
    m_sleepers.fetch_add(1);
    lock.unlock();
    syscall(SYS_futex, &m_notices, FUTEX_WAIT_BITSET_PRIVATE, notices, end, nullptr, FUTEX_BITSET_MATCH_ANY);
    m_sleepers.fetch_sub(1);
    lock.lock();
}

void CCmWaitPoint::NotifyAll() {
    m_notices.fetch_add(1);
    if (m_sleepers.load() != 0)
        syscall(SYS_futex, &m_notices, FUTEX_WAKE_PRIVATE, INT_MAX);
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
