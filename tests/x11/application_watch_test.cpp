// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/application_watch.h"
#include "tests/support/no_descriptors.h"
#include "tests/x11/window_tree_bench.h"
#include "tests/x11/x11_rig.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <future>
#include <iostream>
#include <thread>

namespace platform::x11 {
namespace {

std::string Stat(const std::string& name, char state, int threads, const std::string& start) {
    std::string text = "77 (" + name + ") " + state;
    for (int field = 4; field < 20; ++field)
        text += " 0";
    return text + " " + std::to_string(threads) + " 0 " + start + " 4096 1\n";
}

TEST(StartFromStat, IsNotMisledByTheProcessName) {
    EXPECT_EQ(StartFromStat(Stat("plain", 'S', 1, "123")), 123U);
    EXPECT_EQ(StartFromStat(Stat(") R 1 2 3 (a\n b)", 'S', 1, "18446744073709551615")), ~std::uint64_t{0});
}

TEST(StartFromStat, GivesNothingOfProcessesThatHaveEnded) {
    EXPECT_FALSE(StartFromStat(Stat("x", 'Z', 1, "123")));
    EXPECT_FALSE(StartFromStat(Stat("x", 'X', 0, "123")));
    EXPECT_EQ(StartFromStat(Stat("x", 'Z', 4, "123")), 123U) << "only its first thread has ended";
}

TEST(StartFromStat, GivesNothingOfWhatIsNoStat) {
    for (const std::string text : {"", ")", "77 (x)", "77 (x) S 1 2", "no parenthesis S 1 2 3"})
        EXPECT_FALSE(StartFromStat(text)) << text;
    EXPECT_FALSE(StartFromStat(Stat("x", 'S', 1, "-1")));
    EXPECT_FALSE(StartFromStat(Stat("x", 'S', 1, "99999999999999999999999")));
    EXPECT_FALSE(StartFromStat(Stat("x", 'S', 1, "12x")));
}

/// Applications as a made-up system tells of them.
class ApplicationWatchTest : public testing::Test {
protected:
    ApplicationWatchTest() { std::filesystem::create_directories(m_folder.Path() / "data/applications"); }

    void Start(pid_t pid, const std::string& command, const std::string& program, std::uint64_t when = 5) {
        const std::filesystem::path folder = m_folder.Path() / "proc" / std::to_string(pid);
        std::filesystem::remove_all(folder);
        std::filesystem::create_directories(folder);
        std::ofstream(folder / "stat") << Stat(command, 'S', 1, std::to_string(when));
        std::ofstream(folder / "comm") << command << "\n";
        if (!program.empty())
            std::filesystem::create_symlink(program, folder / "exe");
    }
    void End(pid_t pid) { std::filesystem::remove_all(m_folder.Path() / "proc" / std::to_string(pid)); }
    void Install(const std::string& file, const std::string& lines) {
        std::ofstream(m_folder.Path() / "data/applications" / file) << "[Desktop Entry]\nType=Application\n"
                                                                    << lines;
    }

    bool Update(const std::vector<ApplicationWindow>& windows) { return m_watch.Update(windows); }
    ApplicationInfo Listed(pid_t pid) {
        for (const ApplicationInfo& info : *m_watch.Applications()) {
            if (info.pid == pid)
                return info;
        }
        return {};
    }

