// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <functional>
#include <thread>

/// Takes a step thirty times a second on a thread of its own, until a step is the last one or this object
/// ends. What a step uses outlives it.
class TickingThread {
public:
    /// `step` tells whether there is to be another one.
    explicit TickingThread(std::function<bool()> step);
    ~TickingThread();
    TickingThread(const TickingThread&) = delete;
    TickingThread& operator=(const TickingThread&) = delete;

private:
    void Run();

    const std::function<bool()> m_step;
    std::atomic<bool> m_ended{false};
    std::thread m_thread; // last: it uses all the others
};
