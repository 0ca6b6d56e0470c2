// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_jobs.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <optional>
#include <system_error>

namespace {

using Clock = std::chrono::steady_clock;

[[noreturn]] void ThrowErrno(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

void Write(int pipe, const std::string& text) {
    for (std::size_t done = 0; done < text.size();) {
        const ssize_t written = write(pipe, text.data() + done, text.size() - done);
        if (written < 0 && errno != EINTR)
            _exit(2); // nobody listens any more
        done += written > 0 ? static_cast<std::size_t>(written) : 0;
    }
}

} // namespace

PrivacyJobs::PrivacyJobs(const PrivacyOptions& options) : m_options(options) {
    void* const shared =
        mmap(nullptr, sizeof(*m_next), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (shared == MAP_FAILED)
        ThrowErrno("mmap");
    m_next = new (shared) std::atomic<long>(0);
    for (int i = 0; i < options.jobs; ++i)
        StartJob();
}

PrivacyJobs::~PrivacyJobs() {
    for (Job& job : m_jobs) {
        if (job.pipe < 0)
            continue;
        kill(job.pid, SIGKILL);
        close(job.pipe);
        waitpid(job.pid, nullptr, 0);
    }
    munmap(m_next, sizeof(*m_next));
}

void PrivacyJobs::StartJob() {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        ThrowErrno("pipe2");
    std::fflush(nullptr); // or both would print it
    const pid_t pid = fork();
    if (pid < 0)
        ThrowErrno("fork");
    if (pid == 0) {
        close(ends[0]);
        for (const Job& other : m_jobs)
            close(other.pipe);
        Work(ends[1]);
    }
    close(ends[1]);
    m_jobs.push_back({pid, ends[0], {}, {}});
}

void PrivacyJobs::Work(int pipe) const {
    const Clock::time_point start = Clock::now();
    const auto kinds = static_cast<long>(m_options.kinds.size());
    for (;;) {
        const long index = (*m_next)++;
        if (index >= m_options.histories)
            break;
        if (m_options.limit.count() > 0 && Clock::now() > start + m_options.limit)
            break;
        PrivacyResult begun;
        begun.kind = static_cast<std::size_t>(index % kinds);
        begun.seed = m_options.seed + static_cast<unsigned>(index / kinds);
        Write(pipe, ToMessage(begun));
        Write(pipe, ToMessage(RunPrivacyHistory(m_options, begun.kind, begun.seed)));
    }
    std::fflush(nullptr);
    _exit(0);
}

void PrivacyJobs::Collect(const std::function<void(const PrivacyResult&)>& take,
                          const std::function<void()>& idle) {
    constexpr int A_SECOND = 1000;
    for (;;) {
        std::vector<pollfd> polled;
        std::vector<Job*> jobs;
        for (Job& job : m_jobs) {
            if (job.pipe < 0)
                continue;
            polled.push_back({job.pipe, POLLIN, 0});
            jobs.push_back(&job);
        }
        if (jobs.empty())
            return;
        if (poll(polled.data(), polled.size(), A_SECOND) < 0 && errno != EINTR)
            ThrowErrno("poll");
        for (std::size_t i = 0; i < jobs.size(); ++i) {
            if (polled[i].revents != 0)
                Read(*jobs[i], take);
        }
        idle();
    }
}

void PrivacyJobs::Read(Job& job, const std::function<void(const PrivacyResult&)>& take) {
    char bytes[65536];
    const ssize_t count = read(job.pipe, bytes, sizeof(bytes));
    if (count < 0 && errno == EINTR)
        return;
    if (count <= 0) {
        End(job, take);
        return;
    }
    job.text.append(bytes, static_cast<std::size_t>(count));
    while (const std::optional<PrivacyResult> result = TakeMessage(job.text)) {
        job.underWay = *result;
        if (result->outcome != PrivacyOutcome::Begun)
            take(*result);
    }
}

/// A process that dies takes the rest of a history with it, which then has no result.
void PrivacyJobs::End(Job& job, const std::function<void(const PrivacyResult&)>& take) {
    close(job.pipe);
    job.pipe = -1;
    int status = 0;
    waitpid(job.pid, &status, 0);
    if (WIFEXITED(status) && WEXITSTATUS(status) == 0)
        return;
    PrivacyResult died = job.underWay;
    died.outcome = PrivacyOutcome::Begun;
    died.counts.firstLeak = "\n  its process ended with status " + std::to_string(status);
    take(died);
}
