// SPDX-License-Identifier: Apache-2.0
#include "platform/notices.h"

#include "platform/one_per_process.h"
#include "platform/platform_thread.h"
#include "util/cm_guarded_call.h"
#include "util/cm_thread.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <deque>
#include <map>
#include <mutex>
#include <new>
#include <utility>

namespace platform {

namespace {

class NoticeThread;

/// All registrations, and the notices that wait for delivery.
class NoticeHub {
public:
    void Add(NoticeKinds kinds, NoticeKey key, NoticeHandler handler);
    bool Remove(NoticeKinds kinds, NoticeKey key);
    void RemoveAll();

    void Queue(const Notice& notice);

    /// What a notice thread does until it is told to end and nothing waits any more.
    void Deliver(const NoticeThread& thread);
    /// Has notice threads look whether they are to end.
    void WakeThreads();

    void Rest();
    /// Brings about what the registrations need.
    void Wake();
    void WakeIfAsleep();
    void FollowServer();

private:
    struct Registration {
        NoticeKinds kinds;
        NoticeKey key;
        NoticeHandler handler;

        bool IsNamed(NoticeKinds itsKinds, NoticeKey itsKey) const {
            return kinds == itsKinds && key == itsKey;
        }
    };
    /// Registrations and notices are numbered in one row, which tells what came first.
    using Number = std::uint64_t;
    using Registrations = std::map<Number, std::unique_ptr<Registration>>;
    struct QueuedNotice {
        Notice notice;
        Number number;
    };
    using Lock = std::unique_lock<std::mutex>;

    bool HasRegistrations();
    void StartThreadAndAttach();
    void StartThread();
    void AttachToServer();
    std::unique_ptr<Registration> TakeLocked(NoticeKinds kinds, NoticeKey key);
    void DeliverLocked(Lock& lock, const QueuedNotice& next);
    void CallHandlers(Lock& lock, const Notice& notice, Number number);
    void CallHandler(Lock& lock, const Registration& registration, const Notice& notice);

    // Held while the thread is started or the server attached to, and never by a removal. Taken before
    // m_mutex.
    std::mutex m_lifeMutex;
    std::shared_ptr<NoticeThread> m_thread; // guarded by m_lifeMutex; null at rest
    std::shared_ptr<WindowServer> m_server; // guarded by m_lifeMutex; the one that tells us
    std::atomic<bool> m_asleep{false};      // written under m_lifeMutex; registrations lack a thread

    std::mutex m_mutex;
    std::condition_variable m_changed;
    // Guarded by m_mutex.
    Number m_lastNumber = 0;
    Registrations m_registrations;
    std::deque<QueuedNotice> m_queue;
    // One that was told to end from inside a handler may still deliver when the next one comes.
    bool m_delivering = false;
    const Registration* m_running = nullptr; // whose handler runs
    CmThreadId m_runner = 0;                 // on which thread; says something while m_running
    std::unique_ptr<Registration> m_removedFromInside;
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const NoticeHub& g_hub = OnePerProcess<NoticeHub>::Get();

NoticeHub& Hub() {
    return OnePerProcess<NoticeHub>::Get();
}

class NoticeThread final : public ACmThread {
public:
    explicit NoticeThread(NoticeHub& hub) : m_hub(hub) {}

    int OnThreadRun() override {
        const PlatformThreadScope scope(this);
        m_hub.Deliver(*this);
        return 0;
    }