    CScratchFolder m_folder;
    ApplicationWatch m_watch{m_folder.File("proc"), {m_folder.File("data")}};
};

TEST_F(ApplicationWatchTest, NamesThemByEntryElseClassElseCommandElseFile) {
    Install("writer.desktop", "Name=The Writer\n");
    Start(10, "writer-bin", "/opt/writer/writer-bin");
    Start(11, "other", "/usr/bin/other (deleted)");
    Start(12, "tool", "");
    Start(13, "", "/usr/bin/nameless");
    Start(14, "", "");
    ASSERT_TRUE(
        Update({{10, "Writer", true}, {11, "Other", true}, {12, "", true}, {13, "", true}, {14, "", true}}));
    EXPECT_EQ(Listed(10).name, "The Writer");
    EXPECT_EQ(Listed(10).fileName, "writer-bin");
    EXPECT_EQ(Listed(11).name, "Other");
    EXPECT_EQ(Listed(11).fileName, "other");
    EXPECT_EQ(Listed(12).name, "tool");
    EXPECT_EQ(Listed(12).fileName, "tool");
    EXPECT_EQ(Listed(13).name, "nameless");
    EXPECT_EQ(Listed(14).name, "Process 14");
}

TEST_F(ApplicationWatchTest, TakesNobodyForEndedWhileNothingCanBeOpened) {
    const std::vector<ApplicationWindow> windows{{10, "Writer", true}};
    Start(10, "writer-bin", "/opt/writer/writer-bin");
    ASSERT_TRUE(Update(windows));
    {
        const CNoDescriptorsScope none;
        EXPECT_FALSE(m_watch.Reap());
        EXPECT_FALSE(Update(windows));
        EXPECT_EQ(Listed(10).pid, 10);
    }
    End(10);
    EXPECT_TRUE(m_watch.Reap());
    EXPECT_EQ(Listed(10).pid, 0);
}

TEST_F(ApplicationWatchTest, ListsWhoCameWhileNothingCouldBeOpenedAsSoonAsItCan) {
    Start(10, "writer-bin", "/opt/writer/writer-bin");
    {
        const CNoDescriptorsScope none;
        EXPECT_FALSE(Update({{10, "Writer", true}}));
        EXPECT_TRUE(m_watch.NeedsPolling());
    }
    EXPECT_TRUE(m_watch.Reap());
    EXPECT_EQ(Listed(10).name, "Writer");
}

TEST_F(ApplicationWatchTest, TellsPeopleNothingThatIsNotText) {
    Start(10, "x",
          "/usr/bin/b\xFF"
          "d");
    ASSERT_TRUE(Update({{10,
                         "\x01\xC0"
                         "ab\n",
                         true}}));
    EXPECT_EQ(Listed(10).name,
              "\xEF\xBF\xBD"
              "ab");
    EXPECT_EQ(Listed(10).fileName,
              "b\xEF\xBF\xBD"
              "d");
}

TEST_F(ApplicationWatchTest, TellsOrdinaryOnesFromOthers) {
    Install("panel.desktop", "Name=Panel\n");
    Start(10, "a", "");
    Start(11, "b", "");
    Start(12, "c", "");
    ASSERT_TRUE(Update({{10, "A", false}, {11, "Panel", false}, {12, "C", false}, {12, "", true}}));
    EXPECT_EQ(Listed(10).kind, ApplicationKind::Other);
    EXPECT_EQ(Listed(11).kind, ApplicationKind::Ordinary);
    EXPECT_EQ(Listed(12).kind, ApplicationKind::Ordinary);
}

TEST_F(ApplicationWatchTest, KeepsThemWithoutWindowsUntilTheyEnd) {
    Start(10, "a", "");
    ASSERT_TRUE(Update({{10, "A", true}}));
    EXPECT_FALSE(Listed(10).backgroundOnly);
    EXPECT_FALSE(Update({{10, "A", true}}));
    ASSERT_TRUE(Update({}));
    EXPECT_TRUE(Listed(10).backgroundOnly);
    EXPECT_EQ(Listed(10).name, "A");
    EXPECT_EQ(Listed(10).kind, ApplicationKind::Ordinary);
    EXPECT_TRUE(m_watch.NeedsPolling());
    EXPECT_FALSE(m_watch.Reap());
    End(10);
    EXPECT_TRUE(m_watch.Reap());
    EXPECT_TRUE(m_watch.Applications()->empty());
    EXPECT_FALSE(m_watch.NeedsPolling());
    EXPECT_FALSE(m_watch.Reap());
}

TEST_F(ApplicationWatchTest, KeepsTheNameWhateverWindowIsInFront) {
    Start(10, "a", "");
    ASSERT_TRUE(Update({{10, "Tip", false}}));
    EXPECT_EQ(Listed(10).name, "Tip");
    ASSERT_TRUE(Update({{10, "Tip", false}, {10, "Main", true}, {10, "Second", true}}));
    EXPECT_EQ(Listed(10).name, "Main");
    EXPECT_FALSE(Update({{10, "Second", true}, {10, "Main", true}}));
    EXPECT_EQ(Listed(10).name, "Main");
}

TEST_F(ApplicationWatchTest, IgnoresProcessesThatAreNotSeenFromHere) {
    Start(10, "a", "");
    ASSERT_TRUE(Update({{10, "A", true}, {99, "Elsewhere", true}, {0, "Nobody", true}, {-5, "", true}}));
    EXPECT_EQ(m_watch.Applications()->size(), 1U);
}

TEST_F(ApplicationWatchTest, SeesAnEndAndALaunchWhereAnIdIsUsedAgain) {
    Start(10, "a", "");
    ASSERT_TRUE(Update({{10, "A", true}}));
    Start(10, "b", "", 6);
    ASSERT_TRUE(Update({{10, "B", true}}));
    EXPECT_TRUE(m_watch.Applications()->empty()) << "the end of the first";
    EXPECT_TRUE(m_watch.NeedsPolling());
    ASSERT_TRUE(m_watch.Reap());
    EXPECT_EQ(Listed(10).name, "B");
    EXPECT_FALSE(m_watch.Reap());
}

// ---- Processes that there are

bool IsReadable(int descriptor) {
    pollfd polled{descriptor, POLLIN, 0};
    return poll(&polled, 1, 0) == 1;
}

TEST(ApplicationWatch, HearsOfTheEndOfAProcessThatNobodyHasWaitedFor) {
    CChildProcess::Plan plan;
    plan.command = {"sleep", "1000"};
    CChildProcess child(plan);
    const ProcFolder proc("/proc");
    ASSERT_TRUE(ComesTrue([&] { return proc.ProgramOf(child.Pid()) == "sleep"; }));
    ApplicationWatch watch;
    const std::vector<ApplicationWindow> windows = {{child.Pid(), "Sleeper", true}};
    ASSERT_TRUE(watch.Update(windows));
    EXPECT_EQ(watch.Applications()->at(0).fileName, "sleep");
    ASSERT_EQ(watch.Descriptors().size(), 1U);
    const int descriptor = watch.Descriptors()[0];
    EXPECT_NE(fcntl(descriptor, F_GETFD) & FD_CLOEXEC, 0);
    EXPECT_FALSE(watch.NeedsPolling());
    EXPECT_FALSE(IsReadable(descriptor));
    EXPECT_FALSE(watch.Reap());

    child.Signal(SIGKILL);
    ASSERT_TRUE(ComesTrue([&] { return IsReadable(descriptor); }));
    EXPECT_TRUE(watch.Reap());
    EXPECT_TRUE(watch.Applications()->empty());
    EXPECT_TRUE(watch.Descriptors().empty());
    EXPECT_FALSE(watch.Update(windows)) << "listed again though it has ended";
}

TEST(ApplicationWatch, FindsEndsByLookingWhereItHasNoDescriptors) {
    CChildProcess::Plan plan;
    plan.command = {"sleep", "1000"};
    CChildProcess child(plan);
    ApplicationWatch watch("/proc/.");
    const std::vector<ApplicationWindow> windows = {{child.Pid(), "Sleeper", true}};
    ASSERT_TRUE(watch.Update(windows));
    EXPECT_TRUE(watch.Descriptors().empty());
    EXPECT_TRUE(watch.NeedsPolling());
    EXPECT_FALSE(watch.Reap());
    child.Signal(SIGKILL);
    EXPECT_TRUE(ComesTrue([&] { return watch.Reap(); }));
    EXPECT_TRUE(watch.Applications()->empty());
}

TEST(ApplicationWatch, TakesNoThreadForAProcess) {
    std::promise<pid_t> id;
    std::promise<void> end;
    std::thread thread([&] {
        id.set_value(static_cast<pid_t>(syscall(SYS_gettid)));
        end.get_future().wait();
    });
    ApplicationWatch watch;
    const std::vector<ApplicationWindow> windows = {{id.get_future().get(), "Thread", true}};
    EXPECT_FALSE(watch.Update(windows));
    end.set_value();
    thread.join();
}

// ---- Activation

class ActivationTest : public testing::Test {
protected:
    void Begin(bool managed) {
        m_server.emplace(XServerOptions{});
        if (managed)
            m_manager = XProgram::Openbox(*m_server);
        m_tree.emplace(m_server->Display());
        m_one.emplace(*m_server);
        m_other.emplace(*m_server);
        m_tree->Begin();
    }
    static bool Lacks(bool managed) {
        std::vector<std::string> programs = XServer::ProgramsOf(XServerOptions::Kind::Xvfb);
        if (managed)
            programs.emplace_back("openbox");
        const auto missing = MissingProgram(programs);
        if (missing)
            std::cout << *missing << "\n";
        return missing.has_value();
    }

