// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <mutex>
#include <string>
#include <vector>

/// What the fakes of a test were asked, in the order in which it happened. Threads: any.
class CCallLog {
public:
    void Add(const std::string& call);

    std::vector<std::string> Calls() const;
    std::size_t Count(const std::string& call) const;
    /// How many calls begin with `start`: those of one operation, whatever its arguments.
    std::size_t CountStarting(const std::string& start) const;

    /// True as soon as `call` was made `count` times, false when the limit has passed in real time.
    bool WaitUntilCount(const std::string& call, std::size_t count,
                        std::chrono::seconds limit = PATIENCE) const;

    void Clear();

private:
    std::size_t CountLocked(const std::string& call) const;

    mutable std::mutex m_mutex;
    mutable std::condition_variable m_added;
    std::vector<std::string> m_calls; // guarded by m_mutex
};
