// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/forwarding_window_server.h"
#include "tests/support/settings_scope.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <vector>

/// A walk that stands is the walk that would have been made. Random histories of a desktop and of a client,
/// before two contexts: one may let its last walk stand, and the other one walks each time, as lines are
/// traced meanwhile.

namespace {

using platform::DisplayList;
using platform::SimulatedOperation;
using platform::SimulatedWindowServer;

constexpr int WIDTH = 200;
constexpr int HEIGHT = 120;
constexpr unsigned WINDOWS = 12; // ids
constexpr unsigned DISPLAYS = 3;

class CStandingContext : public ShareCapturerContextMac {
public:
    using ShareCapturerContextMac::m_mapAppDisplayRects;
    using ShareCapturerContextMac::m_nTopAppWindow;
    using ShareCapturerContextMac::m_rgnApplications;
    using ShareCapturerContextMac::m_vCapturedWindows;

    /// What a walk tells, as text.
    std::string Found() {
        std::string text = "generation " + std::to_string(WalkedGeneration()) + ", top " +
                           std::to_string(unsigned{m_nTopAppWindow});
        text += ", captured" + Text(m_vCapturedWindows);
        text += ", excluded" + Text(Got(*this, &ShareCapturerContext::GetCapturedExcludedWindows));
        text += ", displays" + Text(Got(*this, &ShareCapturerContext::GetAppMonitors));
        text += ", applications " + m_rgnApplications.ToString();
        for (const Getter<TVLRegion> get :
             {&ShareCapturerContext::GetVisiableRegion, &ShareCapturerContext::GetOverlapRegion,
              &ShareCapturerContext::GetSharedWindowRegion, &ShareCapturerContext::GetExposedRegion})
            text += ", region " + Region(RegionGot(*this, get)).ToString();
        for (const auto& [display, rect] : m_mapAppDisplayRects)
            text += ", display " + std::to_string(display) + " at " + std::to_string(rect.left) + " " +
                    std::to_string(rect.top) + " " + std::to_string(rect.right) + " " +
                    std::to_string(rect.bottom);
        return text;
    }

private:
    static std::string Text(const Values& values) {
        std::string text;
        for (const unsigned value : values)
            text += " " + std::to_string(value);
        return text;
    }
};

/// A window server whose list of displays stays the same object while it tells the same, as a real one's
/// does: the simulated one makes it anew with every change of anything.
class CKeepingWindowServer final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    std::shared_ptr<const DisplayList> GetDisplays() const override {
        std::shared_ptr<const DisplayList> displays = CForwardingWindowServer::GetDisplays();
        if (!AreSame(*m_displays, *displays))
            m_displays = std::move(displays);
        return m_displays;
    }

private:
    static bool AreSame(const DisplayList& one, const DisplayList& other) {
        return std::equal(one.begin(), one.end(), other.begin(), other.end(),
                          [](const platform::DisplayInfo& a, const platform::DisplayInfo& b) {
                              return a.id == b.id && a.bounds == b.bounds &&
                                     a.visibleBounds == b.visibleBounds;
                          });
    }

    mutable std::shared_ptr<const DisplayList> m_displays = std::make_shared<const DisplayList>();
};

platform::Scene EmptyScene() {
    platform::Scene scene;
    scene.Display(0, 0, WIDTH, HEIGHT).Reserving({0, 10, 0, 20});
    scene.Display(WIDTH, 0, WIDTH, HEIGHT);
    return scene;
}

class History {
public:
    explicit History(std::uint64_t seed)
        : m_random(seed),
          m_server(EmptyScene().Serve()),
          m_former(platform::ReplaceWindowServer(std::make_shared<CKeepingWindowServer>(m_server))) {
        for (unsigned id = 1; id <= WINDOWS; ++id)
            AddWindow(id);
        ForBoth([](auto& context) { context.AddSharedDisplay(1); });
        ForBoth([](auto& context) { context.AddSharedApp(100); });
        const bool isWithoutMenuBars = Toss();
        ForBoth([&](auto& context) { context.m_bNoWindowBaseArea = !isWithoutMenuBars; });
        ForBoth([&](auto& context) { context.m_bExcludeMenuBar = isWithoutMenuBars; });
    }
    ~History() { platform::ReplaceWindowServer(m_former); }
    History(const History&) = delete;
    History& operator=(const History&) = delete;

