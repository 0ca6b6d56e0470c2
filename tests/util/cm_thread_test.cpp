// SPDX-License-Identifier: Apache-2.0
#include "util/cm_thread.h"

#include "tests/support/sanitizer.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <pthread.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace {

/// A thread whose two operations a test fills in; without a loop of its own.
class FunctionThread final : public ACmThread {
public:
    int OnThreadInit() override { return m_init(); }
    int OnThreadRun() override {
        m_run();
        return 0;
    }

    int Start(const char* name = "function") { return Create(name, 1, 1, 0); }

    std::function<int()> m_init = [] { return 0; };
    std::function<void()> m_run = [] {};
};

std::string NameOfThisThread() {
    std::array<char, 16> name{};
    EXPECT_EQ(pthread_getname_np(pthread_self(), name.data(), name.size()), 0);
    return name.data();
}

std::size_t AddressSpaceOfProcess() {
    std::size_t pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    return pages * static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
}

std::size_t StackSizeOfThreads() {
    pthread_attr_t attributes;
    std::size_t size = 0;
    pthread_getattr_default_np(&attributes);
    pthread_attr_getstacksize(&attributes, &size);
    pthread_attr_destroy(&attributes);
    return size;
}

std::string SystemNameGivenFor(const char* name) {
    const auto thread = std::make_shared<FunctionThread>();
    std::string seen;
    thread->m_run = [&] { seen = NameOfThisThread(); };
    EXPECT_EQ(thread->Start(name), 0);
    EXPECT_EQ(thread->Join(), 0);
    return seen;
}

} // namespace

TEST(GetThreadSelfId, IsNeverZeroAndDiffersFromThreadToThread) {
    const CmThreadId mine = GetThreadSelfId();
    EXPECT_NE(mine, 0u);
    EXPECT_EQ(GetThreadSelfId(), mine);
    CmThreadId former = mine;
    for (int i = 0; i < 10; ++i) {
        CmThreadId other = 0;
        std::thread([&] { other = GetThreadSelfId(); }).join();
        EXPECT_NE(other, 0u);
        EXPECT_NE(other, mine);
        EXPECT_NE(other, former) << "given twice";
        former = other;
    }
}

TEST(ACmThread, InitialisesBeforeCreateComesBackAndThenRuns) {
    const auto thread = std::make_shared<FunctionThread>();
    std::vector<std::string> order;
    CGate gate;
    thread->m_init = [&] {
        order.push_back("init");
        return 0;
    };
    thread->m_run = [&] {
        EXPECT_TRUE(gate.Passes());
        order.push_back("run");
    };
    ASSERT_EQ(thread->Start(), 0);
    EXPECT_EQ(order, std::vector<std::string>{"init"});
    gate.Open();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_EQ(order, (std::vector<std::string>{"init", "run"}));
}

TEST(ACmThread, HasAnIdFromCreateToJoin) {
    const auto thread = std::make_shared<FunctionThread>();
    CmThreadId inInit = 0;
    CmThreadId inRun = 0;
    thread->m_init = [&] {
        inInit = thread->GetThreadId();
        EXPECT_EQ(inInit, GetThreadSelfId());
        return 0;
    };
    thread->m_run = [&] { inRun = GetThreadSelfId(); };
    EXPECT_EQ(thread->GetThreadId(), 0u);
    ASSERT_EQ(thread->Start(), 0);
    EXPECT_EQ(thread->GetThreadId(), inInit);
    thread->Join();
    EXPECT_EQ(inRun, inInit);
    EXPECT_EQ(thread->GetThreadId(), 0u);
}

TEST(ACmThread, CarriesItsNameCutToFifteenBytes) {
    EXPECT_EQ(SystemNameGivenFor("scn-cap"), "scn-cap");
    EXPECT_EQ(SystemNameGivenFor("123456789012345"), "123456789012345");
    EXPECT_EQ(SystemNameGivenFor("1234567890123456"), "123456789012345");
    EXPECT_EQ(SystemNameGivenFor("scn-cap-assist-{6F923E32-2392-4FE0-9F9E-BBE5C305E053}"), "scn-cap-assist-");
    EXPECT_EQ(SystemNameGivenFor(nullptr), NameOfThisThread());
    const auto thread = std::make_shared<FunctionThread>();
    thread->Start("1234567890123456");
    EXPECT_EQ(thread->GetName(), "1234567890123456");
    thread->Join();
}

