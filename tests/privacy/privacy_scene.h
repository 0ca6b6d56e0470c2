// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "platform/simulated/scene.h"
#include "tests/privacy/privacy_oracle.h"

#include <screenshare/share_types.h>

#include <sys/types.h>
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <random>
#include <vector>

/// Random desktops and shares of them, painted for the privacy oracle. Which role a window has is decided
/// when it is made, from what the share was told; the code under test has no part in it.

struct PrivacySceneWindow {
    unsigned id = 0;
    PrivacyRole role = PrivacyRole::KeptOut;
    std::uint32_t rgb = 0;
};

struct PrivacyScene {
    std::shared_ptr<platform::SimulatedWindowServer> server;
    std::vector<PrivacySceneWindow> windows;

    SHARE_TYPE shareType = SHARE_TYPE_DESKTOP;
    std::vector<unsigned> sharedDisplays;
    std::vector<unsigned> sharedApps;
    std::vector<unsigned> unsharedApps;
    std::vector<unsigned> sharedWindows;
    std::vector<unsigned> unsharedWindows;
    bool excludesMenuBars = false;

    /// The desktop as it is now.
    PrivacyMoment Moment() const {
        PrivacyMoment moment;
        const auto snapshot = server->GetWindows();
        for (const platform::WindowInfo& info : snapshot->Windows()) {
            const auto window = std::find_if(windows.begin(), windows.end(),
                                             [&](const auto& each) { return each.id == info.id; });
            if (window != windows.end() && info.onScreen)
                moment.push_back({window->role, info.frame, window->rgb, info.alpha,
                                  info.sharing != platform::SharingState::None});
        }
        return moment;
    }
};

class RandomPrivacyScene {
public:
    static PrivacyScene Make(unsigned seed) { return RandomPrivacyScene(seed).Build(); }

private:
    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr int WIDTH = 200;
    static constexpr int HEIGHT = 120;
    static constexpr int MENU_BAR = 10;
    static constexpr int DOCK = 16;
    static constexpr pid_t DESKTOP_APP = 100;
    static constexpr pid_t FIRST_APP = 500;
    static constexpr int APPS = 4;
    static constexpr std::uint32_t RED = 0xFF0000;

    enum class Listing {
        None,
        Shared,
        Unshared,
    };

    explicit RandomPrivacyScene(unsigned seed) : m_random(seed) {}

    int Number(int from, int to) { return std::uniform_int_distribution<int>(from, to)(m_random); }
    bool Chance(int percent) { return Number(1, 100) <= percent; }
    bool IsDesktop() const { return m_scene.shareType == SHARE_TYPE_DESKTOP; }

    PrivacyScene Build() {
        m_scene.shareType = static_cast<SHARE_TYPE>(Number(SHARE_TYPE_DESKTOP, SHARE_TYPE_WINDOW));
        m_scene.excludesMenuBars = !IsDesktop() && Chance(60);
        ListApps();
        MakeDisplays();
        AddDesktopPictures();
        const int count = Number(2, 20);
        for (int i = 0; i < count; ++i)
            AddPlainWindow();
        AddMenuBars();
        AddDock();
        m_scene.server = m_desktop.Serve();
        return std::move(m_scene);
    }

    // ---- What the share is told

    void ListApps() {
        for (pid_t pid = FIRST_APP; pid < FIRST_APP + APPS; ++pid)
            m_apps.push_back({pid, ListApp(pid)});
        m_apps.push_back({DESKTOP_APP, IsDesktop() && Chance(10) ? ListApp(DESKTOP_APP) : Listing::None});
    }
    Listing ListApp(pid_t pid) {
        const int dice = Number(1, 100);
        if (dice <= 40 && !IsDesktop()) {
            m_scene.sharedApps.push_back(static_cast<unsigned>(pid));
            return Listing::Shared;
        }
        if (dice <= 70) {
            m_scene.unsharedApps.push_back(static_cast<unsigned>(pid));
            return Listing::Unshared;
        }
        return Listing::None;
    }
    Listing ListWindow(unsigned id) {
        const int dice = Number(1, 100);
        if (dice <= 15) {
            m_scene.sharedWindows.push_back(id);
            return Listing::Shared;
        }
        if (dice <= 30) {
            m_scene.unsharedWindows.push_back(id);
            return Listing::Unshared;
        }
        return Listing::None;
    }

    /// A window's own list outranks that of its application.
    PrivacyRole RoleOf(pid_t owner, Listing listing) const {
        if (listing == Listing::None) {
            const auto app = std::find_if(m_apps.begin(), m_apps.end(),
                                          [owner](const App& each) { return each.pid == owner; });
            listing = app != m_apps.end() ? app->listing : Listing::None;
        }
        const bool isKept = listing == Listing::None ? IsDesktop() : listing == Listing::Shared;
        return isKept ? PrivacyRole::Kept : PrivacyRole::KeptOut;
    }

    // ---- What stands on the desktop