    /// The first difference; empty when there is none.
    std::string FirstDifference(int steps) {
        for (int step = 0; step < steps; ++step) {
            const std::string what = Pick(3) == 0 ? "nothing" : Change();
            if (Pick(40) == 0)
                WalkFailing();
            const std::uint64_t before = m_standing.Publications();
            const int result = m_standing.UpdateShareCapturerContext();
            stood += result != 0 && m_standing.Publications() == before ? 1 : 0;
            const std::string before2 = m_walking.Found();
            const int expected = WalkAnyway();
            const std::string found = m_walking.Found();
            happened[what] += 1;
            mattered[what] += found != before2 ? 1 : 0;
            if (result != expected || m_standing.Found() != found)
                return "step " + std::to_string(step) + " behind " + what + "\n" + m_standing.Found() +
                       "\n instead of \n" + found;
        }
        return {};
    }

    int stood = 0;
    std::map<std::string, int> happened;
    std::map<std::string, int> mattered;

private:
    int Pick(int count) { return static_cast<int>(m_random() % static_cast<unsigned>(count)); }
    bool Toss() { return Pick(2) == 0; }
    unsigned SomeWindow() { return m_ids.empty() ? 1 : m_ids[m_random() % m_ids.size()]; }
    pid_t SomeOwner() { return Pick(4) * 100; } // 0 is nobody
    unsigned SomeApp() { return static_cast<unsigned>(1 + Pick(3)) * 100; }
    unsigned SomeDisplay() { return static_cast<unsigned>(1 + Pick(DISPLAYS)); }
    platform::CGPoint SomePoint() {
        return {static_cast<float>(Pick(2 * WIDTH)), static_cast<float>(Pick(HEIGHT))};
    }

    template <class Fn>
    void ForBoth(Fn fn) {
        fn(m_standing);
        fn(m_walking);
    }

    int WalkAnyway() {
        CmSetTraceThreshold(CM_TRACE_DEBUG);
        const int result = m_walking.UpdateShareCapturerContext();
        CmSetTraceThreshold(-1);
        return result;
    }

    /// What was found out while a question failed, or took so long that windows were pinned no more, must not
    /// stand when all are answered again.
    void WalkFailing() {
        constexpr SimulatedOperation OPERATIONS[] = {
            SimulatedOperation::GetLife, SimulatedOperation::GetWindows, SimulatedOperation::GetDisplays};
        const SimulatedOperation operation = OPERATIONS[Pick(3)];
        const auto call = static_cast<unsigned>(1 + Pick(40));
        if (Toss())
            m_server->FailNth(operation, call);
        else
            m_server->DoAt(operation, call, [this] { m_clock->Advance(std::chrono::milliseconds(100)); });
        m_standing.SetShareType(m_standing.GetShareType() == SHARE_TYPE_APP ? SHARE_TYPE_DESKTOP
                                                                            : SHARE_TYPE_APP);
        m_standing.UpdateShareCapturerContext();
        m_standing.SetShareType(m_walking.GetShareType());
        m_standing.UpdateShareCapturerContext();
        m_server->Heal(operation);
        // Menu bars are told by the displays that the walk before found: one more brings both to the same
        // ones.
        m_standing.UpdateShareCapturerContext();
        WalkAnyway();
        ++happened["a question that fails, or takes too long"];
    }

    void AddWindow(unsigned id) {
        platform::SimulatedWindow window;
        window.info.id = id;
        window.info.owner = SomeOwner();
        window.info.frame = {SomePoint(),
                             {static_cast<float>(10 + Pick(120)), static_cast<float>(5 + Pick(80))}};
        if (m_server->AddWindow(window) != 0)
            m_ids.push_back(id);
    }

    std::string Change() {
        switch (Pick(4)) {
            case 0:
                return ChangeWindow();
            case 1:
                return Pick(2) == 0 ? ChangeDisplay() : ChangeServer();
            case 2:
                return ChangeLists();
            default:
                return ChangeSettings();
        }
    }

