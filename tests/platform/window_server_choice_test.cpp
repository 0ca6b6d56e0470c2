// SPDX-License-Identifier: Apache-2.0
#include "platform/window_server_choice.h"

#include "platform/none/none_window_server.h"
#include "tests/support/test_effort.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdlib>
#include <fstream>
#include <future>
#include <iostream>
#include <latch>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <sys/wait.h>
#include <unistd.h>

namespace {

using namespace platform;

constexpr std::chrono::seconds GENEROUS(30);
constexpr const char* PLACE = "platform/window_server_choice";

using ServerPtr = std::shared_ptr<WindowServer>;

ServerPtr NewServer() {
    return std::make_shared<NoneWindowServer>();
}

// What the makers below have to do with; one choice at a time is under test.
std::atomic<int> g_made{0};
std::atomic<bool> g_stall{false};
std::promise<void>* g_stalled = nullptr;
std::shared_future<void> g_goOn;
WindowServerChoice* g_choice = nullptr;
ServerPtr g_empty;
ServerPtr g_seenByMaker;
int g_childsExitCode = -1;

int ExitCodeOf(pid_t process) {
    int status = 0;
    if (waitpid(process, &status, 0) != process)
        return -1000;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

ServerPtr MakeCounted() {
    ++g_made;
    return NewServer();
}

ServerPtr MakeNothing() {
    return nullptr;
}

ServerPtr MakeThrow() {
    throw std::runtime_error("no luck");
}

/// Stays inside until it is let go.
ServerPtr MakeSlowly() {
    ++g_made;
    if (g_stall.exchange(false)) {
        g_stalled->set_value();
        EXPECT_EQ(g_goOn.wait_for(GENEROUS), std::future_status::ready);
    }
    return NewServer();
}

ServerPtr MakeAskingBack() {
    g_seenByMaker = g_choice->Current();
    return NewServer();
}

ServerPtr MakeReplacing() {
    g_seenByMaker = g_choice->Replace(NewServer());
    return NewServer();
}

/// What the child gets is told by g_childsExitCode.
ServerPtr MakeForking() {
    g_choice->BeforeFork();
    const pid_t child = fork();
    if (child == 0) {
        alarm(static_cast<unsigned>(GENEROUS.count()));
        g_choice->AfterForkInChild();
        _exit(g_choice->Current() == g_empty ? 0 : 1);
    }
    g_choice->AfterForkInParent();
    g_childsExitCode = ExitCodeOf(child);
    return NewServer();
}

constexpr WindowServerMaker MAKERS[] = {
    {"auto", MakeCounted},        {"slow", MakeSlowly},     {"nothing", MakeNothing},
    {"throw", MakeThrow},         {"missing", nullptr},     {"asking back", MakeAskingBack},
    {"replacing", MakeReplacing}, {"forking", MakeForking},
};

class WindowServerChoices : public testing::Test {
protected:
    WindowServerChoices() {
        unsetenv("SCREENSHARE_PLATFORM");
        g_made = 0;
        g_choice = &m_choice;
        g_empty = m_empty;
    }
    ~WindowServerChoices() override {
        g_choice = nullptr;
        g_empty = nullptr;
        g_seenByMaker = nullptr;
        unsetenv("SCREENSHARE_PLATFORM");
    }

    static void Ask(const std::string& word) { setenv("SCREENSHARE_PLATFORM", word.c_str(), 1); }

    const ServerPtr m_empty = NewServer();
    WindowServerChoice m_choice{MAKERS, m_empty};
    CTraceLog m_log;
};

/// A thread that is inside a maker until Finish.
class StalledMaker {
public:
    explicit StalledMaker(WindowServerChoice& choice) {
        g_stalled = &m_stalled;
        g_goOn = m_goOn.get_future().share();
        g_stall = true;
        setenv("SCREENSHARE_PLATFORM", "slow", 1);
        m_current = std::async(std::launch::async, [&choice] { return choice.Current(); });
    }
    ~StalledMaker() {
        if (m_current.valid())
            Finish();
        g_stalled = nullptr;
        g_goOn = {};
    }

    bool WaitUntilInside() { return m_stalled.get_future().wait_for(GENEROUS) == std::future_status::ready; }

    /// Lets the maker come back and gives what its thread got.
    ServerPtr Finish() {
        m_goOn.set_value();
        return m_current.get();
    }

private:
    std::promise<void> m_stalled;
    std::promise<void> m_goOn;
    std::future<ServerPtr> m_current;
};

/// Asks for a server on a thread of its own.
class AskingThread {
public:
    template <class F>
    explicit AskingThread(F ask)
        : m_thread([this, ask] {
              m_id = gettid();
              m_server = ask();
              m_done = true;
          }) {}
    ~AskingThread() {
        if (m_thread.joinable())
            m_thread.join();
    }

    /// False when it comes back instead.
    bool WaitUntilAsleep() const {
        const auto deadline = std::chrono::steady_clock::now() + GENEROUS;
        while (!m_done && std::chrono::steady_clock::now() < deadline) {
            if (m_id != 0 && IsAsleep(m_id))
                return true;
            std::this_thread::yield();
        }
        return false;
    }

    ServerPtr Join() {
        m_thread.join();
        return m_server;
    }

private:
    static bool IsAsleep(pid_t thread) {
        std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
        std::string line;
        std::getline(file, line);
        const std::size_t nameEnd = line.rfind(')');
        return nameEnd != std::string::npos && line.compare(nameEnd, 3, ") S") == 0;
    }

    ServerPtr m_server;
    std::atomic<pid_t> m_id{0};
    std::atomic<bool> m_done{false};
    std::thread m_thread;
};

} // namespace

TEST_F(WindowServerChoices, MakeTheServerAtTheFirstCallAndKeepIt) {
    EXPECT_EQ(g_made, 0);
    const ServerPtr server = m_choice.Current();
    EXPECT_NE(server, m_empty);
    EXPECT_EQ(m_choice.Current(), server);
    EXPECT_EQ(g_made, 1);
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(WindowServerChoices, TakeAnEmptyVariableForAuto) {
    Ask("");
    EXPECT_NE(m_choice.Current(), m_empty);
    EXPECT_EQ(g_made, 1);
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(WindowServerChoices, GoWithoutAServerThatIsNotInTheBuildAndSayWhich) {
    Ask("missing");
    EXPECT_EQ(m_choice.Current(), m_empty);
    EXPECT_EQ(m_choice.Current(), m_empty);
    ASSERT_EQ(m_log.Lines().size(), 1u);
    EXPECT_EQ(m_log.Entries()[0].level, CM_TRACE_WARNING);
    EXPECT_TRUE(
        IsLineAt(m_log.Lines()[0],
                 "[[ScreenShare],[Core]] WARNING: SCREENSHARE_PLATFORM asks for a window server that is not "
                 "available in this build, going on without one, asked for=missing",
                 PLACE));
}

TEST_F(WindowServerChoices, GoWithoutAServerForAnUnknownWordAndSayWhich) {
    for (const std::string word : {"wayland", "AUTO", "auto ", "au", "missing,auto"}) {
        SCOPED_TRACE(word);
        m_log.Clear();
        m_choice.Replace(nullptr);
        Ask(word);
        EXPECT_EQ(m_choice.Current(), m_empty);
        EXPECT_EQ(m_choice.Current(), m_empty);
        ASSERT_EQ(m_log.Lines().size(), 1u);
        EXPECT_EQ(m_log.Entries()[0].level, CM_TRACE_WARNING);
        EXPECT_TRUE(
            IsLineAt(m_log.Lines()[0],
                     "[[ScreenShare],[Core]] WARNING: SCREENSHARE_PLATFORM names no window server, going on "
                     "without one, asked for=" +
                         word,
                     PLACE));
    }
    EXPECT_EQ(g_made, 0);
}

TEST_F(WindowServerChoices, BearAWordLongerThanALineOfTrace) {
    Ask(std::string(100000, 'x'));
    EXPECT_EQ(m_choice.Current(), m_empty);
    EXPECT_EQ(m_log.CountContaining("names no window server"), 1u);
}

TEST_F(WindowServerChoices, GoWithoutAServerThatCannotBeMade) {
    for (const std::string word : {"nothing", "throw"}) {
        SCOPED_TRACE(word);
        m_log.Clear();
        m_choice.Replace(nullptr);
        Ask(word);
        EXPECT_EQ(m_choice.Current(), m_empty);
        EXPECT_EQ(m_choice.Current(), m_empty);
        ASSERT_EQ(m_log.Lines().size(), 1u);
        EXPECT_TRUE(
            IsLineAt(m_log.Lines()[0],
                     "[[ScreenShare],[Core]] WARNING: The window server could not be made, going on without "
                     "one, asked for=" +
                         word,
                     PLACE));
    }
}

TEST_F(WindowServerChoices, ReadTheVariableAgainOnlyAfterReplacingByNull) {
    const ServerPtr first = m_choice.Current();
    Ask("missing");
    EXPECT_EQ(m_choice.Current(), first);
    EXPECT_EQ(m_choice.Replace(nullptr), first);
    EXPECT_EQ(m_choice.Current(), m_empty);
    Ask("auto");
    EXPECT_EQ(m_choice.Replace(nullptr), m_empty);
    const ServerPtr second = m_choice.Current();
    EXPECT_NE(second, m_empty);
    EXPECT_NE(second, first);
    EXPECT_EQ(g_made, 2);
}

TEST_F(WindowServerChoices, ReplaceWithoutChoosingFirst) {
    const ServerPtr own = NewServer();
    EXPECT_EQ(m_choice.Replace(own), nullptr);
    EXPECT_EQ(m_choice.Current(), own);
    EXPECT_EQ(g_made, 0);
}

TEST_F(WindowServerChoices, KeepNothingOfAServerThatWasReplaced) {
    m_choice.Replace(NewServer());
    const std::weak_ptr<WindowServer> replaced = m_choice.Current();
    m_choice.Replace(NewServer());
    EXPECT_TRUE(replaced.expired());
}

TEST_F(WindowServerChoices, GiveAMakerThatAsksBackTheEmptyServer) {
    Ask("asking back");
    const ServerPtr server = m_choice.Current();
    EXPECT_EQ(g_seenByMaker, m_empty);
    EXPECT_NE(server, m_empty);
    EXPECT_EQ(m_choice.Current(), server);
    EXPECT_TRUE(m_log.Lines().empty());
}

TEST_F(WindowServerChoices, ReportAMakerThatReplaces) {
    Ask("replacing");
    const unsigned reportsBefore = cm_assertion_count();
    const ServerPtr server = m_choice.Current();
    EXPECT_EQ(cm_assertion_count(), reportsBefore + 1);
    EXPECT_EQ(g_seenByMaker, nullptr);
    EXPECT_NE(server, m_empty);
    EXPECT_EQ(m_choice.Current(), server);
}

TEST_F(WindowServerChoices, MakeOneServerForAllThreadsThatAskAtOnce) {
    const int rounds = 200 * TestEffort();
    constexpr int THREADS = 4;
    std::cout << "rounds: " << rounds << ", threads: " << THREADS << ", no seed\n";
    for (int round = 1; round <= rounds; ++round) {
        std::latch start(THREADS);
        std::vector<std::future<ServerPtr>> threads;
        for (int i = 0; i < THREADS; ++i) {
            threads.push_back(std::async(std::launch::async, [this, &start] {
                start.arrive_and_wait();
                return m_choice.Current();
            }));
        }
        const ServerPtr server = threads[0].get();
        EXPECT_NE(server, nullptr);
        for (int i = 1; i < THREADS; ++i)
            EXPECT_EQ(threads[static_cast<std::size_t>(i)].get(), server);
        ASSERT_EQ(g_made, round);
        ASSERT_EQ(m_choice.Replace(nullptr), server);
    }
}

TEST_F(WindowServerChoices, HaveOthersWaitForTheServerThatIsBeingMade) {
    StalledMaker stalled(m_choice);
    ASSERT_TRUE(stalled.WaitUntilInside());
    AskingThread other([this] { return m_choice.Current(); });
    EXPECT_TRUE(other.WaitUntilAsleep());
    const ServerPtr server = stalled.Finish();
    EXPECT_EQ(other.Join(), server);
    EXPECT_EQ(g_made, 1);
}

TEST_F(WindowServerChoices, ReplaceTheServerThatIsBeingMadeOnceItIsReady) {
    StalledMaker stalled(m_choice);
    ASSERT_TRUE(stalled.WaitUntilInside());
    const ServerPtr own = NewServer();
    AskingThread replacing([this, &own] { return m_choice.Replace(own); });
    EXPECT_TRUE(replacing.WaitUntilAsleep());
    const ServerPtr made = stalled.Finish();
    EXPECT_EQ(replacing.Join(), made);
    EXPECT_EQ(m_choice.Current(), own);
}

TEST_F(WindowServerChoices, TraceWhenOthersNeedNotWaitAnyMore) {
    struct Receiver {
        WindowServerChoice& choice;
        std::future_status status = std::future_status::timeout;
    } receiver{m_choice};
    CmSetTraceReceiver(
        [](void* context, int, const char*, const char*, int) {
            auto& self = *static_cast<Receiver*>(context);
            // Left behind when it hangs, so that the test can tell.
            auto* const other = new std::future<ServerPtr>(
                std::async(std::launch::async, [&choice = self.choice] { return choice.Current(); }));
            self.status = other->wait_for(GENEROUS);
            if (self.status == std::future_status::ready)
                delete other;
        },
        &receiver);
    Ask("missing");
    EXPECT_EQ(m_choice.Current(), m_empty);
    EXPECT_EQ(receiver.status, std::future_status::ready);
}

TEST_F(WindowServerChoices, MakeTheServerAnewInAProcessForkedWhileAnotherThreadMadeIt) {
    StalledMaker stalled(m_choice);
    ASSERT_TRUE(stalled.WaitUntilInside());
    m_choice.BeforeFork();
    const pid_t child = fork();
    if (child == 0) {
        alarm(static_cast<unsigned>(GENEROUS.count()));
        m_choice.AfterForkInChild();
        const ServerPtr server = m_choice.Current();
        _exit(server != nullptr && server != m_empty && m_choice.Current() == server && g_made == 2 ? 0 : 1);
    }
    m_choice.AfterForkInParent();
    EXPECT_EQ(ExitCodeOf(child), 0);
    EXPECT_NE(stalled.Finish(), m_empty);
    EXPECT_EQ(g_made, 1);
}

TEST_F(WindowServerChoices, GiveAProcessForkedFromInsideAMakerTheEmptyServer) {
    Ask("forking");
    EXPECT_NE(m_choice.Current(), m_empty);
    EXPECT_EQ(g_childsExitCode, 0);
}
