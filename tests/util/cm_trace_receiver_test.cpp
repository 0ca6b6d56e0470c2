// SPDX-License-Identifier: Apache-2.0
// Receivers that come, go and misbehave while other threads trace.
#include "tests/support/sanitizer.h"
#include "tests/support/test_effort.h"
#include "tests/support/trace_log.h"
#include "util/cm_thread.h"
#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <fstream>
#include <future>
#include <iostream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr std::chrono::seconds GENEROUS(30);

class CmTraceReceivers : public testing::Test {
protected:
    CmTraceReceivers() {
        ACmThread::JoinEnded(); // of former cases: a sanitizer would miss their threads in a forked process
        CmSetTraceThreshold(CM_TRACE_DETAIL);
    }
    ~CmTraceReceivers() override {
        CmSetTraceReceiver(nullptr, nullptr);
        CmSetTraceThreshold(-1);
    }
};

void CountCall(void* context, int, const char*, const char*, int) {
    ++*static_cast<std::atomic<long>*>(context);
}

/// A receiver that stays inside until it is let go.
class HeldReceiver {
public:
    static void Receive(void* context, int, const char*, const char*, int) {
        auto& self = *static_cast<HeldReceiver*>(context);
        self.m_entered.set_value();
        EXPECT_EQ(self.m_letGo.get_future().wait_for(GENEROUS), std::future_status::ready);
    }

    bool WaitUntilEntered() { return m_entered.get_future().wait_for(GENEROUS) == std::future_status::ready; }
    void LetGo() { m_letGo.set_value(); }

private:
    std::promise<void> m_entered;
    std::promise<void> m_letGo;
};

/// Puts a receiver in force on a thread of its own.
class SettingThread {
public:
    SettingThread(CmTraceReceiver receiver, void* context)
        : m_thread([this, receiver, context] {
              m_id = gettid();
              CmSetTraceReceiver(receiver, context);
              m_done = true;
          }) {}
    ~SettingThread() { m_thread.join(); }

    bool IsDone() const { return m_done; }

    /// Waits until the thread is done or has gone to sleep for something that isn't there yet.
    bool IsDoneOrAsleep() const {
        const auto deadline = std::chrono::steady_clock::now() + GENEROUS;
        while (!m_done && StateOf(m_id) != 'S') {
            if (std::chrono::steady_clock::now() > deadline)
                return false;
            std::this_thread::yield();
        }
        return true;
    }

private:
    static char StateOf(pid_t thread) {
        std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
        std::string stat;
        std::getline(file, stat);
        const std::size_t nameEnd = stat.rfind(')');
        return thread != 0 && nameEnd != std::string::npos ? stat.at(nameEnd + 2) : '?';
    }

    std::atomic<pid_t> m_id{0};
    std::atomic<bool> m_done{false};
    std::thread m_thread;
};

} // namespace

TEST_F(CmTraceReceivers, TakesThePlaceOfTheOneBefore) {
    std::atomic<long> first{0};
    std::atomic<long> second{0};
    CmSetTraceReceiver(CountCall, &first);
    CmTraceInfo("1");
    CmSetTraceReceiver(CountCall, &second);
    CmTraceInfo("2");
    CmTraceInfo("3");
    CmSetTraceReceiver(nullptr, nullptr);
    CmTraceInfo("4");
    EXPECT_EQ(first, 1);
    EXPECT_EQ(second, 2);
}

TEST_F(CmTraceReceivers, MayThrowWithoutHarm) {
    CmSetTraceReceiver(
        [](void*, int, const char*, const char*, int) { throw std::runtime_error("full disk"); }, nullptr);
    CmTraceInfo("1");
    CmTraceInfo("2");

    std::atomic<long> calls{0};
    CmSetTraceReceiver(CountCall, &calls);
    CmTraceInfo("3");
    EXPECT_EQ(calls, 1);
}

TEST_F(CmTraceReceivers, DoesNotGetWhatIsTracedFromInsideIt) {
    static std::atomic<int> calls;
    calls = 0;
    CmSetTraceReceiver(
        [](void*, int, const char*, const char*, int) {
            ++calls;
            CmTraceInfo("echo");
        },
        nullptr);
    CmTraceInfo("1");
    EXPECT_EQ(calls, 1);
    CmTraceInfo("2");
    EXPECT_EQ(calls, 2);
}

TEST_F(CmTraceReceivers, MayTakeItselfAway) {
    static std::atomic<int> calls;
    calls = 0;
    CmSetTraceReceiver(
        [](void*, int, const char*, const char*, int) {
            ++calls;
            CmSetTraceReceiver(nullptr, nullptr);
        },
        nullptr);
    CmTraceInfo("1");
    CmTraceInfo("2");
    EXPECT_EQ(calls, 1);
}

TEST_F(CmTraceReceivers, MayBeReplacedManyTimesFromInside) {
    static std::atomic<long> calls;
    calls = 0;
    CmSetTraceReceiver(
        [](void*, int, const char*, const char*, int) {
            for (int i = 0; i < 100; ++i)
                CmSetTraceReceiver(CountCall, &calls);
        },
        nullptr);
    CmTraceInfo("1");
    CmTraceInfo("2");
    EXPECT_EQ(calls, 1);
}