    void MakeDisplays() {
        const bool hasSide = Chance(40);
        for (unsigned display = MAIN; display <= (hasSide ? SIDE : MAIN); ++display) {
            const float scale = Chance(30) ? 2.0F : 1.0F;
            m_desktop.Display(display == MAIN ? 0 : WIDTH, 0, WIDTH, HEIGHT)
                .Scale(scale)
                .Reserving({0, MENU_BAR, 0, DOCK})
                .Background(0x002040);
            m_displays.push_back(display);
            m_hasWholePointsOnly = m_hasWholePointsOnly || scale != 1.0F;
        }
        // A desktop share is one of the main display, so that the Dock of it is on it.
        m_scene.sharedDisplays = m_displays;
        if (IsDesktop() || Chance(20))
            m_scene.sharedDisplays = {MAIN};
    }

    void AddDesktopPictures() {
        for (const unsigned display : m_displays)
            Add(DESKTOP_APP, {{LeftOf(display), 0}, {WIDTH, HEIGHT}}, platform::kCGDesktopWindowLevelKey,
                RoleOf(DESKTOP_APP, IsDesktop() ? ListWindow(m_nextId) : Listing::None));
    }

    void AddPlainWindow() {
        const pid_t owner = Chance(5) ? 0 : FIRST_APP + Number(0, APPS - 1);
        const platform::CGRect frame{{Coordinate(-20, WIDTH * 2 - 10), Coordinate(-10, HEIGHT - 5)},
                                     {Coordinate(MENU_BAR + 2, 120), Coordinate(MENU_BAR + 2, 80)}};
        const auto level =
            Chance(80) ? platform::kCGNormalWindowLevelKey : platform::kCGFloatingWindowLevelKey;
        Add(owner, frame, level, RoleOf(owner, ListWindow(m_nextId)));
        if (Chance(15))
            m_desktop.Alpha(0.25F * static_cast<float>(Number(0, 3)));
        if (Chance(5))
            m_desktop.OffScreen();
        if (Chance(5))
            m_desktop.Unshared();
    }

    /// A bar in the corner of a display, and an item in it.
    void AddMenuBars() {
        for (const unsigned display : m_displays) {
            if (!Chance(60))
                continue;
            const float left = LeftOf(display);
            AddUnderTheMenuBarRule({{left, 0}, {WIDTH, MENU_BAR}}, platform::kCGMainMenuWindowLevelKey);
            AddUnderTheMenuBarRule({{left + static_cast<float>(Number(5, 150)), 1}, {30, MENU_BAR - 2}},
                                   platform::kCGStatusWindowLevelKey);
        }
    }
    void AddUnderTheMenuBarRule(const platform::CGRect& frame, platform::CGWindowLevelKey level) {
        const pid_t owner = FIRST_APP + Number(0, APPS - 1);
        const PrivacyRole role = RoleOf(owner, ListWindow(m_nextId));
        Add(owner, frame, level, m_scene.excludesMenuBars ? PrivacyRole::KeptOut : role);
    }

    /// Where a display keeps an edge free for it. No share but a desktop's keeps it.
    void AddDock() {
        if (!Chance(70))
            return;
        const pid_t owner = FIRST_APP + Number(0, APPS - 1);
        const PrivacyRole role = RoleOf(owner, ListWindow(m_nextId));
        Add(owner, {{0, HEIGHT - DOCK}, {WIDTH, DOCK}}, platform::kCGDockWindowLevelKey,
            IsDesktop() ? role : PrivacyRole::KeptOut);
    }

    void Add(pid_t owner, const platform::CGRect& frame, platform::CGWindowLevelKey level, PrivacyRole role) {
        const unsigned id = m_nextId++;
        const std::uint32_t rgb = role == PrivacyRole::Kept ? 0x004000U + (id * 37U & 0x3FFFU) : RED;
        m_desktop.Window(id)
            .Of(owner)
            .At(frame.origin.x, frame.origin.y, frame.size.width, frame.size.height)
            .Level(platform::CGWindowLevelForKey(level))
            .Colour(rgb);
        m_scene.windows.push_back({id, role, rgb});
    }

    static float LeftOf(unsigned display) { return display == MAIN ? 0.0F : static_cast<float>(WIDTH); }

    /// At times between whole points; where pixels are finer than points, what is cut to whole points is more
    /// than a pixel off.
    float Coordinate(int from, int to) {
        const auto whole = static_cast<float>(Number(from, to));
        return m_hasWholePointsOnly || !Chance(10) ? whole : whole + 0.25F * static_cast<float>(Number(1, 3));
    }

    struct App {
        pid_t pid;
        Listing listing;
    };

    std::mt19937 m_random;
    platform::Scene m_desktop;
    PrivacyScene m_scene;
    std::vector<App> m_apps;
    std::vector<unsigned> m_displays;
    bool m_hasWholePointsOnly = false;
    unsigned m_nextId = 10;
};
