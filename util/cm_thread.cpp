// SPDX-License-Identifier: Apache-2.0
#include "util/cm_thread.h"

#include "util/cm_guarded_call.h"
#include "util/cm_never_destroyed.h"

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <exception>

namespace {

/// A thread inherits the signal mask of the one that starts it: blocked there, no signal is ever taken here.
class AllSignalsBlocked {
public:
    AllSignalsBlocked() {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &m_before);
    }
    ~AllSignalsBlocked() { pthread_sigmask(SIG_SETMASK, &m_before, nullptr); }
    AllSignalsBlocked(const AllSignalsBlocked&) = delete;
    AllSignalsBlocked& operator=(const AllSignalsBlocked&) = delete;

private:
    sigset_t m_before;
};

void NameThisThread(const std::string& name) {
    constexpr std::size_t LONGEST_NAME = 15;
    if (!name.empty())
        pthread_setname_np(pthread_self(), name.substr(0, LONGEST_NAME).c_str());
}

constinit std::mutex g_endedMutex;

// A child process that our host forks must find the mutex free.
[[maybe_unused]] const int g_threadForkHandlers =
    pthread_atfork([] { g_endedMutex.lock(); }, [] { g_endedMutex.unlock(); }, [] { g_endedMutex.unlock(); });

/// The threads whose objects were destroyed on them, which therefore could not be joined there. Nothing but
/// the return from their first function is left for them to do. Guarded by g_endedMutex.
std::list<std::thread>& EndedThreads() {
    // In a forked child the threads of the parent do not exist, so they have no end to wait for.
    struct JoinAtExit {
        const pid_t process = getpid();
        ~JoinAtExit() {
            if (process == getpid())
                ACmThread::JoinEnded();
        }
    };
    static const CCmNeverDestroyed<std::list<std::thread>> threads;
    static const JoinAtExit joinAtExit;
    return *threads;
}

void PutWithEndedThreads(std::list<std::thread>& thread) {
    const std::lock_guard<std::mutex> lock(g_endedMutex);
    EndedThreads().splice(EndedThreads().end(), thread);
}

/// All but the calling thread, which is still running the destructors of its thread-local objects if it is
/// there.
std::list<std::thread> TakeEndedThreads() {
    std::list<std::thread> taken;
    const std::lock_guard<std::mutex> lock(g_endedMutex);
    taken.swap(EndedThreads());
    const auto self = std::find_if(taken.begin(), taken.end(), [](const std::thread& thread) {
        return thread.get_id() == std::this_thread::get_id();
    });
    if (self != taken.end())
        EndedThreads().splice(EndedThreads().end(), taken, self);
    return taken;
}

} // namespace

CmThreadId GetThreadSelfId() {
    static constinit std::atomic<CmThreadId> last{0};
    static constinit thread_local CmThreadId self = 0;
    if (self == 0)
        self = ++last;
    return self;
}

unsigned CmProcessId() {
    return static_cast<unsigned>(getpid());
}

ACmThread::ACmThread() = default;

ACmThread::~ACmThread() {
    if (IsOwnThread())
        PutWithEndedThreads(m_thread);
    else
        Join();
}

int ACmThread::Create(const char* name, TType, TFlag, signed char) {
    if (IsOwnThread())
        return -1;
    JoinEnded();
    const std::lock_guard<std::mutex> life(m_lifeMutex);
    if (!m_thread.empty() || m_stop.load() || !StartThread(name))
        return -1;
    if (WaitUntilStarted() == 0)
        return 0;
    JoinLocked();
    return -1;
}

bool ACmThread::StartThread(const char* name) {
    try {
        m_name = name != nullptr ? name : "";
        const AllSignalsBlocked blocked;
        m_thread.emplace_back([self = shared_from_this()] { self->ThreadMain(); });
        return true;
    } catch (const std::exception&) {
        return false;
    }
}

