// SPDX-License-Identifier: Apache-2.0
#include "platform/dispatch_pool.h"

#include "platform/dispatch.h"
#include "platform/one_per_process.h"
#include "platform/platform_thread.h"
#include "util/cm_thread.h"

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <memory>
#include <mutex>
#include <new>
#include <utility>
#include <vector>

namespace platform {

namespace {

class CrewThread;

/// The threads of the pool from its first work to its rest. A crew that has been told to end works off what
/// it has and takes new work from its own threads only; what comes later is another crew's.
class DispatchCrew : public std::enable_shared_from_this<DispatchCrew> {
public:
    DispatchCrew() { m_threads.reserve(DISPATCH_POOL_THREADS); }

    /// False when the crew has ended; `work` is then untouched.
    bool Add(std::function<void()>& work);
    void End();

    /// What each of its threads does.
    void Work();

private:
    using Lock = std::unique_lock<std::mutex>;

    bool NeedsThreadLocked() const;
    std::shared_ptr<CrewThread> NewThread();
    void StartThread();
    void RunAllLocked(Lock& lock);
    void WorkOnCallersThread();

    std::mutex m_mutex;
    std::condition_variable m_changed;
    // Guarded by m_mutex.
    std::deque<std::function<void()>> m_work;
    std::vector<std::shared_ptr<CrewThread>> m_threads;
    int m_threadCount = 0; // with those that are being started
    int m_idleCount = 0;
    bool m_borrowing = false; // a caller's thread is at work
    bool m_ended = false;
};

/// The crew that the calling thread works for.
constinit thread_local DispatchCrew* t_crew = nullptr;

class CrewMemberScope {
public:
    CrewMemberScope(DispatchCrew* crew, const ACmThread* thread)
        : m_platformThread(thread),
          m_former(std::exchange(t_crew, crew)) {}
    ~CrewMemberScope() { t_crew = m_former; }
    CrewMemberScope(const CrewMemberScope&) = delete;
    CrewMemberScope& operator=(const CrewMemberScope&) = delete;

private:
    const PlatformThreadScope m_platformThread;
    DispatchCrew* const m_former;
};

class CrewThread final : public ACmThread {
public:
    explicit CrewThread(std::shared_ptr<DispatchCrew> crew) : m_crew(std::move(crew)) {}

    int OnThreadRun() override {
        const CrewMemberScope member(m_crew.get(), this);
        m_crew->Work();
        return 0;
    }

private:
    const std::shared_ptr<DispatchCrew> m_crew;
};

bool DispatchCrew::Add(std::function<void()>& work) {
    {
        const Lock lock(m_mutex);
        if (m_ended && t_crew != this)
            return false;
        m_work.push_back(std::move(work));
        if (!NeedsThreadLocked()) {
            m_changed.notify_one();
            return true;
        }
        ++m_threadCount;
    }
    StartThread();
    return true;
}

bool DispatchCrew::NeedsThreadLocked() const {
    const bool hasIdleOne = m_work.size() <= static_cast<std::size_t>(m_idleCount);
    // The last threads of an ended crew are at work, or it could not have been given any.
    return !hasIdleOne && !m_ended && m_threadCount < DISPATCH_POOL_THREADS;
}

std::shared_ptr<CrewThread> DispatchCrew::NewThread() {
    try {
        auto thread = std::make_shared<CrewThread>(shared_from_this());
        return thread->Create("scn-dispatch", 0, 0, 0) == 0 ? thread : nullptr;
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

void DispatchCrew::StartThread() {
    const std::shared_ptr<CrewThread> thread = NewThread();
    Lock lock(m_mutex);
    if (thread != nullptr) {
        if (m_ended)
            thread->Stop(nullptr); // it ends by itself; End waits for the count
        else
            m_threads.push_back(thread);
        return;
    }
    --m_threadCount;
    m_changed.notify_all();
    if (m_threadCount > 0)
        return;
    lock.unlock();
    WorkOnCallersThread();
}

void DispatchCrew::Work() {
    Lock lock(m_mutex);
    for (;;) {
        RunAllLocked(lock);
        if (m_ended)
            break;
        ++m_idleCount;
        m_changed.wait(lock);
        --m_idleCount;
    }
    --m_threadCount;
    m_changed.notify_all();
}

void DispatchCrew::RunAllLocked(Lock& lock) {
    while (!m_work.empty()) {
        std::function<void()> work = std::move(m_work.front());
        m_work.pop_front();
        lock.unlock();
        work();
        work = nullptr; // what it held ends here, with no lock held
        lock.lock();
    }
}

/// The last resort. One thread is enough: what is dispatched meanwhile waits for it, so that nothing nests.
void DispatchCrew::WorkOnCallersThread() {
    const std::shared_ptr<DispatchCrew> keep = shared_from_this();
    const CrewMemberScope member(this, nullptr);
    Lock lock(m_mutex);
    if (m_borrowing)
        return;
    m_borrowing = true;
    RunAllLocked(lock);
    m_borrowing = false;
    m_changed.notify_all();
}

void DispatchCrew::End() {
    std::vector<std::shared_ptr<CrewThread>> threads;
    {
        const Lock lock(m_mutex);
        m_ended = true;
        threads.swap(m_threads);
        m_changed.notify_all();
    }
    for (const auto& thread : threads)
        thread->Stop(nullptr);
    if (OnPlatformThread())
        return;
    for (const auto& thread : threads)
        thread->Join();
    Lock lock(m_mutex);
    m_changed.wait(lock, [this] { return m_threadCount == 0 && !m_borrowing && m_work.empty(); });
}

struct DispatchPool {
    std::mutex mutex;
    std::shared_ptr<DispatchCrew> crew; // guarded by mutex; null at rest
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const DispatchPool& g_pool = OnePerProcess<DispatchPool>::Get();

std::shared_ptr<DispatchCrew> CrewInForce() {
    DispatchPool& pool = OnePerProcess<DispatchPool>::Get();
    const std::lock_guard<std::mutex> lock(pool.mutex);
    if (pool.crew == nullptr)
        pool.crew = std::make_shared<DispatchCrew>();
    return pool.crew;
}

} // namespace

void RunOnPool(std::function<void()> work) {
    // What a block of an ended crew dispatches belongs to the same rest.
    if (t_crew != nullptr && t_crew->Add(work))
        return;
    while (!CrewInForce()->Add(work)) {
    }
}

void RestPool() noexcept {
    std::shared_ptr<DispatchCrew> crew;
    {
        DispatchPool& pool = OnePerProcess<DispatchPool>::Get();
        const std::lock_guard<std::mutex> lock(pool.mutex);
        crew.swap(pool.crew);
    }
    if (crew != nullptr)
        crew->End();
}

} // namespace platform