    std::string ChangeWindow() {
        const unsigned window = SomeWindow();
        constexpr int LEVELS[] = {0,
                                  0,
                                  0,
                                  3,
                                  platform::SIMULATED_LEVEL_DOCK,
                                  platform::SIMULATED_LEVEL_MAIN_MENU,
                                  platform::SIMULATED_LEVEL_DESKTOP};
        switch (Pick(13)) {
            case 0:
                AddWindow(++m_lastWindow);
                return "a new window";
            case 1:
                if (m_ids.size() > WINDOWS / 2 && m_server->CloseWindow(window))
                    std::erase(m_ids, window);
                return "a closed window";
            case 2:
                m_server->MoveWindow(window, Pick(3) == 0 ? platform::CGPoint{} : SomePoint());
                return "a moved window";
            case 3:
                m_server->SetTitle(window, std::to_string(m_random()));
                return "a title";
            case 4:
                m_server->SetOwner(window, SomeOwner());
                return "an owner";
            case 5:
                m_server->SetLevel(window, LEVELS[Pick(7)]);
                return "a level";
            case 6:
                m_server->SetAlpha(window, static_cast<float>(Pick(3)) / 2);
                return "alpha";
            case 7:
                m_server->SetSharing(
                    window, Toss() ? platform::SharingState::None : platform::SharingState::ReadOnly);
                return "a sharing state";
            case 8:
                m_server->SetOnScreen(window, Pick(3) != 0);
                return "a hidden window";
            case 9:
            case 10:
                // At the start of a display, and others lie within it.
                m_server->SetLevel(window, platform::SIMULATED_LEVEL_MAIN_MENU);
                m_server->SetFrame(window, {{Toss() ? 0.0F : WIDTH, 0}, {WIDTH, 60}});
                return "a menu bar";
            case 11:
                m_server->RaiseWindow(window);
                return "a raised window";
            default:
                m_server->LowerWindow(window);
                return "a lowered window";
        }
    }

    std::string ChangeDisplay() {
        const unsigned display = SomeDisplay();
        const bool isTold = Toss(); // as contexts are told by a notice, later
        std::string what;
        switch (Pick(5)) {
            case 0:
                m_server->MoveDisplay(display, SomePoint());
                what = "a moved display";
                break;
            case 1:
                m_server->ResizeDisplay(
                    display, {static_cast<float>(100 + Pick(WIDTH)), static_cast<float>(60 + Pick(HEIGHT))});
                what = "a resized display";
                break;
            case 2:
                m_server->ReserveEdges(display,
                                       {0, static_cast<float>(Pick(20)), 0, static_cast<float>(Pick(40))});
                what = "a dock";
                break;
            case 3:
                m_server->SetMainDisplay(display);
                what = "another main display";
                break;
            default:
                if (!m_server->RemoveDisplay(3)) {
                    platform::SimulatedDisplay third;
                    third.id = 3;
                    third.bounds = {{0, HEIGHT}, {WIDTH, HEIGHT}};
                    m_server->AddDisplay(third);
                }
                what = "a display that comes or goes";
                break;
        }
        if (isTold)
            ForBoth([display](auto& context) { context.UpdateSharedDisplay(display); });
        return what;
    }

    std::string ChangeServer() {
        if (Pick(3) != 0) {
            m_server->Lose();
            if (Toss()) {
                m_standing.UpdateShareCapturerContext();
                WalkAnyway();
            }
            m_server->FindAgain();
            return "a server that is lost and found";
        }
        platform::SimulatedDesktop copy;
        m_server->Change([&](platform::SimulatedDesktop& desktop) { copy = desktop; });
        std::reverse(copy.windows.begin(), copy.windows.end());
        m_server = std::make_shared<SimulatedWindowServer>(copy);
        platform::ReplaceWindowServer(std::make_shared<CKeepingWindowServer>(m_server));
        return "another server";
    }

