// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <thread>

/// Gives way to other threads so often, or until the limit has passed in real time: where others compute
/// without end, each time lasts for as long as they are let, and a thousand rounds of a hammer would last for
/// minutes.
inline void GiveWay(unsigned long times, std::chrono::milliseconds limit = std::chrono::milliseconds(2)) {
    const auto end = std::chrono::steady_clock::now() + limit;
    for (; times > 0 && std::chrono::steady_clock::now() < end; --times)
        std::this_thread::yield();
}
