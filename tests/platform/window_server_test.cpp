// SPDX-License-Identifier: Apache-2.0
#include "platform/window_server.h"

#include "platform/none/none_window_server.h"
#include "tests/support/sanitizer.h"
#include "tests/support/test_effort.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include <sys/wait.h>
#include <unistd.h>

namespace {

using namespace platform;

WindowInfo Window(CGWindowID id, const std::string& title = {}) {
    WindowInfo window;
    window.id = id;
    window.title = title;
    return window;
}

/// The front one of the windows with that id, looked for one by one.
const WindowInfo* FirstWithId(const WindowSnapshot& snapshot, CGWindowID id) {
    const auto& windows = snapshot.Windows();
    const auto found =
        std::find_if(windows.begin(), windows.end(), [id](const WindowInfo& each) { return each.id == id; });
    return found != windows.end() ? &*found : nullptr;
}

class CurrentWindowServers : public testing::Test {
protected:
    /// Whoever runs the tests may have a desktop.
    CurrentWindowServers() {
        unsetenv("DISPLAY");
        ChooseAnew(nullptr);
    }
    ~CurrentWindowServers() override { ChooseAnew(nullptr); }

    /// Null takes the variable away.
    static void ChooseAnew(const char* word) {
        if (word != nullptr)
            setenv("SCREENSHARE_PLATFORM", word, 1);
        else
            unsetenv("SCREENSHARE_PLATFORM");
        ReplaceWindowServer(nullptr);
    }

    static std::string CurrentName() { return CurrentWindowServer()->Name(); }
};

/// A thread that does a thing over and over.
class BusyThread {
public:
    template <class F>
    explicit BusyThread(F thing)
        : m_thread([this, thing] {
              while (!m_stop)
                  thing();
          }) {}
    ~BusyThread() {
        m_stop = true;
        m_thread.join();
    }

private:
    std::atomic<bool> m_stop{false};
    std::thread m_thread;
};

} // namespace

TEST(WindowSnapshot, IsEmptyOfGenerationZeroByDefault) {
    const WindowSnapshot snapshot;
    EXPECT_EQ(snapshot.Generation(), 0u);
    EXPECT_TRUE(snapshot.Windows().empty());
    EXPECT_EQ(snapshot.Find(0), nullptr);
    EXPECT_EQ(snapshot.Find(1), nullptr);
}

TEST(WindowSnapshot, KeepsGenerationAndOrder) {
    const WindowSnapshot snapshot(7, {Window(30, "front"), Window(10, "middle"), Window(20, "back")});
    EXPECT_EQ(snapshot.Generation(), 7u);
    ASSERT_EQ(snapshot.Windows().size(), 3u);
    EXPECT_EQ(snapshot.Windows()[0].title, "front");
    EXPECT_EQ(snapshot.Windows()[1].title, "middle");
    EXPECT_EQ(snapshot.Windows()[2].title, "back");
}

TEST(WindowSnapshot, FindsItsWindowsAndNoOthers) {
    const WindowSnapshot snapshot(1, {Window(30), Window(10), Window(0xFFFFFFFFu), Window(20)});
    for (const WindowInfo& window : snapshot.Windows())
        EXPECT_EQ(snapshot.Find(window.id), &window);
    for (const CGWindowID id : {0u, 9u, 11u, 15u, 25u, 31u, 0xFFFFFFFEu})
        EXPECT_EQ(snapshot.Find(id), nullptr) << id;
}

TEST(WindowSnapshot, FindsTheFrontOneOfEqualIds) {
    const WindowSnapshot snapshot(
        1, {Window(9), Window(5, "front"), Window(5, "middle"), Window(1), Window(5, "back")});
    ASSERT_NE(snapshot.Find(5), nullptr);
    EXPECT_EQ(snapshot.Find(5)->title, "front");
    EXPECT_EQ(snapshot.Windows().size(), 5u);
}

TEST(WindowSnapshot, FindsInItsOwnWindowsAfterACopyAndAMove) {
    WindowSnapshot original(1, {Window(2, "two"), Window(1, "one")});
    const WindowSnapshot copy = original;
    const WindowSnapshot moved = std::move(original);
    for (const WindowSnapshot* const snapshot : {&copy, &moved}) {
        EXPECT_EQ(snapshot->Find(1), &snapshot->Windows()[1]);
        EXPECT_EQ(snapshot->Find(2), &snapshot->Windows()[0]);
    }
    EXPECT_EQ(moved.Find(1)->title, "one");
}

