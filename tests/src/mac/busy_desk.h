// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/src/mac/backend_tools.h"

#include <sys/types.h>
#include <random>

/// A desktop that never rests while it is captured. What is kept out is pure red and nothing else has any
/// red: a red pixel, blended or scaled, is a leak.

namespace busy_desk {

inline constexpr pid_t KEPT = 5'000'100;
inline constexpr pid_t HIDDEN = 5'000'200;
inline constexpr unsigned MAIN = 1;
inline constexpr unsigned SIDE = 2;
inline constexpr int WINDOWS = 9; // one in three is hidden

inline bool IsHidden(platform::CGWindowID window) {
    return window % 3 == 0;
}

inline platform::Scene BusyDesk() {
    platform::Scene scene;
    scene.Display(0, 0, 120, 80).Display(120, 0, 90, 70).Scale(2);
    scene.App(KEPT, "Kept").App(HIDDEN, "Hidden");
    for (platform::CGWindowID id = 1; id <= WINDOWS; ++id) {
        scene.Window(id)
            .Of(IsHidden(id) ? HIDDEN : KEPT)
            .At(static_cast<float>(id * 9), static_cast<float>(id * 5), 60, 40)
            .Colour(IsHidden(id) ? 0xFF0000 : 0x0000FF - id * 16)
            .Alpha(id % 4 == 0 ? 0.5F : 1.0F);
    }
    // Of a kept application, but its pixels are never given out.
    scene.Window(WINDOWS + 1).Of(KEPT).At(20, 20, 30, 30).Colour(0xFF0000).Unshared();
    return scene.Pointer(30, 30).Cursor(SquareCursor(0x00FF00));
}

/// Changes something at each step.
class CUnrest {
public:
    CUnrest(platform::SimulatedWindowServer& desktop, unsigned seed) : m_desktop(desktop), m_random(seed) {}

    void Step() {
        const auto window = static_cast<platform::CGWindowID>(Between(1, WINDOWS));
        const platform::CGPoint place{static_cast<float>(Between(-20, 180)),
                                      static_cast<float>(Between(-20, 70))};
        switch (Between(0, 8)) {
            case 0:
                m_desktop.RaiseWindow(window);
                break;
            case 1:
                m_desktop.LowerWindow(window);
                break;
            case 2:
                m_desktop.SetOnScreen(window, Between(0, 1) == 1);
                break;
            case 3:
                m_desktop.ResizeDisplay(SIDE, {static_cast<float>(Between(40, 90)), 70});
                break;
            case 4:
                m_desktop.ScaleDisplay(MAIN, Between(0, 1) == 1 ? 2.0F : 1.0F);
                break;
            case 5:
                PlugSide();
                break;
            case 6:
                m_desktop.SetPointer(place);
                break;
            default:
                m_desktop.MoveWindow(window, place);
        }
    }

private:
    void PlugSide() {
        if (m_desktop.RemoveDisplay(SIDE))
            return;
        platform::SimulatedDisplay side;
        side.id = SIDE;
        side.bounds = {{120, 0}, {90, 70}};
        m_desktop.AddDisplay(side);
    }
    int Between(int low, int high) { return std::uniform_int_distribution<int>(low, high)(m_random); }

    platform::SimulatedWindowServer& m_desktop;
    std::mt19937 m_random;
};

struct Seen {
    int frames = 0;
    long leaks = 0;
    long kept = 0; ///< Pixels of kept windows: the share was alive.
};

inline void LookAt(IShareFrame& frame, Seen& seen) {
    const TVLSize size = SizeOf(frame);
    ++seen.frames;
    for (int y = 0; y < size.cy; ++y) {
        const unsigned char* const row = frame.GetFrameLineData(y);
        for (int x = 0; x < size.cx; ++x) {
            seen.leaks += row[x * 4] != 0 ? 1 : 0;
            seen.kept += row[x * 4 + 2] != 0 ? 1 : 0;
        }
    }
}

} // namespace busy_desk