TEST_F(CmTraceReceivers, IsNotTakenAwayBeforeACallUnderWayHasEnded) {
    HeldReceiver held;
    CmSetTraceReceiver(HeldReceiver::Receive, &held);
    std::thread tracer([] { CmTraceInfo("x"); });
    ASSERT_TRUE(held.WaitUntilEntered());
    {
        SettingThread setting(nullptr, nullptr);
        EXPECT_TRUE(setting.IsDoneOrAsleep());
        EXPECT_FALSE(setting.IsDone());
        held.LetGo();
    }
    tracer.join();
}

TEST_F(CmTraceReceivers, DoesNotWaitForOthersWhenReplacedFromInside) {
    // The first thread inside takes the receiver away while the second one is held in there.
    struct Both {
        HeldReceiver held;
        std::promise<void> replaced;
    } both;
    const auto receive = [](void* context, int, const char*, const char* text, int) {
        auto& self = *static_cast<Both*>(context);
        if (std::string(text).find("hold") != std::string::npos) {
            HeldReceiver::Receive(&self.held, 0, nullptr, nullptr, 0);
            return;
        }
        CmSetTraceReceiver(nullptr, nullptr);
        self.replaced.set_value();
    };
    CmSetTraceReceiver(receive, &both);
    std::thread second([] { CmTraceInfo("hold"); });
    ASSERT_TRUE(both.held.WaitUntilEntered());
    std::thread first([] { CmTraceInfo("replace"); });
    EXPECT_EQ(both.replaced.get_future().wait_for(GENEROUS), std::future_status::ready);
    first.join();

    // Whoever comes from outside waits for the held one, although it isn't in force any more.
    std::atomic<long> calls{0};
    {
        SettingThread setting(CountCall, &calls);
        EXPECT_TRUE(setting.IsDoneOrAsleep());
        EXPECT_FALSE(setting.IsDone());
        both.held.LetGo();
    }
    second.join();
}

namespace {

/// What a hammered receiver works on. Retired means that the call which took it away has returned.
struct Target {
    std::atomic<bool> retired{false};
    int plain = 0;
};

struct Findings {
    std::atomic<long> calls{0};
    std::atomic<long> callsAfterRetirement{0};
};

Findings* g_findings = nullptr;

void CheckTarget(void* context, int, const char*, const char*, int) {
    auto& target = *static_cast<Target*>(context);
    ++g_findings->calls;
    std::this_thread::yield(); // time enough for somebody to take the target away too early
    if (target.retired.load(std::memory_order_relaxed))
        ++g_findings->callsAfterRetirement;
}

void CheckTargetPlainly(void* context, int level, const char* tag, const char* text, int length) {
    // Written by the swapping thread before and after: a race detector sees when that isn't ordered.
    if (static_cast<Target*>(context)->plain != 1)
        ++g_findings->callsAfterRetirement;
    CheckTarget(context, level, tag, text, length);
}

/// Threads that trace without a pause until they are destroyed.
template <class TraceOnce>
class TracingThreads {
public:
    TracingThreads(int count, TraceOnce traceOnce) {
        for (int i = 0; i < count; ++i) {
            m_threads.emplace_back([this, traceOnce] {
                while (!m_stop)
                    traceOnce();
            });
        }
    }
    ~TracingThreads() {
        m_stop = true;
        for (std::thread& thread : m_threads)
            thread.join();
    }

private:
    std::atomic<bool> m_stop{false};
    std::vector<std::thread> m_threads;
};

/// The library's trace, and one with a fault: it takes a receiver away without a look at who is inside.
struct Door {
    static constexpr CmTraceReceiver RECEIVER = CheckTargetPlainly;
    static void Set(Target* target) { CmSetTraceReceiver(target != nullptr ? RECEIVER : nullptr, target); }
    static void Trace() { CmTraceInfo("x"); }
};

struct HastyDoor {
    static inline std::atomic<Target*> inForce{nullptr};
    static void Set(Target* target) { inForce = target; }
    static void Trace() {
        if (Target* const target = inForce)
            CheckTarget(target, 0, nullptr, nullptr, 0);
    }
};

/// Lets the tracing threads come to their turn, so that a receiver is really called before it goes.
bool WaitForACall(const Findings& findings) {
    const long before = findings.calls;
    const auto deadline = std::chrono::steady_clock::now() + GENEROUS;
    while (findings.calls == before) {
        if (std::chrono::steady_clock::now() > deadline)
            return false;
        std::this_thread::yield();
    }
    return true;
}

constexpr int SWAPS_A_CALL = 4;

template <class DoorType>
void HammerReceivers(Findings& findings, int swaps, bool stopAtFirstFinding) {
    g_findings = &findings;
    std::vector<Target> targets(static_cast<std::size_t>(swaps));
    const TracingThreads threads(4, DoorType::Trace);
    Target* previous = nullptr;
    int swap = 0;
    for (Target& target : targets) {
        if (stopAtFirstFinding && findings.callsAfterRetirement != 0)
            break;
        target.plain = 1;
        DoorType::Set(&target);
        if (previous != nullptr) {
            previous->retired = true;
            previous->plain = 2;
        }
        previous = &target;
        if (++swap % SWAPS_A_CALL == 0) {
            ASSERT_TRUE(WaitForACall(findings));
        }
    }
    DoorType::Set(nullptr);
    if (previous != nullptr)
        previous->retired = true;
}

} // namespace

