// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_levels.h"

#include "platform/core_graphics.h"

#include <algorithm>
#include <cstddef>

namespace platform::x11 {

namespace {

float Right(const CGRect& rect) {
    return rect.origin.x + rect.size.width;
}

float Bottom(const CGRect& rect) {
    return rect.origin.y + rect.size.height;
}

bool IsFlat(const CGRect& rect) {
    return !(rect.size.width > 0 && rect.size.height > 0);
}

CGRect Common(const CGRect& one, const CGRect& other) {
    const float left = std::max(one.origin.x, other.origin.x);
    const float top = std::max(one.origin.y, other.origin.y);
    return {{left, top},
            {std::min(Right(one), Right(other)) - left, std::min(Bottom(one), Bottom(other)) - top}};
}

bool IsInside(const CGRect& inner, const CGRect& outer) {
    return inner.origin.x >= outer.origin.x && inner.origin.y >= outer.origin.y &&
           Right(inner) <= Right(outer) && Bottom(inner) <= Bottom(outer);
}

/// The one edge of a display that counts as the Dock's: a side that is reserved, else the bottom. What is
/// reserved at both sides has no such edge, and neither has what isn't reserved at all.
CGRect DockEdge(const DisplayInfo& display) {
    const CGRect& bounds = display.bounds;
    const CGRect& visible = display.visibleBounds;
    const bool left = visible.origin.x > bounds.origin.x;
    const bool right = Right(visible) < Right(bounds);
    if (left && right)
        return {};
    if (left)
        return {{bounds.origin.x, visible.origin.y},
                {visible.origin.x - bounds.origin.x, visible.size.height}};
    if (right)
        return {{Right(visible), visible.origin.y}, {Right(bounds) - Right(visible), visible.size.height}};
    return {{bounds.origin.x, Bottom(visible)}, {bounds.size.width, Bottom(bounds) - Bottom(visible)}};
}

/// What has the Dock's level counts as covering nobody, since the Dock's edge is kept out as a whole. So all
/// that is seen of it has to lie in such an edge.
bool LiesInDockEdges(const CGRect& frame, const DisplayList& displays) {
    bool isSeen = false;
    for (const DisplayInfo& display : displays) {
        const CGRect part = Common(frame, display.bounds);
        if (IsFlat(part))
            continue;
        isSeen = true;
        const CGRect edge = DockEdge(display);
        if (IsFlat(edge) || !IsInside(part, edge))
            return false;
    }
    return isSeen;
}

/// A bar along the whole top of a display. What is higher than half of it is no bar.
bool FillsTopEdge(const CGRect& frame, const DisplayList& displays) {
    return std::any_of(displays.begin(), displays.end(), [&frame](const DisplayInfo& display) {
        const CGRect& bounds = display.bounds;
        return frame.origin == bounds.origin && frame.size.width == bounds.size.width &&
               frame.size.height > 0 && frame.size.height <= bounds.size.height / 2;
    });
}

int LevelOfDock(const CGRect& frame, const DisplayList& displays) {
    if (FillsTopEdge(frame, displays))
        return CGWindowLevelForKey(kCGMainMenuWindowLevelKey);
    return CGWindowLevelForKey(LiesInDockEdges(frame, displays) ? kCGDockWindowLevelKey
                                                                : kCGStatusWindowLevelKey);
}

int LevelOf(const LevelInput& window, const DisplayList& displays) {
    switch (window.type) {
        case WindowType::Menu:
            return CGWindowLevelForKey(kCGPopUpMenuWindowLevelKey);
        case WindowType::Tip:
            return CGWindowLevelForKey(kCGOverlayWindowLevelKey);
        case WindowType::Dock:
            return LevelOfDock(window.frame, displays);
        case WindowType::Unset:
            if (window.overrideRedirect)
                return CGWindowLevelForKey(kCGPopUpMenuWindowLevelKey);
            break;
        case WindowType::Desktop:
        case WindowType::Normal:
            break;
    }
    return CGWindowLevelForKey(window.above ? kCGFloatingWindowLevelKey : kCGNormalWindowLevelKey);
}

} // namespace

std::vector<int> LevelsOf(const std::vector<LevelInput>& frontFirst, const DisplayList& displays) {
    std::vector<int> levels(frontFirst.size());
    bool onlyDesktopBelow = true;
    for (std::size_t place = frontFirst.size(); place-- > 0;) {
        const LevelInput& window = frontFirst[place];
        if (window.isBackground) {
            levels[place] = CGWindowLevelForKey(kCGDesktopWindowLevelKey);
        } else if (window.type == WindowType::Desktop && onlyDesktopBelow) {
            levels[place] = CGWindowLevelForKey(kCGDesktopIconWindowLevelKey);
        } else {
            levels[place] = LevelOf(window, displays);
            onlyDesktopBelow = onlyDesktopBelow && !window.onScreen;
        }
    }
    return levels;
}

} // namespace platform::x11