TEST(ACmThread, BlocksAllSignalsAndLeavesThoseOfItsCreatorAlone) {
    sigset_t before;
    pthread_sigmask(SIG_SETMASK, nullptr, &before);
    const auto thread = std::make_shared<FunctionThread>();
    sigset_t inInit;
    sigset_t inRun;
    thread->m_init = [&] { return pthread_sigmask(SIG_SETMASK, nullptr, &inInit); };
    thread->m_run = [&] { pthread_sigmask(SIG_SETMASK, nullptr, &inRun); };
    ASSERT_EQ(thread->Start(), 0);
    thread->Join();
    sigset_t after;
    pthread_sigmask(SIG_SETMASK, nullptr, &after);
    for (int signal = 1; signal <= SIGRTMAX; ++signal) {
        // Nobody can block the two, and the C library keeps the ones below SIGRTMIN for itself.
        if (signal == SIGKILL || signal == SIGSTOP || (signal >= 32 && signal < SIGRTMIN))
            continue;
        EXPECT_EQ(sigismember(&inInit, signal), 1) << signal;
        EXPECT_EQ(sigismember(&inRun, signal), 1) << signal;
        EXPECT_EQ(sigismember(&after, signal), sigismember(&before, signal)) << signal;
    }
}

TEST(ACmThread, FailsWhenItsInitialisationFails) {
    for (const int result : {-1, 1, -303}) {
        const auto thread = std::make_shared<FunctionThread>();
        bool ran = false;
        thread->m_init = [&] { return result; };
        thread->m_run = [&] { ran = true; };
        EXPECT_EQ(thread->Start(), -1);
        EXPECT_FALSE(ran);
        EXPECT_EQ(thread->GetThreadId(), 0u);
        EXPECT_EQ(thread.use_count(), 1) << "the thread is gone, and its share with it";
    }
}

TEST(ACmThread, FailsWhenItsInitialisationThrows) {
    const CTraceLog log(CM_TRACE_ERROR);
    const auto thread = std::make_shared<FunctionThread>();
    thread->m_init = []() -> int { throw std::runtime_error("no chair"); };
    EXPECT_EQ(thread->Start(), -1);
    EXPECT_EQ(thread->GetThreadId(), 0u);
    ASSERT_EQ(log.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(log.Lines()[0],
                         "[[ScreenShare],[Core]] ERROR: "
                         "[ACmThread::ThreadMain]>>exception from OnThreadInit: no chair",
                         "util/cm_thread"));
}

TEST(ACmThread, EndsWhenItsRunThrows) {
    const CTraceLog log(CM_TRACE_ERROR);
    const auto thread = std::make_shared<FunctionThread>();
    thread->m_run = [] { throw std::runtime_error("no table"); };
    ASSERT_EQ(thread->Start(), 0);
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_TRUE(thread->HasEnded());
    ASSERT_EQ(log.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(log.Lines()[0],
                         "[[ScreenShare],[Core]] ERROR: "
                         "[ACmThread::ThreadMain]>>exception from OnThreadRun: no table",
                         "util/cm_thread"));
}

TEST(ACmThread, FailsSoftlyWhenTheSystemHasNoRoomForAThread) {
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    const auto thread = std::make_shared<FunctionThread>();
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(thread->Start(), -1);
        EXPECT_EQ(thread->GetThreadId(), 0u);
        EXPECT_EQ(thread.use_count(), 1);
        EXPECT_EQ(thread->Join(), 0);
    }
    EXPECT_EQ(CountThreadsOfProcess(), threads);
    EXPECT_EQ(thread->Start(), 0) << "there is room again";
    EXPECT_EQ(thread->Join(), 0);
}

TEST(ACmThread, FailsSoftlyWithoutAShareOfItself) {
    FunctionThread onTheStack;
    EXPECT_EQ(onTheStack.Start(), -1);
    EXPECT_EQ(onTheStack.Destory(0), 0);
}

TEST(ACmThread, RunsOneThreadInItsLife) {
    const auto thread = std::make_shared<FunctionThread>();
    int runs = 0;
    thread->m_run = [&] { ++runs; };
    ASSERT_EQ(thread->Start(), 0);
    EXPECT_EQ(thread->Start(), -1);
    thread->Join();
    EXPECT_EQ(thread->Start(), -1);
    EXPECT_EQ(runs, 1);
    const auto stopped = std::make_shared<FunctionThread>();
    stopped->Stop(nullptr);
    EXPECT_EQ(stopped->Start(), -1);
}

TEST(ACmThread, JoinsAndEndsInAnyOrderAndAsOftenAsYouLike) {
    const auto never = std::make_shared<FunctionThread>();
    EXPECT_EQ(never->Join(), 0);
    EXPECT_EQ(never->Destory(0), 0);
    EXPECT_EQ(never->Join(), 0);
    const auto joinFirst = std::make_shared<FunctionThread>();
    ASSERT_EQ(joinFirst->Start(), 0);
    EXPECT_EQ(joinFirst->Join(), 0);
    EXPECT_EQ(joinFirst->Join(), 0);
    EXPECT_EQ(joinFirst->Destory(0), 0);
    EXPECT_EQ(joinFirst->Destory(0), 0);
    const auto destroyFirst = std::make_shared<FunctionThread>();
    ASSERT_EQ(destroyFirst->Start(), 0);
    EXPECT_EQ(destroyFirst->Destory(0), 0);
    EXPECT_EQ(destroyFirst->Join(), 0);
    EXPECT_EQ(destroyFirst->GetThreadId(), 0u);
}

