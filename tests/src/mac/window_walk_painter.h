// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/src/mac/window_walk_scene.h"

#include <cmath>
#include <cstddef>
#include <vector>

/// What the walk has to find, worked out pixel by pixel from the rules, without a region anywhere.

/// What a pixel is, as bits.
enum WalkPixel : unsigned char {
    PIXEL_VISIBLE = 1,
    PIXEL_OVERLAP = 2,
    PIXEL_SHARED_WINDOW = 4,
    PIXEL_APPLICATION = 8,
    PIXEL_INVISIBLE = 16,
    PIXEL_BACKGROUND = 32,
};

/// The pixels of a plane that ends somewhere.
class PixelPlane {
public:
    explicit PixelPlane(const TVLRect& universe)
        : m_universe(universe),
          m_width(universe.right - universe.left),
          m_pixels(static_cast<std::size_t>(m_width) *
                   static_cast<std::size_t>(universe.bottom - universe.top)) {}

    bool operator==(const PixelPlane& other) const { return m_pixels == other.m_pixels; }

    bool Holds(const TVLRect& rect) const {
        return rect.left >= m_universe.left && rect.top >= m_universe.top && rect.right <= m_universe.right &&
               rect.bottom <= m_universe.bottom;
    }
    template <class Change>
    void ForEach(const TVLRect& rect, Change change) {
        for (int y = rect.top; y < rect.bottom; ++y) {
            for (int x = rect.left; x < rect.right; ++x)
                change(At(x, y), x, y);
        }
    }
    template <class Change>
    void ForEach(Change change) {
        ForEach(m_universe, change);
    }
    int Count(unsigned char bit) const {
        int count = 0;
        for (const unsigned char pixel : m_pixels)
            count += (pixel & bit) != 0 ? 1 : 0;
        return count;
    }

private:
    unsigned char& At(int x, int y) {
        return m_pixels.at(static_cast<std::size_t>(y - m_universe.top) * static_cast<std::size_t>(m_width) +
                           static_cast<std::size_t>(x - m_universe.left));
    }

    TVLRect m_universe;
    int m_width;
    std::vector<unsigned char> m_pixels;
};

/// Rules that a painter may get wrong on purpose: an oracle that doesn't mind would be none.
enum class PainterFault {
    None,
    TransparentWindowHides,
    KeptWindowLeavesOverlap,
    OverlapOfUnsharedDisplayStays,
    DockIsNotTakenOut,
    DockOfDesktopKeepsItsFrame,
    DockIsWalkedInEveryShare,
    DesktopsOwnWindowsAreWalked,
    MenuBarIsKept,
    ItemInMenuBarIsKept,
    ApplicationOutranksItsWindow,
    UnknownOwnerIsKept,
    StackIsReadFromTheFront,
    ExcludedAreListedFrontFirst,
};

inline constexpr PainterFault EVERY_PAINTER_FAULT[] = {
    PainterFault::TransparentWindowHides,
    PainterFault::KeptWindowLeavesOverlap,
    PainterFault::OverlapOfUnsharedDisplayStays,
    PainterFault::DockIsNotTakenOut,
    PainterFault::DockOfDesktopKeepsItsFrame,
    PainterFault::DockIsWalkedInEveryShare,
    PainterFault::DesktopsOwnWindowsAreWalked,
    PainterFault::MenuBarIsKept,
    PainterFault::ItemInMenuBarIsKept,
    PainterFault::ApplicationOutranksItsWindow,
    PainterFault::UnknownOwnerIsKept,
    PainterFault::StackIsReadFromTheFront,
    PainterFault::ExcludedAreListedFrontFirst,
};

/// What came of one walk.
struct WalkPicture {
    explicit WalkPicture(const TVLRect& universe) : plane(universe) {}

    PixelPlane plane;
    std::vector<unsigned> captured; ///< Front first.
    std::vector<unsigned> excluded; ///< Rearmost first.
    // What happened, so that a test can tell whether its scenes show anything.
    int skipped = 0;
    int menuBars = 0;
    int inMenuBars = 0;
    int dockPixels = 0;
};

