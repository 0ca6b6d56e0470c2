// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/simulated_content.h"
#include "platform/window_server.h"

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

/// What there is on a simulated desktop, as plain values, and how real desktops change them.
namespace platform {

/// Levels of what stands apart from the normal windows at 0.
inline constexpr int SIMULATED_LEVEL_DESKTOP = -2147483627;
inline constexpr int SIMULATED_LEVEL_DOCK = 20;
inline constexpr int SIMULATED_LEVEL_MAIN_MENU = 24;

/// Distances from the edges of something, in points.
struct SimulatedEdges {
    float left = 0;
    float top = 0;
    float right = 0;
    float bottom = 0;
};

struct SimulatedDisplay {
    /// 0 has one given that is free. A monitor keeps its id when it is plugged in again.
    CGDirectDisplayID id = 0;
    CGRect bounds;
    float scale = 1.0F; ///< Pixels per point, above 0.
    std::string name = "Simulated Display";
    SimulatedEdges reserved; ///< For menu bars, panels and docks.
    SimulatedContent background = SimulatedContent::Colour(0);
    PixelFormat format = PixelFormat::BGRX; ///< Of its pictures.
    std::size_t rowGap = 0;                 ///< Bytes behind each of their rows.
    /// Shows the same as another display and is no display of its own meanwhile; 0 for none.
    CGDirectDisplayID mirrors = 0;
};

struct SimulatedWindow {
    WindowInfo info; ///< Its id 0 has one given that was never used.
    SimulatedContent content;
    SimulatedEdges shadow; ///< What WindowPictureDefault shows around the frame.
    PixelFormat format = PixelFormat::BGRA;
    std::size_t rowGap = 0; ///< Bytes behind each row of its pictures.
    /// While one window's owner, level and sharing state aren't known, no newer snapshot is given out.
    bool known = true;
};

struct SimulatedCursor {
    struct Representation {
        int width = 0; ///< Pixels.
        int height = 0;
        float scale = 1.0F; ///< Pixels per point.
        SimulatedContent content;

        bool operator==(const Representation&) const = default;
    };

    CGPoint hotSpot; ///< Points.
    std::vector<Representation> representations;

    bool operator==(const SimulatedCursor&) const = default;
};

struct SimulatedDesktop {
    std::vector<SimulatedDisplay> displays; ///< The main one first.
    std::vector<SimulatedWindow> windows;   ///< The front one first.
    ApplicationList applications;
    std::optional<CGPoint> pointer; ///< Nothing when it can't be known.
    std::optional<SimulatedCursor> cursor;
};

SimulatedDisplay* FindDisplay(SimulatedDesktop& desktop, CGDirectDisplayID id);
SimulatedWindow* FindWindow(SimulatedDesktop& desktop, CGWindowID id);

/// Before the windows of its level and below those of higher ones.
void PutAtFrontOfItsLevel(SimulatedDesktop& desktop, SimulatedWindow window);

/// Nothing happens, and false is given, for windows that aren't there.
bool RaiseInItsLevel(SimulatedDesktop& desktop, CGWindowID id);
bool LowerInItsLevel(SimulatedDesktop& desktop, CGWindowID id);
bool PutAbove(SimulatedDesktop& desktop, CGWindowID id, CGWindowID below);
/// All windows of a process, in their order.
bool RaiseWindowsOf(SimulatedDesktop& desktop, pid_t pid);

/// Mends what no desktop has: displays without an id or a scale, alpha beyond its ends, names that are empty
/// or no UTF-8.
void Mend(SimulatedDesktop& desktop);

/// Has the main display's top left be the origin again: all displays, windows and the pointer move alike.
void MoveOriginToMainDisplay(SimulatedDesktop& desktop);

/// The displays as a window server lists them: without those that mirror another one.
DisplayList ListDisplays(const SimulatedDesktop& desktop);

/// Whether two stacks are of one generation: all but the titles is equal.
bool SameStack(const std::vector<WindowInfo>& one, const std::vector<WindowInfo>& other);

} // namespace platform