TEST_F(CmTraceReceivers, IsNeverCalledAfterItWasTakenAway) {
    const int swaps = TestRounds(10000);
    Findings findings;
    HammerReceivers<Door>(findings, swaps, false);
    std::cout << "swaps: " << swaps << ", calls: " << findings.calls << ", no seed\n";
    EXPECT_GE(findings.calls, swaps / SWAPS_A_CALL);
    EXPECT_EQ(findings.callsAfterRetirement, 0);
}

TEST_F(CmTraceReceivers, IsFoundOutByTheHammerWhenItIsCalledTooLate) {
    Findings findings;
    HammerReceivers<HastyDoor>(findings, 1000000, true);
    EXPECT_GT(findings.callsAfterRetirement, 0);
}

TEST_F(CmTraceReceivers, IsSwappedByManyThreadsAtOnce) {
    const int swaps = TestRounds(10000);
    std::atomic<long> calls{0};
    const TracingThreads tracing(2, [] { CmTraceInfo("x"); });
    std::vector<std::thread> swapping;
    for (int i = 0; i < 3; ++i) {
        swapping.emplace_back([&calls, swaps] {
            for (int swap = 0; swap < swaps; ++swap) {
                CmSetTraceReceiver(CountCall, &calls);
                CmTraceInfo("x");
                CmSetTraceReceiver(nullptr, nullptr);
            }
        });
    }
    for (std::thread& thread : swapping)
        thread.join();
    std::cout << "swaps: " << 3 * swaps << ", calls: " << calls << ", no seed\n";
    EXPECT_GT(calls, 0);
    const long callsAtEnd = calls;
    CmTraceInfo("nobody");
    EXPECT_EQ(calls, callsAtEnd);
}

namespace {

/// Waits for the process; its exit code, or minus the signal that ended it.
int ExitCodeOf(pid_t process) {
    int status = 0;
    if (waitpid(process, &status, 0) != process)
        return -1000;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

/// In a forked process: traces to the receiver that it inherited, puts one in force and takes it away.
[[noreturn]] void TraceInChild() {
    alarm(static_cast<unsigned>(GENEROUS.count()));
    CmTraceInfo("from the child");
    std::atomic<long> calls{0};
    CmSetTraceReceiver(CountCall, &calls);
    CmTraceInfo("from the child");
    CmSetTraceReceiver(nullptr, nullptr);
    _exit(calls == 1 ? 0 : 1);
}

} // namespace

TEST_F(CmTraceReceivers, WorksInAProcessForkedWhileOthersTraceAndSwap) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "nobody frees the locks of a sanitizer's allocator over a fork";
    const int forks = 50 * TestEffort();
    std::cout << "forks: " << forks << ", no seed\n";
    std::atomic<long> calls{0};
    const TracingThreads tracing(2, [] { CmTraceInfo("x"); });
    const TracingThreads swapping(1, [&calls] {
        CmSetTraceReceiver(CountCall, &calls);
        CmSetTraceThreshold(CM_TRACE_DETAIL);
    });
    for (int i = 0; i < forks; ++i) {
        const pid_t child = fork();
        if (child == 0)
            TraceInChild();
        ASSERT_EQ(ExitCodeOf(child), 0) << "fork " << i;
    }
}

TEST_F(CmTraceReceivers, WorksInAProcessForkedFromInsideAReceiver) {
    pid_t child = -1;
    CmSetTraceReceiver(
        [](void* context, int, const char*, const char*, int) { *static_cast<pid_t*>(context) = fork(); },
        &child);
    CmTraceInfo("x");
    // Both processes come out of the receiver; each can take it away.
    if (child == 0) {
        alarm(static_cast<unsigned>(GENEROUS.count()));
        CmSetTraceReceiver(nullptr, nullptr);
        TraceInChild();
    }
    CmSetTraceReceiver(nullptr, nullptr);
    EXPECT_EQ(ExitCodeOf(child), 0);
}

TEST_F(CmTraceReceivers, IsNotWaitedForInAProcessThatItsThreadDidNotComeTo) {
    HeldReceiver held;
    CmSetTraceReceiver(HeldReceiver::Receive, &held);
    std::thread tracer([] { CmTraceInfo("x"); });
    ASSERT_TRUE(held.WaitUntilEntered());
    const pid_t child = fork();
    if (child == 0) {
        alarm(static_cast<unsigned>(GENEROUS.count()));
        CmSetTraceReceiver(nullptr, nullptr);
        _exit(0);
    }
    EXPECT_EQ(ExitCodeOf(child), 0);
    held.LetGo();
    tracer.join();
}