TEST(WindowSnapshot, FindsWhatALinearSearchFinds) {
    const int snapshots = 100 * TestEffort();
    const unsigned seed = 20240607;
    std::cout << "snapshots: " << snapshots << ", seed: " << seed << "\n";
    std::mt19937 random(seed);
    for (int i = 0; i < snapshots; ++i) {
        const auto count = std::uniform_int_distribution<std::size_t>(0, 1000)(random);
        const auto lastId = std::uniform_int_distribution<CGWindowID>(1, 1500)(random);
        std::uniform_int_distribution<CGWindowID> ids(1, lastId);
        std::vector<WindowInfo> windows;
        for (std::size_t j = 0; j < count; ++j)
            windows.push_back(Window(ids(random)));
        const WindowSnapshot snapshot(1, std::move(windows));
        for (CGWindowID id = 0; id <= lastId + 1; ++id)
            ASSERT_EQ(snapshot.Find(id), FirstWithId(snapshot, id)) << "snapshot " << i << ", id " << id;
    }
}

TEST_F(CurrentWindowServers, AreNoneWithoutAWordWhenAskedForAutoAndForNone) {
    const CTraceLog log;
    for (const char* const word : {static_cast<const char*>(nullptr), "", "auto", "none"}) {
        SCOPED_TRACE(word != nullptr ? word : "not set");
        ChooseAnew(word);
        EXPECT_EQ(CurrentName(), "none");
    }
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(CurrentWindowServers, AreTheOneOfX11WhenItIsAskedForAlsoWithoutADisplay) {
    const CTraceLog log;
    ChooseAnew("x11");
    EXPECT_EQ(CurrentName(), "x11");
    EXPECT_EQ(CurrentWindowServer()->GetLife().life, Life::Lost);
    EXPECT_TRUE(CurrentWindowServer()->GetDisplays()->empty());
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(CurrentWindowServers, AreTheSimulatedOneOnlyWhenItIsAskedFor) {
    const CTraceLog log;
    ChooseAnew("simulated");
    EXPECT_EQ(CurrentName(), "simulated");
    EXPECT_FALSE(CurrentWindowServer()->GetDisplays()->empty());
    EXPECT_FALSE(CurrentWindowServer()->GetWindows()->Windows().empty());
    ChooseAnew(nullptr);
    EXPECT_EQ(CurrentName(), "none");
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(CurrentWindowServers, AreNoneWithAWarningForAnUnknownWord) {
    const CTraceLog log;
    ChooseAnew("X11");
    EXPECT_EQ(CurrentName(), "none");
    ASSERT_EQ(log.Lines().size(), 1u);
    EXPECT_TRUE(log.Contains("asked for=X11"));
}

TEST_F(CurrentWindowServers, StayTheSameUntilReplaced) {
    const auto chosen = CurrentWindowServer();
    EXPECT_EQ(CurrentWindowServer(), chosen);
    const auto own = std::make_shared<NoneWindowServer>();
    EXPECT_EQ(ReplaceWindowServer(own), chosen);
    EXPECT_EQ(CurrentWindowServer(), own);
    EXPECT_EQ(ReplaceWindowServer(nullptr), own);
    EXPECT_NE(CurrentWindowServer(), own);
}

TEST_F(CurrentWindowServers, AreNeverNullWhileOthersReplaceThem) {
    const int rounds = 20000 * TestEffort();
    std::cout << "rounds: " << rounds << ", no seed\n";
    const BusyThread byNull([] { ReplaceWindowServer(nullptr); });
    const BusyThread byOwn([] { ReplaceWindowServer(std::make_shared<NoneWindowServer>()); });
    for (int i = 0; i < rounds; ++i) {
        const auto server = CurrentWindowServer();
        ASSERT_NE(server, nullptr) << "round " << i;
        ASSERT_TRUE(server->GetDisplays()->empty());
    }
}

TEST_F(CurrentWindowServers, AreThereInAProcessForkedWhileOthersAskAndReplace) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "nobody frees the locks of a sanitizer's allocator over a fork";
    const int forks = 50 * TestEffort();
    std::cout << "forks: " << forks << ", no seed\n";
    const BusyThread asking([] { CurrentWindowServer(); });
    const BusyThread replacing([] { ReplaceWindowServer(nullptr); });
    for (int i = 0; i < forks; ++i) {
        const pid_t child = fork();
        if (child == 0) {
            alarm(30);
            ReplaceWindowServer(nullptr);
            _exit(CurrentWindowServer() != nullptr ? 0 : 1);
        }
        int status = -1;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << "fork " << i << ", status " << status;
    }
}