    CGWindowID Open(const ForeignClient& client, int x) {
        ForeignClient::Look look;
        look.x = x;
        const CGWindowID id = client.Create(look);
        // A window manager calls itself ready before it hears of what is mapped.
        EXPECT_TRUE(ComesTrue([&] {
            xcb_map_window(client.Get(), id);
            client.RoundTrip();
            return IsOnScreen(id);
        }));
        return id;
    }
    bool IsOnScreen(CGWindowID id) {
        const std::shared_ptr<const WindowSnapshot> windows = m_tree->Windows();
        const WindowInfo* const window = windows->Find(id);
        return window != nullptr && window->onScreen;
    }
    /// Whether these come to be listed, in this order, before all others.
    bool ComesToFront(const std::vector<CGWindowID>& frontFirst) {
        return ComesTrue([&] {
            std::vector<CGWindowID> ids;
            const std::shared_ptr<const WindowSnapshot> windows = m_tree->Windows();
            for (const WindowInfo& window : windows->Windows()) {
                if (window.onScreen && (window.owner == m_one->Pid() || window.owner == m_other->Pid()))
                    ids.push_back(window.id);
            }
            return ids.size() >= frontFirst.size() &&
                   std::equal(frontFirst.begin(), frontFirst.end(), ids.begin());
        });
    }
    bool Activate(pid_t pid) {
        m_tree->CatchUp();
        return ActivateWindowsOf(m_tree->connection, m_tree->tree, pid);
    }