    void SetStop() override {
        ACmThread::SetStop();
        m_hub.WakeThreads();
    }

private:
    NoticeHub& m_hub;
};

class HubReceiver final : public NoticeReceiver {
public:
    explicit HubReceiver(NoticeHub& hub) : m_hub(hub) {}
    void OnNotice(const Notice& notice) override { m_hub.Queue(notice); }

private:
    NoticeHub& m_hub;
};

void NoticeHub::Add(NoticeKinds kinds, NoticeKey key, NoticeHandler handler) {
    auto registration = std::make_unique<Registration>(Registration{kinds, key, std::move(handler)});
    {
        const Lock lock(m_mutex);
        m_registrations.emplace(m_lastNumber + 1, std::move(registration));
        ++m_lastNumber;
    }
    Wake();
}

std::unique_ptr<NoticeHub::Registration> NoticeHub::TakeLocked(NoticeKinds kinds, NoticeKey key) {
    const auto found = std::find_if(m_registrations.begin(), m_registrations.end(),
                                    [&](const auto& entry) { return entry.second->IsNamed(kinds, key); });
    if (found == m_registrations.end())
        return nullptr;
    std::unique_ptr<Registration> taken = std::move(found->second);
    m_registrations.erase(found);
    return taken;
}

bool NoticeHub::Remove(NoticeKinds kinds, NoticeKey key) {
    std::unique_ptr<Registration> removed; // destroyed behind the lock: its end may call anything
    Lock lock(m_mutex);
    removed = TakeLocked(kinds, key);
    const bool found = removed != nullptr;
    if (m_running != nullptr && m_runner == GetThreadSelfId()) {
        if (m_running == removed.get())
            m_removedFromInside = std::move(removed);
        return found;
    }
    // One that has been removed from inside its call is still in it, although it isn't to be found any more.
    m_changed.wait(lock, [&] {
        const bool isRunning = found && m_running == removed.get();
        return !isRunning && (m_removedFromInside == nullptr || !m_removedFromInside->IsNamed(kinds, key));
    });
    return found;
}

void NoticeHub::RemoveAll() {
    for (;;) {
        NoticeKinds kinds = 0;
        NoticeKey key;
        {
            const Lock lock(m_mutex);
            if (m_registrations.empty())
                return;
            kinds = m_registrations.begin()->second->kinds;
            key = m_registrations.begin()->second->key;
        }
        Remove(kinds, key);
    }
}

void NoticeHub::Queue(const Notice& notice) {
    try {
        const Lock lock(m_mutex);
        m_queue.push_back({notice, m_lastNumber + 1});
        ++m_lastNumber;
    } catch (const std::bad_alloc&) {
        // Lost. The server calls us under its locks, where a line of trace is out of place.
        return;
    }
    m_changed.notify_all();
}

void NoticeHub::Deliver(const NoticeThread& thread) {
    Lock lock(m_mutex);
    m_changed.wait(lock, [this] { return !m_delivering; });
    m_delivering = true;
    for (;;) {
        m_changed.wait(lock, [&] { return !m_queue.empty() || thread.GetStopFlag(); });
        if (m_queue.empty())
            break;
        const QueuedNotice next = m_queue.front();
        m_queue.pop_front();
        DeliverLocked(lock, next);
    }
    m_delivering = false;
    m_changed.notify_all();
}

void NoticeHub::DeliverLocked(Lock& lock, const QueuedNotice& next) {
    if (next.notice.kind == NoticeKind::DisplayChanged) {
        Notice begin = next.notice;
        begin.flags = DisplayBeginConfiguration;
        CallHandlers(lock, begin, next.number);
    }
    CallHandlers(lock, next.notice, next.number);
}

/// Of the registrations that are older than the notice, those that are there when their turn comes.
void NoticeHub::CallHandlers(Lock& lock, const Notice& notice, Number number) {
    Number last = 0;
    for (;;) {
        const auto next = std::find_if(m_registrations.upper_bound(last), m_registrations.end(),
                                       [kind = NoticeKindBit(notice.kind)](const auto& entry) {
                                           return (entry.second->kinds & kind) != 0;
                                       });
        if (next == m_registrations.end() || next->first > number)
            return;
        last = next->first;
        CallHandler(lock, *next->second, notice);
    }
}

void NoticeHub::CallHandler(Lock& lock, const Registration& registration, const Notice& notice) {
    m_running = &registration;
    m_runner = GetThreadSelfId();
    lock.unlock();
    CmCallGuarded("[NoticeHub::CallHandler]>>exception from a handler of notices: ",
                  [&] { registration.handler(notice); });
    lock.lock();
    m_running = nullptr;
    m_changed.notify_all();
    if (m_removedFromInside != nullptr) {
        std::unique_ptr<Registration> removed = std::move(m_removedFromInside);
        lock.unlock();
        removed.reset();
        lock.lock();
    }
}

void NoticeHub::WakeThreads() {
    // A thread that has not seen its stop flag yet holds the mutex until it sleeps.
    { const Lock lock(m_mutex); }
    m_changed.notify_all();
}

bool NoticeHub::HasRegistrations() {
    const Lock lock(m_mutex);
    return !m_registrations.empty();
}

void NoticeHub::Wake() {
    // Made before the lock is taken: what a maker traces may go to a thread that registers.
    const std::shared_ptr<WindowServer> server = CurrentWindowServer();
    const Lock life(m_lifeMutex);
    if (HasRegistrations() && !OnEndingPlatformThread())
        StartThreadAndAttach();
    m_asleep = m_thread == nullptr && HasRegistrations();
}

void NoticeHub::WakeIfAsleep() {
    if (m_asleep.load(std::memory_order_relaxed) && !OnEndingPlatformThread())
        Wake();
}

void NoticeHub::StartThreadAndAttach() {
    try {
        StartThread();
        if (m_thread != nullptr)
            AttachToServer();
    } catch (const std::bad_alloc&) { // NOLINT(bugprone-empty-catch): the next use tries again
    }
}

void NoticeHub::StartThread() {
    if (m_thread != nullptr)
        return;
    auto thread = std::make_shared<NoticeThread>(*this);
    if (thread->Create("scn-notice", 0, 0, 0) == 0)
        m_thread = std::move(thread);
}

void NoticeHub::AttachToServer() {
    std::shared_ptr<WindowServer> server = CurrentWindowServer();
    if (server == m_server)
        return;
    if (m_server != nullptr)
        m_server->SetNoticeReceiver(nullptr);
    server->SetNoticeReceiver(std::make_shared<HubReceiver>(*this));
    m_server = std::move(server);
}

void NoticeHub::FollowServer() {
    std::shared_ptr<WindowServer> former; // its end may take a while
    if (HasRegistrations())
        CurrentWindowServer(); // see Wake
    const Lock life(m_lifeMutex);
    if (m_thread == nullptr)
        return;
    former = m_server;
    if (HasRegistrations()) {
        StartThreadAndAttach();
    } else if (m_server != nullptr) {
        // Nobody listens: no reason to make a server.
        m_server->SetNoticeReceiver(nullptr);
        m_server = nullptr;
    }
}

void NoticeHub::Rest() {
    std::shared_ptr<NoticeThread> thread;
    std::shared_ptr<WindowServer> server;
    {
        const Lock life(m_lifeMutex);
        thread.swap(m_thread);
        server.swap(m_server);
        if (server != nullptr)
            server->SetNoticeReceiver(nullptr);
        m_asleep = HasRegistrations();
    }
    if (thread == nullptr)
        return;
    thread->Stop(nullptr);
    if (!OnPlatformThread())
        thread->Join();
}

} // namespace

bool AddNoticeHandler(NoticeKinds kinds, NoticeKey key, NoticeHandler handler) noexcept {
    return CmCallGuarded("[AddNoticeHandler]>>exception: ",
                         [&] { Hub().Add(kinds, key, std::move(handler)); });
}

bool RemoveNoticeHandler(NoticeKinds kinds, NoticeKey key) noexcept {
    return Hub().Remove(kinds, key);
}

std::shared_ptr<WindowServer> WindowServerInUse() noexcept {
    WakeNotices();
    return CurrentWindowServer();
}

void FollowWindowServer() noexcept {
    Hub().FollowServer();
}

void RestNotices() noexcept {
    Hub().Rest();
}

void WakeNotices() noexcept {
    Hub().WakeIfAsleep();
}

void ForgetNoticeHandlers() noexcept {
    Hub().RemoveAll();
}

} // namespace platform