class WalkPainter {
public:
    explicit WalkPainter(const WalkScene& scene, PainterFault fault = PainterFault::None)
        : m_scene(scene),
          m_fault(fault),
          m_picture(scene.universe) {}

    /// `knownDisplays` are those whose corners tell a menu bar.
    WalkPicture Paint(const std::vector<TVLRect>& knownDisplays) {
        std::vector<SceneWindow> windows = m_scene.windows;
        if (Has(PainterFault::StackIsReadFromTheFront))
            std::reverse(windows.begin(), windows.end());
        for (const SceneWindow& window : windows) {
            if (!window.isOnScreen)
                continue;
            if (IsSkipped(window))
                ++m_picture.skipped;
            else if (IsKept(window, knownDisplays))
                Keep(window);
            else
                KeepOut(window);
        }
        if (!IsDesktop() && !Has(PainterFault::DockIsNotTakenOut))
            TakeDocksOut();
        Clip();
        if (Has(PainterFault::ExcludedAreListedFrontFirst))
            std::reverse(m_picture.excluded.begin(), m_picture.excluded.end());
        return std::move(m_picture);
    }

    static TVLRect DockOf(const SceneDisplay& display) {
        const TVLRect& all = display.rect;
        switch (display.dock) {
            case DockPlace::Left:
                return {all.left, all.top + display.menuHeight, all.left + display.dockSize, all.bottom};
            case DockPlace::Right:
                return {all.right - display.dockSize, all.top + display.menuHeight, all.right, all.bottom};
            case DockPlace::Bottom:
                return {all.left, all.bottom - display.dockSize, all.right, all.bottom};
            case DockPlace::None:
                break;
        }
        return {0, 0, 0, 0};
    }

private:
    bool Has(PainterFault fault) const { return m_fault == fault; }
    bool IsDesktop() const { return m_scene.shareType == SHARE_TYPE_DESKTOP; }
    static int LevelOf(int key) { return platform::CGWindowLevelForKey(key); }
    static bool IsDock(const SceneWindow& window) {
        return window.level == LevelOf(platform::kCGDockWindowLevelKey);
    }

    static TVLRect RectOf(const SceneWindow& window) {
        const float left = std::trunc(window.frame.origin.x);
        const float top = std::trunc(window.frame.origin.y);
        return {static_cast<int>(left), static_cast<int>(top),
                static_cast<int>(std::trunc(left + window.frame.size.width)),
                static_cast<int>(std::trunc(top + window.frame.size.height))};
    }

    bool IsSkipped(const SceneWindow& window) const {
        if (IsDesktop())
            return false;
        return (IsDock(window) && !Has(PainterFault::DockIsWalkedInEveryShare)) ||
               (window.level < 0 && !Has(PainterFault::DesktopsOwnWindowsAreWalked));
    }

    bool IsAppShared(pid_t pid) const {
        for (const SceneApp& app : m_scene.apps) {
            if (app.pid == pid)
                return IsDesktop() ? app.listing != SceneListing::UnShared
                                   : app.listing == SceneListing::Shared;
        }
        return IsDesktop() || Has(PainterFault::UnknownOwnerIsKept);
    }

    bool IsShared(const SceneWindow& window) const {
        if (window.listing == SceneListing::None || Has(PainterFault::ApplicationOutranksItsWindow))
            return IsAppShared(window.owner);
        return window.listing == SceneListing::Shared;
    }

    bool IsKept(const SceneWindow& window, const std::vector<TVLRect>& knownDisplays) {
        const bool isShared = IsShared(window);
        if (IsDesktop() || !m_scene.isCutByWindows || !m_scene.excludesMenuBars ||
            Has(PainterFault::MenuBarIsKept))
            return isShared;
        const TVLRect rect = RectOf(window);
        if (window.level == LevelOf(platform::kCGMainMenuWindowLevelKey)) {
            for (const TVLRect& display : knownDisplays) {
                if (rect.left != display.left || rect.top != display.top)
                    continue;
                m_menuBars.push_back(rect);
                ++m_picture.menuBars;
                return false;
            }
            return isShared;
        }
        if (isShared && IsInMenuBar(rect) && !Has(PainterFault::ItemInMenuBarIsKept)) {
            ++m_picture.inMenuBars;
            return false;
        }
        return isShared;
    }