TEST(ACmThread, IsJoinedByAllWhoWaitForIt) {
    CRunningThread thread;
    CGate gate;
    std::atomic<bool> fired{false};
    Post(*thread, [&] {
        EXPECT_TRUE(gate.Passes());
        fired = true;
    });
    thread->Stop(nullptr);
    std::vector<std::thread> joiners;
    for (int i = 0; i < 4; ++i) {
        joiners.emplace_back([&] {
            EXPECT_EQ(thread->Join(), 0);
            EXPECT_TRUE(fired);
        });
    }
    gate.Open();
    for (std::thread& joiner : joiners)
        joiner.join();
}

TEST(ACmThread, NeitherJoinsNorEndsNorCreatesItself) {
    const auto thread = std::make_shared<FunctionThread>();
    thread->m_run = [&] {
        EXPECT_EQ(thread->Join(), -1);
        EXPECT_EQ(thread->Destory(0), -1);
        EXPECT_FALSE(thread->GetStopFlag());
        EXPECT_EQ(thread->Start(), -1);
    };
    ASSERT_EQ(thread->Start(), 0);
    EXPECT_EQ(thread->Join(), 0);
}

TEST(ACmThread, AnswersNothingForWhatItHasNot) {
    const auto thread = std::make_shared<FunctionThread>();
    EXPECT_EQ(thread->GetReactor(), nullptr);
    EXPECT_EQ(thread->GetEventQueue(), nullptr);
    EXPECT_EQ(thread->GetTimerQueue(), nullptr);
    EXPECT_FALSE(thread->IsDetached());
    EXPECT_FALSE(thread->GetStopFlag());
    EXPECT_EQ(thread->Stop(nullptr), 0);
    EXPECT_TRUE(thread->GetStopFlag());
}

TEST(ACmThread, HasItsObjectAsLongAsItRuns) {
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    CGate gate;
    std::weak_ptr<FunctionThread> watch;
    {
        const auto thread = std::make_shared<FunctionThread>();
        watch = thread;
        thread->m_run = [&gate] { EXPECT_TRUE(gate.Passes()); };
        ASSERT_EQ(thread->Start(), 0);
    }
    EXPECT_FALSE(watch.expired()) << "a thread that runs has its object";
    gate.Open();
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    EXPECT_TRUE(watch.expired());
}

TEST(ACmThread, WhoseLastShareGoesOnItselfLeavesItsStackToTheNextThreads) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "a sanitizer keeps memory of its own for each thread";
    constexpr std::size_t THREADS = 200;
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    const std::size_t before = AddressSpaceOfProcess();
    for (std::size_t i = 0; i < THREADS; ++i) {
        CGate gate;
        auto thread = std::make_shared<FunctionThread>();
        thread->m_run = [&gate] { EXPECT_TRUE(gate.Passes()); };
        ASSERT_EQ(thread->Start(), 0);
        thread.reset();
        gate.Open();
        ASSERT_TRUE(ThreadsComeDownTo(threads));
    }
    EXPECT_LT(AddressSpaceOfProcess(), before + THREADS / 2 * StackSizeOfThreads());
}

TEST(ACmThreadDeathTest, WhoseLastShareGoesOnItselfDoesNotDisturbTheEndOfTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto leaveThreads = [] {
        { CRunningThread first; } // a sanitizer may start a thread of its own with the first one
        const std::ptrdiff_t threads = CountThreadsOfProcess();
        CGate gate;
        std::vector<std::shared_ptr<FunctionThread>> shares;
        for (int i = 0; i < 10; ++i) {
            shares.push_back(std::make_shared<FunctionThread>());
            shares.back()->m_run = [&gate] { EXPECT_TRUE(gate.Passes()); };
            if (shares.back()->Start() != 0)
                std::exit(1);
        }
        shares.clear();
        gate.Open();
        std::exit(WaitForThreadsOfProcess(threads) == threads ? 0 : 2);
    };
    EXPECT_EXIT(leaveThreads(), testing::ExitedWithCode(0), "");
}

TEST(ACmThread, OfTheParentDoesNotHoldUpAForkedChild) {
    const auto ended = std::make_shared<FunctionThread>();
    ASSERT_EQ(ended->Start(), 0);
    CRunningThread running;
    const pid_t child = fork();
    ASSERT_NE(child, -1);
    if (child == 0) {
        const CCmWaitPoint usable;
        ACmThread::JoinEnded();
        _exit(0);
    }
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

TEST(CmProcessId, IsTheChildsOwnInAForkedProcess) {
    ACmThread::JoinEnded(); // of former cases: a sanitizer would miss their threads in the child
    EXPECT_EQ(CmProcessId(), static_cast<unsigned>(getpid()));
    const pid_t child = fork();
    ASSERT_NE(child, -1);
    if (child == 0)
        _exit(CmProcessId() == static_cast<unsigned>(getpid()) ? 0 : 1);
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
}