    std::string ChangeLists() {
        const unsigned window = SomeWindow();
        const unsigned app = SomeApp();
        const unsigned display = SomeDisplay();
        using Context = ShareCapturerContext;
        struct Operation {
            const char* name;
            int (Context::*run)(unsigned);
            unsigned value;
        };
        const Operation operations[] = {
            {"AddSharedWindow", &Context::AddSharedWindow, window},
            {"RemoveSharedWindow", &Context::RemoveSharedWindow, window},
            {"AddUnSharedWindow", &Context::AddUnSharedWindow, window},
            {"RemoveUnSharedWindow", &Context::RemoveUnSharedWindow, window},
            {"AddSharedApp", &Context::AddSharedApp, app},
            {"RemoveSharedApp", &Context::RemoveSharedApp, app},
            {"AddUnSharedApp", &Context::AddUnSharedApp, app},
            {"RemoveUnSharedApp", &Context::RemoveUnSharedApp, app},
            {"AddSharedDisplay", &Context::AddSharedDisplay, display},
            {"RemoveSharedDisplay", &Context::RemoveSharedDisplay, display},
        };
        const Operation operation = operations[Pick(10)];
        ForBoth([&](auto& context) { (context.*operation.run)(operation.value); });
        return operation.name;
    }

    std::string ChangeSettings() {
        switch (Pick(8)) {
            case 0: {
                const bool on = Toss();
                ForBoth([on](auto& context) { context.m_bNoWindowBaseArea = on; });
                return "m_bNoWindowBaseArea";
            }
            case 1: {
                const bool on = Toss();
                ForBoth([on](auto& context) { context.m_bExcludeMenuBar = on; });
                return "m_bExcludeMenuBar";
            }
            case 2: {
                const bool on = Toss();
                ForBoth([on](auto& context) { context.m_bFindsExposed = on; });
                return "m_bFindsExposed";
            }
            case 3:
                m_settings->m_bAppDisplayByWindow = Toss();
                return "m_bAppDisplayByWindow";
            case 4:
                m_settings->m_nShareConfigFlags = Toss() ? SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET : 0U;
                return "displays as set";
            case 5:
                m_settings->m_nShareConfigFlags = Pick(3) == 0 ? SHARE_CONFIG_FLAG_NO_WINDOW_WALK : 0U;
                return "no walk";
            case 6:
                ForBoth([](auto& context) { context.ClearSharedDisplay(); });
                return "ClearSharedDisplay";
            default: {
                const auto type = Toss() ? SHARE_TYPE_DESKTOP : SHARE_TYPE_WINDOW;
                ForBoth([type](auto& context) { context.SetShareType(type); });
                return "SetShareType";
            }
        }
    }

    CManualClockScope m_clock; // no pin runs out because the machine is busy
    std::mt19937_64 m_random;
    const CSettingsScope m_settingsOfProcess;
    CSettingsScope m_settings;
    std::shared_ptr<SimulatedWindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
    unsigned m_lastWindow = WINDOWS;
    std::vector<unsigned> m_ids;
    CStandingContext m_standing;
    CStandingContext m_walking;
};

} // namespace

TEST(StandingWalk, IsTheWalkThatWouldHaveBeenMade) {
    constexpr int STEPS = 100;
    const int histories = 80 * TestEffort();
    const std::uint64_t seed = std::random_device{}();
    int stood = 0;
    std::map<std::string, int> happened;
    std::map<std::string, int> mattered;
    for (int i = 0; i < histories; ++i) {
        History history(seed + static_cast<std::uint64_t>(i));
        const std::string difference = history.FirstDifference(STEPS);
        ASSERT_EQ(difference, "") << "seed " << seed + static_cast<std::uint64_t>(i);
        stood += history.stood;
        for (const auto& [what, times] : history.happened)
            happened[what] += times;
        for (const auto& [what, times] : history.mattered)
            mattered[what] += times;
    }
    std::printf("%d steps, %d walks stood, from seed %llu\n", histories * STEPS, stood,
                static_cast<unsigned long long>(seed));
    for (const auto& [what, times] : happened)
        std::printf("%s %d, %d with other results\n", what.c_str(), times, mattered[what]);
    EXPECT_GT(stood, histories * STEPS / 5);
    EXPECT_GT(happened["a question that fails, or takes too long"], histories / 2);
    for (const char* const what :
         {"a new window", "a moved window", "an owner", "a level", "alpha", "a dock", "another main display",
          "a menu bar", "AddSharedWindow", "AddUnSharedApp", "AddSharedDisplay", "m_bNoWindowBaseArea",
          "m_bExcludeMenuBar", "m_bFindsExposed", "m_bAppDisplayByWindow", "displays as set", "SetShareType"})
        EXPECT_GT(mattered[what], 0) << what;
}