    bool IsInMenuBar(const TVLRect& rect) const {
        for (const TVLRect& bar : m_menuBars) {
            if (bar.left == bar.right || bar.top == bar.bottom)
                continue;
            // What lies nowhere at all, lies in every bar.
            if (rect == TVLRect{0, 0, 0, 0})
                return true;
            if (rect.left < rect.right && rect.top < rect.bottom && rect.left >= bar.left &&
                rect.top >= bar.top && rect.right <= bar.right && rect.bottom <= bar.bottom)
                return true;
        }
        return false;
    }

    void Keep(const SceneWindow& window) {
        m_picture.captured.insert(m_picture.captured.begin(), window.id);
        TVLRect rect = RectOf(window);
        if (IsDesktop() && IsDock(window) && !Has(PainterFault::DockOfDesktopKeepsItsFrame)) {
            const auto first = std::find_if(m_scene.displays.begin(), m_scene.displays.end(),
                                            [](const SceneDisplay& display) { return display.isShared; });
            if (first != m_scene.displays.end())
                rect = DockOf(*first);
        }
        m_picture.plane.ForEach(rect, [this](unsigned char& pixel, int, int) {
            pixel |= PIXEL_VISIBLE | PIXEL_SHARED_WINDOW | PIXEL_APPLICATION;
            if (!Has(PainterFault::KeptWindowLeavesOverlap))
                pixel &= static_cast<unsigned char>(~PIXEL_OVERLAP);
        });
    }

    void KeepOut(const SceneWindow& window) {
        m_picture.excluded.push_back(window.id);
        if (window.alpha > 0 || Has(PainterFault::TransparentWindowHides))
            m_picture.plane.ForEach(RectOf(window), [](unsigned char& pixel, int, int) { Hide(pixel); });
    }

    static void Hide(unsigned char& pixel) {
        if ((pixel & PIXEL_VISIBLE) == 0)
            return;
        pixel |= PIXEL_OVERLAP;
        pixel &= static_cast<unsigned char>(~PIXEL_VISIBLE);
    }

    void TakeDocksOut() {
        for (const SceneDisplay& display : m_scene.displays) {
            if (!display.isShared)
                continue;
            m_picture.plane.ForEach(DockOf(display), [this](unsigned char& pixel, int, int) {
                m_picture.dockPixels += (pixel & PIXEL_VISIBLE) != 0 ? 1 : 0;
                Hide(pixel);
            });
        }
    }

    bool IsOnSharedDisplay(int x, int y) const {
        for (const SceneDisplay& display : m_scene.displays) {
            if (display.isShared && x >= display.rect.left && x < display.rect.right &&
                y >= display.rect.top && y < display.rect.bottom)
                return true;
        }
        return false;
    }

    void Clip() {
        m_picture.plane.ForEach([this](unsigned char& pixel, int x, int y) {
            if (!IsOnSharedDisplay(x, y)) {
                const int left = Has(PainterFault::OverlapOfUnsharedDisplayStays)
                                     ? PIXEL_APPLICATION | PIXEL_OVERLAP
                                     : PIXEL_APPLICATION;
                pixel &= static_cast<unsigned char>(left);
                return;
            }
            if ((pixel & PIXEL_VISIBLE) == 0)
                pixel |= PIXEL_INVISIBLE;
            if ((pixel & (PIXEL_VISIBLE | PIXEL_OVERLAP)) == 0)
                pixel |= PIXEL_BACKGROUND;
        });
    }

    const WalkScene& m_scene;
    const PainterFault m_fault;
    WalkPicture m_picture;
    std::vector<TVLRect> m_menuBars;
};