    std::optional<XServer> m_server;
    std::unique_ptr<XProgram> m_manager;
    std::optional<ForeignClient> m_one;
    std::optional<ForeignClient> m_other;
    std::optional<TreeBench> m_tree;
};

TEST_F(ActivationTest, BringsAllWindowsToTheFrontInTheirOrder) {
    for (const bool managed : {false, true}) {
        if (Lacks(managed))
            GTEST_SKIP();
        SCOPED_TRACE(managed ? "with a window manager" : "without one");
        m_tree.reset();
        Begin(managed);
        const CGWindowID rear = Open(*m_one, 10);
        const CGWindowID front = Open(*m_one, 150);
        const CGWindowID stranger = Open(*m_other, 300);
        ASSERT_TRUE(Activate(m_other->Pid()));
        ASSERT_TRUE(ComesToFront({stranger}));
        ASSERT_TRUE(Activate(m_one->Pid()));
        EXPECT_TRUE(ComesToFront({front, rear, stranger}));
    }
}

TEST_F(ActivationTest, BringsMinimisedWindowsBack) {
    if (Lacks(true))
        GTEST_SKIP();
    Begin(true);
    const CGWindowID id = Open(*m_one, 10);
    xcb_client_message_event_t message{};
    message.response_type = XCB_CLIENT_MESSAGE;
    message.format = 32;
    message.window = id;
    message.type = m_one->Atom("WM_CHANGE_STATE");
    message.data.data32[0] = 3; // iconic
    xcb_send_event(m_one->Get(), 0, m_one->Root(),
                   XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT,
                   reinterpret_cast<const char*>(&message));
    m_one->RoundTrip();
    ASSERT_TRUE(ComesTrue([&] { return !IsOnScreen(id); }));
    EXPECT_TRUE(Activate(m_one->Pid()));
    EXPECT_TRUE(ComesTrue([&] { return IsOnScreen(id); }));
}

TEST_F(ActivationTest, IsRefusedWhereThereIsNoWindow) {
    if (Lacks(false))
        GTEST_SKIP();
    Begin(false);
    ForeignClient::Look look;
    m_one->Create(look); // never mapped
    m_one->RoundTrip();
    EXPECT_FALSE(Activate(m_one->Pid()));
    EXPECT_FALSE(Activate(m_other->Pid()));
    EXPECT_FALSE(Activate(0));
}

} // namespace
} // namespace platform::x11
