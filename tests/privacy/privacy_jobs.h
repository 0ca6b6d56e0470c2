// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/privacy_options.h"
#include "tests/privacy/privacy_result.h"

#include <sys/types.h>
#include <atomic>
#include <functional>
#include <string>
#include <vector>

/// The histories of a run, done by several processes, since clock and window server are one for a process.
/// Each takes the next one when it is done with its last. All have ended when this object has.
/// Threads: one. To be made before the process has a thread.
class PrivacyJobs {
public:
    /// Throws std::system_error.
    explicit PrivacyJobs(const PrivacyOptions& options);
    ~PrivacyJobs();
    PrivacyJobs(const PrivacyJobs&) = delete;
    PrivacyJobs& operator=(const PrivacyJobs&) = delete;

    /// Hands over what they tell, in no order of seeds, until all have ended. `idle` runs once a second or
    /// so.
    void Collect(const std::function<void(const PrivacyResult&)>& take, const std::function<void()>& idle);

private:
    struct Job {
        pid_t pid = 0;
        int pipe = -1;
        std::string text;         // what has come and was not taken yet
        PrivacyResult underWay{}; // the last one that was begun
    };

    void StartJob();
    [[noreturn]] void Work(int pipe) const;
    void Read(Job& job, const std::function<void(const PrivacyResult&)>& take);
    static void End(Job& job, const std::function<void(const PrivacyResult&)>& take);

    const PrivacyOptions m_options;
    std::atomic<long>* m_next = nullptr; // shared with the processes
    std::vector<Job> m_jobs;
};
