// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <thread>

/// A manual clock that is moved at the worst moment: when a thread has read the old time and has not acted on
/// it yet.
class CClockMovedDuringRead final : public ICmClock {
public:
    ~CClockMovedDuringRead() override {
        if (m_mover.joinable())
            m_mover.join();
    }

    /// Moves the clock by `step` during the `read`-th reading from now on by another thread than the caller.
    /// Once.
    void MoveDuring(int read, std::chrono::nanoseconds step) {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_caller = std::this_thread::get_id();
        m_step = step;
        m_readsToGo = read;
    }

    std::chrono::nanoseconds SteadyNow() const override {
        std::unique_lock<std::mutex> lock(m_mutex);
        const std::chrono::nanoseconds now = m_now;
        if (m_readsToGo == 0 || std::this_thread::get_id() == m_caller || --m_readsToGo != 0)
            return now;
        m_mover = std::thread([this] { Move(); });
        // The mover may have to wait for what the reading thread holds, so there is no more than a while for
        // it.
        m_moved.wait_for(lock, std::chrono::milliseconds(200), [this] { return m_hasMoved; });
        return now;
    }
    std::chrono::nanoseconds WallNow() const override { return SteadyNow(); }
    bool RunsByItself() const override { return false; }

private:
    void Move() const {
        {
            const std::lock_guard<std::mutex> lock(m_mutex);
            m_now += m_step;
        }
        CmWakeAllWaitPoints();
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_hasMoved = true;
        m_moved.notify_all();
    }

    mutable std::mutex m_mutex;
    mutable std::condition_variable m_moved;
    // Guarded by m_mutex.
    mutable std::chrono::nanoseconds m_now = std::chrono::hours(1);
    std::chrono::nanoseconds m_step{0};
    std::thread::id m_caller;
    mutable int m_readsToGo = 0;
    mutable bool m_hasMoved = false;
    mutable std::thread m_mover;
};