void ACmThread::ThreadMain() {
    m_threadId = GetThreadSelfId();
    NameThisThread(m_name);
    int started = -1;
    CmCallGuarded("[ACmThread::ThreadMain]>>exception from OnThreadInit: ",
                  [this, &started] { started = OnThreadInit(); });
    if (started == 0) {
        ReportStarted(started);
        CmCallGuarded("[ACmThread::ThreadMain]>>exception from OnThreadRun: ", [this] { OnThreadRun(); });
    }
    // However the thread came here: from now on nobody may count on its loop.
    m_ending = true;
    SetStop();
    m_ended = true;
    if (started != 0)
        ReportStarted(started);
}

void ACmThread::ReportStarted(int result) {
    const std::lock_guard<std::mutex> lock(m_startMutex);
    m_startResult = result;
    m_started.notify_all();
}

int ACmThread::WaitUntilStarted() {
    std::unique_lock<std::mutex> lock(m_startMutex);
    m_started.wait(lock, [this] { return m_startResult.has_value(); });
    return *m_startResult;
}

int ACmThread::Stop(CCmTimeValue*) {
    SetStop();
    return 0;
}

int ACmThread::OnThreadInit() {
    return 0;
}

int ACmThread::OnThreadRun() {
    return 0;
}

ICmReactor* ACmThread::GetReactor() {
    return nullptr;
}

ICmEventQueue* ACmThread::GetEventQueue() {
    return nullptr;
}

ICmTimerQueue* ACmThread::GetTimerQueue() {
    return nullptr;
}

void ACmThread::SetStop() {
    m_stop = true;
}

bool ACmThread::GetStopFlag() const {
    return m_stop.load();
}

bool ACmThread::IsDetached() const {
    return false;
}

int ACmThread::Join() {
    if (IsOwnThread())
        return -1;
    const std::lock_guard<std::mutex> life(m_lifeMutex);
    JoinLocked();
    return 0;
}

void ACmThread::JoinLocked() {
    if (m_thread.empty())
        return;
    m_thread.front().join();
    m_thread.clear();
    m_threadId = 0;
}

int ACmThread::Destory(int) {
    if (IsOwnThread())
        return -1;
    Stop(nullptr);
    return Join();
}

void ACmThread::JoinEnded() {
    for (std::thread& thread : TakeEndedThreads())
        thread.join();
}

namespace KRNUTIL {

ComTaskThread::ComTaskThread() : m_events(m_waitPoint), m_timers(m_waitPoint) {}

ComTaskThread::~ComTaskThread() = default;

int ComTaskThread::Create(const char* name, TType type, TFlag flag) {
    return Create(name, type, flag, 0);
}

int ComTaskThread::OnThreadInit() {
    m_events.BindToCurrentThread();
    m_ready = true;
    return 0;
}

int ComTaskThread::OnThreadRun() {
    while (const std::optional<CCmEventQueue::Mark> mark = WaitForWork()) {
        m_timers.RunDue();
        // An event that came since the timers were looked at waits for the next look.
        m_events.RunOne(*mark);
    }
    return 0;
}

ICmEventQueue* ComTaskThread::GetEventQueue() {
    return m_ready.load() ? &m_events : nullptr;
}

ICmTimerQueue* ComTaskThread::GetTimerQueue() {
    return m_ready.load() ? &m_timers : nullptr;
}

void ComTaskThread::SetStop() {
    ACmThread::SetStop();
    m_timers.Stop();
    m_events.Close();
    if (!IsEnding())
        return;
    // The loop was not reached, or left by an exception: what was accepted fires all the same.
    while (m_events.RunOne()) {
    }
}

/// The mark of the events that wait now, as soon as one waits or a timer is due; none when the loop shall
/// end.
std::optional<CCmEventQueue::Mark> ComTaskThread::WaitForWork() {
    CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
    while (!m_events.HasEventLocked()) {
        if (m_events.IsClosedLocked())
            return std::nullopt;
        const std::optional<std::chrono::nanoseconds> due = m_timers.NextDueLocked();
        if (due && *due <= CmSteadyNow())
            break;
        if (due)
            m_waitPoint.WaitUntil(lock, *due);
        else
            m_waitPoint.Wait(lock);
    }
    return m_events.MarkLocked();
}

} // namespace KRNUTIL
