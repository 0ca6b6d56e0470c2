// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/scene.h"

#include <sys/types.h>
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

/// A desktop as people have it, for pictures that people look at: two displays, a few windows with something
/// in them, some of it private.

/// What a window shows, drawn with a few simple shapes. Coordinates are pixels from the top left; what lies
/// outside is left out. Colours are 0xRRGGBB.
class PictureCanvas {
public:
    PictureCanvas(int width, int height, std::uint32_t rgb)
        : m_width(width),
          m_height(height),
          m_pixels(static_cast<std::size_t>(width) * static_cast<std::size_t>(height),
                   platform::Opaque(rgb)) {}

    PictureCanvas& Box(int x, int y, int width, int height, std::uint32_t rgb) {
        for (int row = std::max(y, 0); row < std::min(y + height, m_height); ++row) {
            for (int column = std::max(x, 0); column < std::min(x + width, m_width); ++column)
                m_pixels[static_cast<std::size_t>(row * m_width + column)] = platform::Opaque(rgb);
        }
        return *this;
    }
    PictureCanvas& Disc(int x, int y, int radius, std::uint32_t rgb) {
        for (int row = -radius; row <= radius; ++row) {
            for (int column = -radius; column <= radius; ++column) {
                if (row * row + column * column <= radius * radius)
                    Box(x + column, y + row, 1, 1, rgb);
            }
        }
        return *this;
    }
    /// Capital letters and blanks, each letter 3 by 5 boxes of that size.
    PictureCanvas& Text(int x, int y, std::string_view text, std::uint32_t rgb, int size = 2) {
        for (const char letter : text) {
            for (int bit = 0; letter >= 'A' && letter <= 'Z' && bit < 15; ++bit) {
                if ((LETTERS[letter - 'A'] >> (14 - bit) & 1) != 0)
                    Box(x + bit % 3 * size, y + bit / 3 * size, size, size, rgb);
            }
            x += 4 * size;
        }
        return *this;
    }
    /// Lines as a text would have from far away.
    PictureCanvas& Lines(int x, int y, int width, int count, std::uint32_t rgb) {
        for (int line = 0; line < count; ++line)
            Box(x, y + line * 9, width - line * 37 % (width / 3), 4, rgb);
        return *this;
    }

    platform::SimulatedContent Content() const {
        return platform::SimulatedContent::Pixels(m_width, m_height, m_pixels);
    }

private:
    /// An octal digit a row, from the top.
    static constexpr int LETTERS[] = {025755, 065656, 034443, 065556, 074647, 074644, 034553, 055755, 072227,
                                      011152, 055655, 044447, 057755, 065555, 025552, 065644, 025563, 065655,
                                      034216, 072222, 055557, 055552, 055775, 055255, 055222, 071247};

    int m_width;
    int m_height;
    std::vector<platform::SimulatedArgb> m_pixels;
};

struct PictureScene {
    static constexpr unsigned MAIN = 1;
    static constexpr unsigned SIDE = 2;
    static constexpr pid_t DESKTOP = 5'000'001;
    static constexpr pid_t EDITOR = 5'000'100;
    static constexpr pid_t MAPS = 5'000'200;
    static constexpr pid_t CHAT = 5'000'300;
    static constexpr platform::CGWindowID PASSWORDS = 20;

    /// The title bars of what is private, found nowhere else.
    static constexpr std::uint32_t CHAT_RGB = 0x8E44AD;
    static constexpr std::uint32_t PASSWORDS_RGB = 0xC0392B;

    static platform::Scene Make() {
        platform::Scene scene;
        scene.Display(0, 0, 640, 400).Reserving({0, 20, 0, 44}).Display(640, 0, 400, 260);
        scene.App(DESKTOP, "Desktop");
        scene.Window(10).At(0, 0, 640, 400).Level(platform::SIMULATED_LEVEL_DESKTOP).Showing(Hills());
        scene.Window(11).At(640, 0, 400, 260).Level(platform::SIMULATED_LEVEL_DESKTOP).Showing(Night());
        scene.Window(12).At(0, 0, 640, 20).Level(platform::SIMULATED_LEVEL_MAIN_MENU).Showing(MenuBar());
        scene.Window(13).At(170, 360, 300, 36).Level(platform::SIMULATED_LEVEL_DOCK).Showing(Dock());
        scene.App(MAPS, "Maps").Window(14).At(330, 28, 280, 212).Showing(Map());
        scene.App(EDITOR, "Editor").Window(15).At(40, 50, 330, 250).Showing(Report());
        scene.Window(16).At(690, 30, 300, 200).Showing(Slide());
        scene.Window(PASSWORDS).At(250, 150, 180, 110).Showing(Passwords());
        scene.App(CHAT, "Chat").Window(21).At(420, 180, 190, 160).Showing(Messages());
        scene.Window(22).At(900, 150, 160, 90).Showing(Messages());
        return scene.Pointer(150, 170).Cursor(platform::ArrowCursor());
    }

private:
    static PictureCanvas Frame(int width, int height, std::string_view title, std::uint32_t bar) {
        PictureCanvas canvas(width, height, 0x5D6D7E);
        canvas.Box(1, 1, width - 2, height - 2, 0xFDFEFE).Box(1, 1, width - 2, 18, bar);
        for (int i = 0; i < 3; ++i)
            canvas.Disc(width - 12 - 14 * i, 10, 4, 0xECF0F1);
        return canvas.Text(8, 5, title, 0xFFFFFF);
    }

