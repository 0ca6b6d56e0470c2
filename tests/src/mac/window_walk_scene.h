// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"

#include <screenshare/share_types.h>

#include <sys/types.h>
#include <algorithm>
#include <cstddef>
#include <random>
#include <utility>
#include <vector>

/// Random desktops for the walk, small enough to be looked at pixel by pixel.

enum class DockPlace {
    None,
    Left,
    Right,
    Bottom
};

struct SceneDisplay {
    unsigned id = 0;
    TVLRect rect{};
    int menuHeight = 0;
    DockPlace dock = DockPlace::None;
    int dockSize = 0;
    bool isShared = false;
};

enum class SceneListing {
    None,
    Shared,
    UnShared
};

struct SceneWindow {
    unsigned id = 0;
    pid_t owner = 0; ///< 0 when nobody can tell.
    platform::CGRect frame;
    int level = 0;
    float alpha = 1.0F;
    bool isOnScreen = true;
    SceneListing listing = SceneListing::None;
};

struct SceneApp {
    pid_t pid = 0;
    SceneListing listing = SceneListing::None;
};

struct WalkScene {
    std::vector<SceneDisplay> displays; ///< The main one first.
    std::vector<SceneWindow> windows;   ///< The rearmost first.
    std::vector<SceneApp> apps;
    SHARE_TYPE shareType = SHARE_TYPE_DESKTOP;
    bool isCutByWindows = false;
    bool excludesMenuBars = false;
    bool asksForDisplays = true; ///< Or takes those shared for those of the application.

    /// Everything lies in here.
    TVLRect universe{};
};

class RandomScene {
public:
    static WalkScene Make(unsigned seed) { return RandomScene(seed).Build(); }

private:
    static constexpr int MARGIN = 24;
    static constexpr int MENU_BAR_HEIGHT = 10;

    explicit RandomScene(unsigned seed) : m_random(seed) {}

    int Number(int from, int to) { return std::uniform_int_distribution<int>(from, to)(m_random); }
    template <class List>
    auto& OneOf(List& list) {
        return list[static_cast<std::size_t>(Number(0, static_cast<int>(std::size(list)) - 1))];
    }

    WalkScene Build() {
        MakeDisplays();
        for (const pid_t pid : {500, 600, 700, 800})
            m_scene.apps.push_back({pid, Listing()});
        m_scene.shareType = static_cast<SHARE_TYPE>(Number(1, 3));
        // As often as not both, as only both together make a difference.
        m_scene.isCutByWindows = Number(0, 3) != 0;
        m_scene.excludesMenuBars = Number(0, 3) != 0;
        m_scene.asksForDisplays = Number(0, 3) != 0;
        const int count = Number(2, 40);
        for (int i = 0; i < count; ++i)
            m_scene.windows.push_back(Window(static_cast<unsigned>(100 + i)));
        return std::move(m_scene);
    }

    void MakeDisplays() {
        const TVLRect main{0, 0, Number(0, 1) == 0 ? 200 : 160, Number(0, 1) == 0 ? 120 : 100};
        std::vector<TVLRect> places{main,
                                    {main.right, 0, main.right + 200, 120},
                                    {-180, 10, 0, 110},
                                    {0, main.bottom, 150, main.bottom + 90},
                                    {20, -100, 200, 0}};
        std::shuffle(places.begin() + 1, places.end(), m_random);
        places.resize(static_cast<std::size_t>(Number(1, 3)));
        m_scene.universe = main;
        for (const TVLRect& rect : places) {
            SceneDisplay display;
            display.id = static_cast<unsigned>(71 + m_scene.displays.size());
            display.rect = rect;
            display.menuHeight = Number(0, 1) * MENU_BAR_HEIGHT;
            display.dock = static_cast<DockPlace>(Number(0, 3));
            display.dockSize = Number(5, 30);
            display.isShared = Number(0, 3) != 0;
            m_scene.displays.push_back(display);
            Include(rect);
        }
        m_scene.universe = {m_scene.universe.left - MARGIN, m_scene.universe.top - MARGIN,
                            m_scene.universe.right + MARGIN, m_scene.universe.bottom + MARGIN};
    }

    void Include(const TVLRect& rect) {
        TVLRect& all = m_scene.universe;
        all = {std::min(all.left, rect.left), std::min(all.top, rect.top), std::max(all.right, rect.right),
               std::max(all.bottom, rect.bottom)};
    }

    SceneWindow Window(unsigned id) {
        SceneWindow window;
        window.id = id;
        window.owner = Number(0, 7) == 0 ? 0 : OneOf(m_scene.apps).pid;
        window.listing = Number(0, 2) == 0 ? Listing() : SceneListing::None;
        window.alpha = Number(0, 5) == 0 ? 0.0F : Number(0, 5) == 0 ? 0.5F : 1.0F;
        window.isOnScreen = Number(0, 11) != 0;
        const SceneDisplay& display = OneOf(m_scene.displays);
        switch (Number(0, 11)) {
            case 0:
                Place(window, display.rect, platform::kCGDesktopWindowLevelKey);
                break;
            case 1:
                Place(window, display.rect, platform::kCGDockWindowLevelKey);
                break;
            case 2:
                Place(window, MenuBarOf(display), platform::kCGMainMenuWindowLevelKey);
                break;
            case 3:
            case 4:
                Place(window, ItemIn(MenuBarOf(display)), platform::kCGStatusWindowLevelKey);
                break;
            case 5:
                Place(window, AnyRect(), OneOf(LEVEL_KEYS));
                break;
            default:
                Place(window, AnyRect(), platform::kCGNormalWindowLevelKey);
        }
        return window;
    }

    /// At times by parts of a point away from whole ones.
    void Place(SceneWindow& window, const TVLRect& rect, int levelKey) {
        const auto part = [this] {
            return Number(0, 9) == 0 ? 0.25F * static_cast<float>(Number(1, 3)) : 0.0F;
        };
        window.level = platform::CGWindowLevelForKey(levelKey);
        window.frame = {{static_cast<float>(rect.left) + part(), static_cast<float>(rect.top) + part()},
                        {static_cast<float>(rect.right - rect.left) + part(),
                         static_cast<float>(rect.bottom - rect.top) + part()}};
    }

    static TVLRect MenuBarOf(const SceneDisplay& display) {
        return {display.rect.left, display.rect.top, display.rect.right, display.rect.top + MENU_BAR_HEIGHT};
    }

    /// Mostly inside.
    TVLRect ItemIn(const TVLRect& bar) {
        const int left = Number(bar.left, bar.right - 5);
        const int top = bar.top + Number(0, 1);
        return {left, top, left + Number(1, 20), top + Number(1, MENU_BAR_HEIGHT)};
    }

    TVLRect AnyRect() {
        const TVLRect& all = m_scene.universe;
        const int left = Number(all.left, all.right - 3);
        const int top = Number(all.top, all.bottom - 3);
        return {left, top, std::min(left + Number(0, 120), all.right - 2),
                std::min(top + Number(0, 80), all.bottom - 2)};
    }

    SceneListing Listing() { return static_cast<SceneListing>(Number(0, 2)); }

    static constexpr int LEVEL_KEYS[] = {
        platform::kCGDesktopWindowLevelKey,  platform::kCGNormalWindowLevelKey,
        platform::kCGFloatingWindowLevelKey, platform::kCGDockWindowLevelKey,
        platform::kCGMainMenuWindowLevelKey, platform::kCGDesktopIconWindowLevelKey,
    };

    std::mt19937 m_random;
    WalkScene m_scene;
};
