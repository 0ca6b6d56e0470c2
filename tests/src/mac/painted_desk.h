// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/src/mac/backend_tools.h"

#include <sys/types.h>
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <random>
#include <utility>
#include <vector>

/// A desktop on which anything may happen from one picture to the next, most of it small: for tests of what
/// is drawn of a change, and what isn't drawn again.
namespace painted_desk {

inline constexpr unsigned MAIN = 1;
inline constexpr unsigned SIDE = 2;
inline constexpr pid_t EDITOR = 5'000'100;
inline constexpr pid_t NOTES = 5'000'200;
inline constexpr platform::CGWindowID WALLPAPER = 1;
inline constexpr int MOST_WINDOWS = 7;

/// Random numbers that are the same on each machine.
class CDice {
public:
    explicit CDice(unsigned seed) : m_random(seed) {}
    int Between(int low, int high) {
        return low + static_cast<int>(m_random() % static_cast<unsigned>(high - low + 1));
    }
    bool OneIn(int count) { return Between(1, count) == 1; }
    platform::CGPoint Place() {
        return {static_cast<float>(Between(-20, 130)), static_cast<float>(Between(-20, 80))};
    }
    /// Mostly opaque.
    platform::SimulatedArgb Colour() {
        const platform::SimulatedArgb rgb = m_random() & 0xFFFFFF;
        const auto alpha = OneIn(4) ? static_cast<platform::SimulatedArgb>(Between(0, 255)) : 255U;
        return alpha << 24 | rgb;
    }

private:
    std::mt19937 m_random;
};

inline platform::Scene Beginning() {
    return platform::Scene()
        .Display(0, 0, 120, 80)
        .Display(120, 0, 90, 60)
        .App(1, "Desktop")
        .Window(WALLPAPER)
        .At(0, 0, 120, 80)
        .Colour(0x204060)
        .Format(platform::PixelFormat::BGRX, 12)
        .Level(platform::SIMULATED_LEVEL_DESKTOP)
        .App(EDITOR, "Editor")
        .App(NOTES, "Notes")
        .Pointer(30, 30)
        .Cursor(SquareCursor(0xFFFFFF));
}

/// Changes it, by a seed.
class CPaintedDesk {
public:
    CPaintedDesk(platform::SimulatedWindowServer& desktop, unsigned seed) : m_desktop(desktop), dice(seed) {
        for (int i = 0; i < 3; ++i)
            Open();
        PaintAll(WALLPAPER);
    }

    void Change() {
        switch (dice.Between(0, 34)) {
            case 0:
                return Open();
            case 1:
                return Close();
            case 2:
                m_desktop.MoveWindow(AnyWindow(), dice.Place());
                return;
            case 3:
                m_desktop.SetFrame(AnyWindow(), AnyFrame());
                return;
            case 4:
                m_desktop.SetAlpha(AnyWindow(), static_cast<float>(dice.Between(0, 6)) / 4);
                return;
            case 5:
                m_desktop.RaiseWindow(AnyWindow());
                return;
            case 6:
                m_desktop.SetOnScreen(AnyWindow(), !dice.OneIn(3));
                return;
            case 7:
                return ChangeFormat();
            case 8:
                return ChangeDisplays();
            case 9:
                return PaintAll(AnyWindow());
            case 10:
            case 11:
            case 12:
                return ChangeCursor();
            case 13:
                return HidePointer();
            case 14:
            case 15:
            case 16:
            case 17:
            case 18:
                m_desktop.SetPointer(dice.Place());
                return;
            default:
                return Paint(AnyWindow());
        }
    }

    platform::CGWindowID AnyWindow() {
        const auto at = static_cast<std::size_t>(dice.Between(0, static_cast<int>(m_windows.size())));
        return at < m_windows.size() ? m_windows[at] : WALLPAPER;
    }

private:
    static constexpr int WIDTH = 140;
    static constexpr int HEIGHT = 100;

    platform::CGRect AnyFrame() {
        return {dice.Place(),
                {static_cast<float>(dice.Between(1, 120)), static_cast<float>(dice.Between(1, 80))}};
    }
    platform::PixelFormat AnyFormat() {
        using enum platform::PixelFormat;
        constexpr std::array FORMATS{BGRA, BGRA, BGRX, BGRX, RGBA, RGBX, X2R10G10B10};
        return FORMATS[static_cast<std::size_t>(dice.Between(0, FORMATS.size() - 1))];
    }