    static platform::SimulatedContent Hills() {
        PictureCanvas canvas(640, 400, 0xAED6F1);
        canvas.Box(0, 140, 640, 80, 0xD6EAF8).Disc(540, 90, 34, 0xF9E79F);
        canvas.Disc(120, 560, 340, 0x7DCEA0).Disc(520, 640, 380, 0x52BE80).Box(0, 370, 640, 30, 0x27AE60);
        return canvas.Content();
    }
    static platform::SimulatedContent Night() {
        PictureCanvas canvas(400, 260, 0x1B2631);
        canvas.Disc(340, 50, 26, 0xF4F6F7).Disc(330, 44, 24, 0x1B2631).Disc(200, 560, 340, 0x212F3C);
        for (int star = 0; star < 24; ++star)
            canvas.Box(star * 131 % 400, star * 57 % 200, 2, 2, 0xD5D8DC);
        return canvas.Content();
    }
    static platform::SimulatedContent MenuBar() {
        PictureCanvas canvas(640, 20, 0x2C3E50);
        canvas.Text(10, 5, "DESKTOP", 0xECF0F1).Text(90, 5, "FILE", 0xAAB7B8).Text(140, 5, "EDIT", 0xAAB7B8);
        return canvas.Text(580, 5, "MONDAY", 0xECF0F1).Content();
    }
    static platform::SimulatedContent Dock() {
        PictureCanvas canvas(300, 36, 0xD7DBDD);
        constexpr std::uint32_t ICONS[] = {0x3498DB, 0x1ABC9C, 0xF39C12, 0x9B59B6,
                                           0x34495E, 0xE67E22, 0x16A085};
        for (int i = 0; i < 7; ++i)
            canvas.Box(12 + 40 * i, 6, 24, 24, ICONS[i]).Disc(24 + 40 * i, 18, 6, 0xFDFEFE);
        return canvas.Content();
    }
    static platform::SimulatedContent Report() {
        PictureCanvas canvas = Frame(330, 250, "REPORT", 0x2874A6);
        canvas.Text(20, 34, "SALES BY MONTH", 0x1B4F72, 3).Lines(20, 62, 290, 6, 0xABB2B9);
        constexpr int BARS[] = {30, 52, 44, 70, 62, 88, 80, 104};
        for (int i = 0; i < 8; ++i)
            canvas.Box(24 + 36 * i, 234 - BARS[i], 24, BARS[i], i % 2 == 0 ? 0x5DADE2 : 0x2E86C1);
        return canvas.Box(20, 234, 290, 2, 0x566573).Content();
    }
    static platform::SimulatedContent Map() {
        PictureCanvas canvas = Frame(280, 212, "MAPS", 0x117A65);
        canvas.Box(1, 19, 278, 192, 0xE8F6F3).Box(1, 60, 110, 80, 0xABEBC6).Box(170, 110, 109, 101, 0x85C1E9);
        canvas.Box(1, 90, 278, 8, 0xF8C471).Box(130, 19, 8, 192, 0xF8C471).Box(210, 19, 5, 192, 0xD5DBDB);
        return canvas.Disc(134, 94, 9, 0xD35400)
            .Text(20, 104, "PARK", 0x1D8348)
            .Text(200, 150, "LAKE", 0x1A5276)
            .Content();
    }
    static platform::SimulatedContent Slide() {
        PictureCanvas canvas = Frame(300, 200, "SLIDES", 0xB9770E);
        canvas.Text(52, 50, "HELLO", 0x1C2833, 10);
        for (int i = 0; i < 3; ++i)
            canvas.Disc(40, 134 + 20 * i, 5, 0xB9770E).Box(54, 132 + 20 * i, 180 - 30 * i, 5, 0x808B96);
        return canvas.Content();
    }
    static platform::SimulatedContent Passwords() {
        PictureCanvas canvas = Frame(180, 110, "PASSWORDS", PASSWORDS_RGB);
        constexpr std::string_view NAMES[] = {"BANK", "MAIL", "SHOP"};
        for (int row = 0; row < 3; ++row) {
            canvas.Text(12, 32 + 24 * row, NAMES[row], 0x641E16);
            for (int dot = 0; dot < 9; ++dot)
                canvas.Disc(72 + 11 * dot, 37 + 24 * row, 3, 0x641E16);
        }
        return canvas.Content();
    }
    static platform::SimulatedContent Messages() {
        PictureCanvas canvas = Frame(190, 160, "CHAT", CHAT_RGB);
        for (int i = 0; i < 3; ++i)
            canvas.Box(i % 2 == 0 ? 10 : 60, 28 + 42 * i, 118, 32, i % 2 == 0 ? 0xEBDEF0 : 0xD2B4DE);
        return canvas.Text(18, 38, "ARE YOU FREE", 0x4A235A)
            .Text(68, 80, "NOT TODAY", 0x4A235A)
            .Text(18, 122, "A PITY", 0x4A235A)
            .Content();
    }
};
