// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/ticking_thread.h"

#include "bench/meter/share_cost.h"

#include <algorithm>
#include <chrono>
#include <utility>

TickingThread::TickingThread(std::function<bool()> step)
    : m_step(std::move(step)),
      m_thread([this] { Run(); }) {}

TickingThread::~TickingThread() {
    m_ended = true;
    m_thread.join();
}

void TickingThread::Run() {
    using Clock = std::chrono::steady_clock;
    const auto period = std::chrono::nanoseconds(std::chrono::seconds(1)) / TICKS_PER_SECOND;
    Clock::time_point next = Clock::now();
    while (!m_ended && m_step()) {
        next = std::max(next + period, Clock::now());
        std::this_thread::sleep_until(next);
    }
}