    void Open() {
        if (m_windows.size() == MOST_WINDOWS)
            return;
        platform::SimulatedWindow window;
        window.info.frame = AnyFrame();
        window.info.owner = dice.OneIn(2) ? EDITOR : NOTES;
        window.info.alpha = dice.OneIn(4) ? 0.5F : 1.0F;
        window.format = AnyFormat();
        window.rowGap = static_cast<std::size_t>(dice.Between(0, 2)) * 4;
        window.content = platform::SimulatedContent::Colour(0);
        m_windows.push_back(m_desktop.AddWindow(window));
        PaintAll(m_windows.back());
    }
    void Close() {
        if (m_windows.empty())
            return;
        const auto at = m_windows.begin() + dice.Between(0, static_cast<int>(m_windows.size()) - 1);
        m_desktop.CloseWindow(*at);
        m_pixels.erase(*at);
        m_windows.erase(at);
    }
    void ChangeFormat() {
        m_desktop.Change([&](platform::SimulatedDesktop& desktop) {
            platform::SimulatedWindow* const window = platform::FindWindow(desktop, AnyWindow());
            if (window != nullptr && window->info.id != WALLPAPER)
                window->format = AnyFormat();
        });
    }
    void ChangeDisplays() {
        switch (dice.Between(0, 6)) {
            case 0:
                m_desktop.ResizeDisplay(SIDE, {static_cast<float>(dice.Between(40, 90)), 60});
                return;
            case 1:
                m_desktop.ScaleDisplay(dice.OneIn(2) ? MAIN : SIDE, dice.OneIn(3) ? 2.0F : 1.0F);
                return;
            case 2:
                m_desktop.MoveDisplay(SIDE, {120, static_cast<float>(dice.Between(-30, 30))});
                return;
            default:
                m_desktop.ScaleDisplay(MAIN, 1.0F);
                m_desktop.ScaleDisplay(SIDE, 1.0F);
        }
    }
    void ChangeCursor() {
        if (dice.OneIn(5))
            return m_desktop.SetCursor(std::nullopt);
        if (dice.OneIn(2)) {
            m_cursorSize = dice.Between(1, 14);
            m_hotSpot = {static_cast<float>(dice.Between(0, 6)), static_cast<float>(dice.Between(0, 6))};
        }
        platform::SimulatedCursor cursor = SquareCursor(0, m_cursorSize);
        const platform::SimulatedArgb one = dice.Colour();
        const platform::SimulatedArgb other = dice.Colour();
        cursor.representations[0].content =
            platform::SimulatedContent::Painted([=](int x, int y) { return (x ^ y) % 2 != 0 ? one : other; });
        cursor.hotSpot = m_hotSpot;
        m_desktop.SetCursor(cursor);
    }
    void HidePointer() {
        if (dice.OneIn(2))
            m_desktop.SetPointer(std::nullopt);
        else
            m_desktop.SetPointer(platform::CGPoint{1000, 1000});
    }

    std::vector<platform::SimulatedArgb>& PixelsOf(platform::CGWindowID window) {
        std::vector<platform::SimulatedArgb>& pixels = m_pixels[window];
        pixels.resize(static_cast<std::size_t>(WIDTH) * HEIGHT);
        return pixels;
    }
    void Show(platform::CGWindowID window) {
        m_desktop.SetContent(window, platform::SimulatedContent::Pixels(WIDTH, HEIGHT, PixelsOf(window)));
    }
    void PaintAll(platform::CGWindowID window) {
        const platform::SimulatedArgb one = dice.Colour();
        const platform::SimulatedArgb noise = dice.OneIn(2) ? dice.Colour() & 0x00FFFFFF : 0U;
        std::vector<platform::SimulatedArgb>& pixels = PixelsOf(window);
        platform::SimulatedArgb each = one;
        for (platform::SimulatedArgb& pixel : pixels) {
            each = each * 1664525 + 1013904223;
            pixel = one ^ (each >> 8 & noise);
        }
        Show(window);
    }
    /// A few rectangles.
    void Paint(platform::CGWindowID window) {
        std::vector<platform::SimulatedArgb>& pixels = PixelsOf(window);
        for (int i = dice.Between(1, 3); i > 0; --i) {
            const int left = dice.Between(0, dice.OneIn(2) ? 90 : 30);
            const int top = dice.Between(0, dice.OneIn(2) ? 60 : 20);
            const int right = std::min(left + dice.Between(1, 30), WIDTH);
            const int bottom = std::min(top + dice.Between(1, 20), HEIGHT);
            const platform::SimulatedArgb colour = dice.Colour();
            for (int y = top; y < bottom; ++y)
                std::fill(pixels.begin() + y * WIDTH + left, pixels.begin() + y * WIDTH + right, colour);
        }
        Show(window);
    }

    platform::SimulatedWindowServer& m_desktop;
    std::vector<platform::CGWindowID> m_windows; // without the wallpaper
    std::map<platform::CGWindowID, std::vector<platform::SimulatedArgb>> m_pixels;
    int m_cursorSize = 4;
    platform::CGPoint m_hotSpot;

public:
    CDice dice;
};

} // namespace painted_desk
