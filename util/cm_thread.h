// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_event_queue.h"
#include "util/cm_timer_queue.h"

#include <atomic>
#include <condition_variable>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>

/// Identity of a thread, comparable; 0 is no thread. None is given twice in the life of the process.
using CmThreadId = unsigned long;

/// The id of the calling thread.
CmThreadId GetThreadSelfId();

/// The id of this process; in a forked child that of the child.
unsigned CmProcessId();

/// Reserved: no thread of this library has a reactor.
class ICmReactor;

/// A named thread of the library. An object runs one thread in its life.
///
/// Threads:  all operations from any thread; on the thread itself Create, Join and Destory do nothing and
///           give -1. The two On... operations run on the new thread.
/// Lifetime: always made by std::make_shared; whoever posts to a thread holds a share of it. The thread holds
///           one of itself while it runs, so dropping the others neither ends nor harms it: stop it and join
///           it before the last share goes. A thread whose last share goes on itself cannot be joined there;
///           the next Create of any thread joins it, or the end of the process.
/// Guests:   the library lives in somebody else's process, so its threads block every signal.
/// Errors:   an exception from an On... operation is traced and goes no further; after one OnThreadInit has
///           failed.
class ACmThread : public std::enable_shared_from_this<ACmThread> {
public:
    using TType = int;
    using TFlag = int;

    /// Starts a thread of that name (cut to what the operating system allows; null is no name) and waits
    /// until OnThreadInit has run on it. The thread then goes on with OnThreadRun. 0 on success. -1 when the
    /// thread cannot be started, when OnThreadInit gives anything but 0, and for an object that has its
    /// thread already or has been told to stop; no new thread is left running then. `type`, `flag` and
    /// `waitOnExit` are not used.
    virtual int Create(const char* name, TType type, TFlag flag, signed char waitOnExit);

    /// Tells the loop to end and returns at once. `timeout` is not used. Gives 0.
    virtual int Stop(CCmTimeValue* timeout);

    virtual int OnThreadInit();
    virtual int OnThreadRun();

    virtual ICmReactor* GetReactor();
    virtual ICmEventQueue* GetEventQueue();
    virtual ICmTimerQueue* GetTimerQueue();

    /// What Stop does. The thread does it to itself once OnThreadRun has returned or was never reached.
    virtual void SetStop();
    virtual bool GetStopFlag() const;
    virtual bool IsDetached() const;

    virtual ~ACmThread();

    ACmThread(const ACmThread&) = delete;
    ACmThread& operator=(const ACmThread&) = delete;

    /// Waits for the thread's end. 0, also when it has ended or never ran; -1 on the thread itself.
    int Join();

    /// Ends the working life of the object: stops and joins what still runs. May be called again. The memory
    /// goes with the last share. Gives 0, or -1 on the thread itself.
    int Destory(int reserved);

    /// The id of the running thread, 0 before Create and after Join.
    CmThreadId GetThreadId() const { return m_threadId.load(); }

    /// What Create was given, whole.
    const std::string& GetName() const { return m_name; }

    /// True once the thread has left its loop and ends without running anything more of the library's users.
    bool HasEnded() const { return m_ended.load(); }

    /// Joins the threads that have ended on themselves, and waits for nothing else.
    static void JoinEnded();

protected:
    ACmThread();

    /// True on the thread itself, once it will not come to OnThreadRun any more.
    bool IsEnding() const { return IsOwnThread() && m_ending; }

private:
    bool IsOwnThread() const { return m_threadId.load() == GetThreadSelfId(); }
    bool StartThread(const char* name);
    void ThreadMain();
    void ReportStarted(int result);
    int WaitUntilStarted();
    void JoinLocked();

    std::string m_name; // constant once the thread runs
    std::atomic<CmThreadId> m_threadId{0};
    std::atomic<bool> m_stop{false};
    std::atomic<bool> m_ended{false};
    bool m_ending = false; // touched only on the thread itself

    std::mutex m_lifeMutex;          // one Create or Join at a time; guards m_thread
    std::list<std::thread> m_thread; // one or none; a list, so that it changes hands without allocating

    std::mutex m_startMutex; // guards m_startResult
    std::condition_variable m_started;
    std::optional<int> m_startResult;
};

namespace KRNUTIL {

/// A thread with a loop: fires events and ticks timers, one at a time, until it is stopped.
///
/// Order: before an event fires, every tick has run that was due when the event was posted. So after a manual
///        clock has been moved, SendEvent of an empty event comes back behind the ticks that the move made
///        due (those that fell into a tick of the same handler are dropped, see ICmTimerQueue).
/// End:   once it has been stopped, events are refused and no tick begins. Events that were taken before fire
///        all the same, in order, on this thread, even if OnThreadInit failed after the queues were ready.
class ComTaskThread : public ACmThread {
public:
    ComTaskThread();
    ~ComTaskThread() override;

    using ACmThread::Create;
    virtual int Create(const char* name, TType type, TFlag flag);

    /// Makes the queues usable.
    int OnThreadInit() override;
    /// The loop.
    int OnThreadRun() override;

    /// Null before OnThreadInit has run.
    ICmEventQueue* GetEventQueue() override;
    ICmTimerQueue* GetTimerQueue() override;

    void SetStop() override;

private:
    std::optional<CCmEventQueue::Mark> WaitForWork();

    CCmWaitPoint m_waitPoint;
    CCmEventQueue m_events;
    CCmTimerQueue m_timers;
    std::atomic<bool> m_ready{false};
};

} // namespace KRNUTIL

/// One running task thread a name for the process, counted.
/// Threads: any, those of the factory included. A thread that may still run somebody's event is waited for
///          only where told, and with no lock held.
class ACmThreadSingletonFactory {
public:
    /// The one of the process; never destroyed. At process exit it stops and joins its threads and gives out
    /// no more, but leaves the objects to those who have not paid them back.
    static ACmThreadSingletonFactory* Instance();

    ACmThreadSingletonFactory() = default;
    /// Stops and joins all threads.
    ~ACmThreadSingletonFactory();
    ACmThreadSingletonFactory(const ACmThreadSingletonFactory&) = delete;
    ACmThreadSingletonFactory& operator=(const ACmThreadSingletonFactory&) = delete;

    /// Gives the running thread of that name, started by the first call. -1 and a null `thread` when it
    /// cannot be started or the name is null. Each success is paid back with one ResleseSingletonThread.
    int GetSingletonThread(const char* name, ACmThread*& thread);

    /// The last one stops the thread and waits for its end. Called on that thread itself it stops the thread,
    /// which is joined by a call of the factory after its end. -1 when the factory doesn't know the pair.
    int ResleseSingletonThread(const char* name, ACmThread* thread);

private:
    struct Entry {
        std::string name;
        std::shared_ptr<ACmThread> thread;
        unsigned count;
    };
    using Entries = std::list<Entry>; // an entry changes lists without allocating

    class EndAtExit;

    Entries::iterator Find(const char* name);
    Entry* Start(const char* name);
    Entries TakeIfLast(const char* name, const ACmThread* thread, bool& known);
    void JoinRetired();
    void End();

    std::mutex m_mutex;
    // Guarded by the mutex.
    Entries m_entries;
    Entries m_retired; // stopped from their own thread, still to be joined
    bool m_ended = false;
};
