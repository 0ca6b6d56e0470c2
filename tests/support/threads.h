// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_clock.h"
#include "util/cm_never_destroyed.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <pthread.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <mutex>
#include <sstream>
#include <string>
#include <thread>
#include <utility>

/// How long a test waits, in real time, for what another thread must do. Only a failing test ever waits so
/// long.
inline constexpr std::chrono::seconds PATIENCE{30};

/// Puts a manual clock in force for the length of a scope. Make it before the threads that it is to rule. The
/// clock itself stays as long as the process: a thread that nobody has to wait for, such as one that finishes
/// a capture whose owner has gone, may just have looked up which clock is in force.
class CManualClockScope {
public:
    CManualClockScope() : m_clock(NewClock()), m_former(CmReplaceClock(&m_clock)) {}
    ~CManualClockScope() { CmReplaceClock(m_former); }
    CManualClockScope(const CManualClockScope&) = delete;
    CManualClockScope& operator=(const CManualClockScope&) = delete;

    CCmManualClock* operator->() { return &m_clock; }

private:
    static CCmManualClock& NewClock() {
        static const CCmNeverDestroyed<std::deque<CCmManualClock>> clocks;
        return clocks->emplace_back();
    }

    CCmManualClock& m_clock;
    ICmClock* const m_former;
};

/// A number that some threads raise and others wait for. Threads: any.
class CTally {
public:
    void Add() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        ++m_count;
        m_changed.notify_all();
    }

    int Count() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_count;
    }

    /// False when the count is still lower after PATIENCE.
    [[nodiscard]] bool Reaches(int count) const {
        std::unique_lock<std::mutex> lock(m_mutex);
        return m_changed.wait_for(lock, PATIENCE, [&] { return m_count >= count; });
    }

private:
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_changed;
    int m_count = 0;
};

/// Holds threads back until it is opened, but not for ever. Threads: any.
class CGate {
public:
    void Open() { m_opened.Add(); }
    [[nodiscard]] bool Passes() const { return m_opened.Reaches(1); }

private:
    CTally m_opened;
};

/// A function as an event that is not fired yet; the queue that takes it owns it.
inline ICmEvent* NewEvent(std::function<void()> fn) {
    return new CCmInvokeEvent<std::function<void()>>(std::move(fn));
}

inline int Post(ACmThread& thread, std::function<void()> fn, int priority = CM_EVENT_PRIORITY_NORMAL) {
    return thread.GetEventQueue()->PostEvent(NewEvent(std::move(fn)), priority);
}

inline int Send(ACmThread& thread, std::function<void()> fn) {
    return thread.GetEventQueue()->SendEvent(NewEvent(std::move(fn)));
}

/// Comes back when the thread has fired the events and run the ticks that were due when it was called.
inline void Settle(ACmThread& thread) {
    ASSERT_EQ(Send(thread, [] {}), 0);
}

/// A running task thread, stopped and joined at the end of the scope.
class CRunningThread {
public:
    explicit CRunningThread(const char* name = "test")
        : m_thread(std::make_shared<KRNUTIL::ComTaskThread>()) {
        EXPECT_EQ(m_thread->Create(name, 1, 1), 0);
    }
    ~CRunningThread() { EXPECT_EQ(m_thread->Destory(0), 0); }
    CRunningThread(const CRunningThread&) = delete;
    CRunningThread& operator=(const CRunningThread&) = delete;

    KRNUTIL::ComTaskThread& operator*() const { return *m_thread; }
    KRNUTIL::ComTaskThread* operator->() const { return m_thread.get(); }
    const std::shared_ptr<KRNUTIL::ComTaskThread>& Share() const { return m_thread; }

private:
    const std::shared_ptr<KRNUTIL::ComTaskThread> m_thread;
};

/// While it lives, the process has no room for the stack of another thread: none can be started.
class CNoNewThreadsScope {
public:
    CNoNewThreadsScope() {
        pthread_getattr_default_np(&m_before);
        pthread_attr_t huge;
        pthread_attr_init(&huge);
        pthread_attr_setstacksize(&huge, std::size_t{1} << 47);
        EXPECT_EQ(pthread_setattr_default_np(&huge), 0);
        pthread_attr_destroy(&huge);
    }
    ~CNoNewThreadsScope() {
        pthread_setattr_default_np(&m_before);
        pthread_attr_destroy(&m_before);
    }
    CNoNewThreadsScope(const CNoNewThreadsScope&) = delete;
    CNoNewThreadsScope& operator=(const CNoNewThreadsScope&) = delete;

private:
    pthread_attr_t m_before;
};

/// Has a sanitizer start the thread of its own that comes with the first one of a process.
inline bool BringSanitizersThread() {
    pid_t id = 0;
    std::thread([&id] { id = gettid(); }).join();
    while (std::filesystem::exists("/proc/self/task/" + std::to_string(id)))
        std::this_thread::yield();
    return true;
}

/// Whether a thread is on its way out, or gone: the system lists one that has been joined for a little
/// longer.
inline bool IsThreadEnding(const std::filesystem::path& task) {
    constexpr unsigned long EXITING = 4; // in the flags that the kernel keeps
    std::string text;                    // empty for one that goes while it is read
    std::ifstream file(task / "stat");
    std::getline(file, text, '\0');
    const std::size_t name = text.rfind(')');
    if (name == std::string::npos)
        return true;
    std::istringstream rest(text.substr(name + 1));
    std::string field;
    for (int i = 0; i < 6; ++i) // state, parent, group, session, terminal, its group
        rest >> field;
    unsigned long flags = 0;
    rest >> flags;
    return (flags & EXITING) != 0;
}

/// How many threads the operating system counts in this process; a sanitizer's own one is always among them.
inline std::ptrdiff_t CountThreadsOfProcess() {
    [[maybe_unused]] static const bool brought = BringSanitizersThread();
    return std::count_if(std::filesystem::directory_iterator("/proc/self/task"), {},
                         [](const auto& task) { return !IsThreadEnding(task.path()); });
}

/// Looks again and again; false when it isn't so after PATIENCE.
template <class Condition>
[[nodiscard]] bool YieldUntil(Condition condition) {
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= deadline)
            return false;
        std::this_thread::yield();
    }
    return true;
}

/// False when there are still more after PATIENCE. Fewer are all right: one that has just ended may have been
/// counted before.
[[nodiscard]] inline bool ThreadsComeDownTo(std::ptrdiff_t count) {
    return YieldUntil([count] { return CountThreadsOfProcess() <= count; });
}

/// Whether a thread of this process has such a name, at most 15 bytes.
inline bool HasThread(const std::string& name) {
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::string found;
        std::ifstream file(task.path() / "comm");
        if (std::getline(file, found) && found == name && !IsThreadEnding(task.path()))
            return true;
    }
    return false;
}

/// False when there is still one after PATIENCE.
[[nodiscard]] inline bool ThreadEnds(const std::string& name) {
    return YieldUntil([&name] { return !HasThread(name); });
}

/// A thread that nobody joins takes a moment to end. Gives the count that it found last.
inline std::ptrdiff_t WaitForThreadsOfProcess(std::ptrdiff_t count) {
    const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
    std::ptrdiff_t found = CountThreadsOfProcess();
    while (found != count && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::yield();
        found = CountThreadsOfProcess();
    }
    return found;
}
