// SPDX-License-Identifier: Apache-2.0
#include "src/mac/app_enum_mac.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/src/share_source_tools.h"
#include "tests/x11/x11_desk.h"
#include "tests/x11/x11_rig.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// The list of applications on a real desktop with a window manager, while programs come and go.

namespace {

using Names = std::vector<std::string>;

/// Whether what was done comes to be seen. It has to be seen within a second; how long it takes here says
/// more about the machine, so that is told and not judged.
bool IsSeen(const std::string& what, const std::function<void()>& act, const std::function<bool()>& seen) {
    const auto begin = std::chrono::steady_clock::now();
    act();
    const bool came = ComesTrue(seen);
    const auto time =
        std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - begin);
    std::cout << what << ": seen after " << time.count() << " ms\n";
    return came;
}

class X11Applications : public testing::Test {
protected:
    ~X11Applications() override { unsetenv("XDG_DATA_HOME"); }

    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin() {
        X11DeskOptions options;
        options.manager = X11DeskOptions::Manager::Openbox;
        if (const auto missing = MissingProgram(options.Programs())) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        setenv("XDG_DATA_HOME", m_data.Path().c_str(), 1);
        m_desk = std::make_shared<X11Desk>(options);
        m_served.emplace(m_desk);
        m_desk->Settle();
        m_list.emplace(true);
        m_list->AddSink(&m_sink);
        m_list->Refresh();
        return true;
    }

    /// An entry as packages install them.
    void Install(const std::string& file, const std::string& name) {
        const std::filesystem::path folder = m_data.Path() / "applications";
        std::filesystem::create_directories(folder);
        std::ofstream(folder / file) << "[Desktop Entry]\nType=Application\nName=" << name << "\n";
    }

    X11Desk& Desk() { return *m_desk; }
    /// Those of the watching list, in its order.
    Names Listed() const { return NamesOf(*m_list); }
    bool Lists(const std::string& name) const {
        const Names names = Listed();
        return std::count(names.begin(), names.end(), name) == 1;
    }
    /// Those that somebody sees who looks now for the first time.
    static Names ListedAnew() {
        CAppEnumMac list(false);
        list.Refresh();
        return NamesOf(list);
    }
    bool WasTold(SHARE_SOURCE_EVENT event, pid_t pid) const {
        const std::vector<SourceEvent> told = m_sink.Told();
        return std::count(told.begin(), told.end(), SourceEvent{event, static_cast<unsigned long>(pid)}) == 1;
    }
    pid_t SeenToStart(const std::string& name) {
        pid_t pid = 0;
        EXPECT_TRUE(IsSeen(
            name, [&] { pid = Desk().StartApplication(name).value_or(0); }, [&] { return Lists(name); }));
        return pid;
    }
    static Names Sorted(Names names) {
        std::sort(names.begin(), names.end());
        return names;
    }

private:
    static Names NamesOf(IShareSourceEnumerator& list) {
        Names names;
        int number = 0;
        list.GetNumber(number);
        for (int i = 0; i < number; ++i) {
            CHeldSource source;
            char name[257] = "";
            if (list.GetSource(i, source.Out()) == 0 && source->GetName(name, 256) == 0)
                names.emplace_back(name);
        }
        return names;
    }

    const CScratchFolder m_data;
    std::shared_ptr<X11Desk> m_desk;
    std::optional<CServedDesk> m_served;
    CSourceSink m_sink;
    mutable std::optional<CAppEnumMac> m_list; // ends before its sink
};

TEST_F(X11Applications, AppearAndDisappearWithTheirProcesses) {
    if (!Begin())
        return;
    EXPECT_EQ(Listed(), Names()) << "the window manager is no application, and neither are we";
    const pid_t writer = SeenToStart("Writer");
    const pid_t reader = SeenToStart("Reader");
    EXPECT_EQ(Listed(), (Names{"Writer", "Reader"}));
    EXPECT_EQ(Sorted(ListedAnew()), (Names{"Reader", "Writer"}));

    EXPECT_TRUE(IsSeen(
        "the end of Writer", [&] { Desk().EndApplication(writer); }, [&] { return !Lists("Writer"); }));
    EXPECT_EQ(Listed(), Names{"Reader"});
    EXPECT_EQ(ListedAnew(), Names{"Reader"});
    EXPECT_TRUE(IsSeen(
        "the end of Reader", [&] { Desk().EndApplication(reader); }, [&] { return Listed().empty(); }));
    for (const pid_t pid : {writer, reader}) {
        EXPECT_TRUE(ComesTrue([&] { return WasTold(SHARE_SOURCE_EVENT_REMOVED, pid); }));
        EXPECT_TRUE(WasTold(SHARE_SOURCE_EVENT_ADDED, pid));
    }
}

TEST_F(X11Applications, AppearOnceHoweverManyWindowsTheyOpen) {
    if (!Begin())
        return;
    const pid_t pid = Desk().StartApplication("Writer").value_or(0);
    for (int i = 0; i < 3; ++i)
        ASSERT_TRUE(Desk().AddWindow(pid, {{50.0F * static_cast<float>(i), 50}, {200, 100}}, 0x00FF00));
    Desk().Settle();
    EXPECT_TRUE(ComesTrue([&] { return Lists("Writer"); }));
    EXPECT_EQ(Listed(), Names{"Writer"});
    EXPECT_EQ(ListedAnew(), Names{"Writer"});
}

TEST_F(X11Applications, BearTheNameThatTheirDesktopEntryTells) {
    Install("org.example.writer.desktop", "The Writer");
    Install("reader.desktop",
            "L\xC3\xA9"
            "ser");
    if (!Begin())
        return;
    Desk().StartApplication("org.example.writer");
    Desk().StartApplication("Reader");
    Desk().StartApplication("Plain");
    EXPECT_TRUE(ComesTrue([&] { return Listed().size() == 3; }));
    EXPECT_EQ(Sorted(Listed()), (Names{"L\xC3\xA9"
                                       "ser",
                                       "Plain", "The Writer"}));
}

/// Programs that a desktop may have, and what people call them.
TEST_F(X11Applications, BearTheNamesThatPeopleKnow) {
    const std::vector<std::pair<std::string, std::string>> known = {
        {"xterm", "XTerm"}, {"xclock", "XClock"}, {"xeyes", "XEyes"}, {"xcalc", "XCalc"}};
    std::vector<std::pair<std::string, std::string>> here;
    for (const auto& each : known) {
        if (!FindProgram(each.first).empty())
            here.push_back(each);
    }
    if (here.empty())
        GTEST_SKIP() << "none of these programs is installed";
    if (!Begin())
        return;
    for (const auto& [program, name] : here) {
        const std::string wanted = name;
        const std::vector<std::string> command{program};
        std::unique_ptr<XProgram> running;
        EXPECT_TRUE(IsSeen(
            wanted, [&] { running = std::make_unique<XProgram>(Desk().Rig(), command); },
            [&] { return Lists(wanted); }))
            << program << ": " << testing::PrintToString(Listed());
        EXPECT_TRUE(IsSeen(
            "the end of " + wanted, [&] { running.reset(); }, [&] { return Listed().empty(); }))
            << program << ": " << testing::PrintToString(Listed());
    }
}

} // namespace
