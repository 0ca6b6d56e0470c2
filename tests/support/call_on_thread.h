// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/threads.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <string>
#include <thread>
#include <utility>

/// A call on a thread of its own that may be found waiting. Its end waits for the call, and ends the process
/// when that never returns: nothing else gets a deadlocked thread out of the way.
class CCallOnThread {
public:
    explicit CCallOnThread(std::function<void()> call)
        : m_thread([this, call = std::move(call)] {
              m_id = gettid();
              m_began.Add();
              call();
              m_returned.Add();
          }) {}
    ~CCallOnThread() {
        if (!m_returned.Reaches(1)) {
            std::fprintf(stderr, "the call never returned: a deadlock\n");
            std::abort();
        }
        m_thread.join();
    }
    CCallOnThread(const CCallOnThread&) = delete;
    CCallOnThread& operator=(const CCallOnThread&) = delete;

    bool HasReturned() const { return m_returned.Count() > 0; }

    /// Comes back when the call sleeps, or has returned although it should not.
    void UntilItWaits() const {
        ASSERT_TRUE(m_began.Reaches(1));
        while (!HasReturned() && !IsAsleep())
            std::this_thread::yield();
    }

private:
    bool IsAsleep() const {
        std::ifstream file("/proc/self/task/" + std::to_string(m_id.load()) + "/stat");
        std::string id;
        std::string name;
        std::string state;
        file >> id >> name >> state;
        return state == "S";
    }

    CTally m_began;
    CTally m_returned;
    std::atomic<pid_t> m_id{0};
    std::thread m_thread;
};
