// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace platform {

namespace {

// Beyond the process ids that Linux gives, so that nobody is taken for one of these.
constexpr pid_t DESKTOP = 5'000'001;
constexpr pid_t MENU_BAR = 5'000'002;
constexpr pid_t DOCK = 5'000'003;
constexpr pid_t EDITOR = 5'000'101;
constexpr pid_t BALL = 5'000'102;
constexpr pid_t NOTES = 5'000'103;
constexpr pid_t KEYS = 5'000'104;
constexpr pid_t TERMINAL = 5'000'105;

constexpr int TITLE_BAR = 22;
constexpr std::uint32_t TITLE_BAR_RGB = 0xD9DCE1;

constexpr std::uint32_t Rgb(int red, int green, int blue) {
    return static_cast<std::uint32_t>(red) << 16 | static_cast<std::uint32_t>(green) << 8 |
           static_cast<std::uint32_t>(blue);
}

constexpr bool InCircle(int x, int y, int centreX, int centreY, int radius) {
    return (x - centreX) * (x - centreX) + (y - centreY) * (y - centreY) <= radius * radius;
}

/// Three buttons on a bar.
constexpr std::uint32_t TitleBar(int x, int y) {
    constexpr std::array<std::uint32_t, 3> BUTTONS = {0x4EA5D9, 0x5FB878, 0xB8BCC4};
    for (int i = 0; i < 3; ++i) {
        if (InCircle(x, y, 14 + 18 * i, TITLE_BAR / 2, 5))
            return BUTTONS[static_cast<std::size_t>(i)];
    }
    return TITLE_BAR_RGB;
}

/// Bars as long as words would be: the same at each look, different from line to line.
constexpr bool IsInk(int x, int y, int lineHeight, int inkHeight) {
    const int line = y / lineHeight;
    if (y < 0 || y % lineHeight >= inkHeight || x < 0 || x >= 160 + (line * 97) % 190)
        return false;
    return (x + line * 31) % (34 + (line * 13) % 21) >= 6;
}

SimulatedArgb Wallpaper(int x, int y) {
    const int hill = 520 + (x - 640) * (x - 640) / 4000;
    const int farHill = 460 + (x - 300) * (x - 300) / 1900;
    if (y > hill)
        return Opaque(Rgb(34, 92 - (y - hill) / 12, 84));
    if (y > farHill)
        return Opaque(Rgb(58, 126, 118));
    return Opaque(Rgb(70 + y / 7, 118 + y / 7, 176 + y / 12));
}

SimulatedArgb MenuBar(int x, int y) {
    const bool word = x < 420 && y >= 8 && y < 16 && x % 70 >= 14 && x % 70 < 58;
    return Opaque(word ? 0x3A3F4B : 0xF2F3F5);
}

SimulatedArgb DockPanel(int x, int y) {
    constexpr std::array<std::uint32_t, 4> ICONS = {0x4EA5D9, 0x5FB878, 0x2E86AB, 0x8A9BB0};
    const int cell = x / 52;
    const bool icon = cell < 4 && x % 52 >= 10 && x % 52 < 42 && y >= 6 && y < 38;
    return icon ? Opaque(ICONS[static_cast<std::size_t>(cell)]) : 0xC0202A36U;
}

SimulatedArgb EditorWindow(int x, int y) {
    if (y < TITLE_BAR)
        return Opaque(TitleBar(x, y));
    if (x < 36)
        return Opaque(0xEEF0F3);
    return Opaque(IsInk(x - 48, y - TITLE_BAR - 10, 18, 8) ? 0x39424E : 0xFCFCFD);
}

SimulatedArgb NotesWindow(int x, int y) {
    if (y < TITLE_BAR)
        return Opaque(TitleBar(x, y));
    return Opaque(IsInk(x - 14, y - TITLE_BAR - 14, 26, 6) && x < 200 ? 0x6B7A3A : 0xDFF0A8);
}

SimulatedArgb TerminalWindow(int x, int y) {
    if (y < TITLE_BAR)
        return Opaque(TitleBar(x, y));
    return Opaque(IsInk(x - 10, y - TITLE_BAR - 8, 15, 7) ? 0x7FD6A4 : 0x10161D);
}

/// There and back again between 0 and `span`.
constexpr int Bounce(std::uint64_t way, int span) {
    const int place = static_cast<int>(way % static_cast<std::uint64_t>(2 * span));
    return place <= span ? place : 2 * span - place;
}

SimulatedArgb BallWindow(int x, int y, std::uint64_t frame) {
    constexpr int WIDTH = 320;
    constexpr int HEIGHT = 220;
    constexpr int RADIUS = 24;
    if (y < TITLE_BAR)
        return Opaque(TitleBar(x, y));
    const int centreX = RADIUS + Bounce(frame * 5, WIDTH - 2 * RADIUS);
    const int centreY = TITLE_BAR + RADIUS + Bounce(frame * 3, HEIGHT - TITLE_BAR - 2 * RADIUS);
    if (InCircle(x, y, centreX - 7, centreY - 8, 7))
        return Opaque(0xFFFFFF);
    if (InCircle(x, y, centreX, centreY, RADIUS))
        return Opaque(0x2E86AB);
    return Opaque((x / 20 + y / 20) % 2 == 0 ? 0xF4F7FA : 0xE3EAF1);
}

/// 'X' is black, '.' white, all else transparent.
constexpr std::array<std::string_view, 17> ARROW = {
    ".           ", "..          ", ".X.         ", ".XX.        ", ".XXX.       ", ".XXXX.      ",
    ".XXXXX.     ", ".XXXXXX.    ", ".XXXXXXX.   ", ".XXXXXXXX.  ", ".XXXXX..... ", ".XX.XX.     ",
    ".X. .XX.    ", "..  .XX.    ", ".    .XX.   ", "     .XX.   ", "      ..    ",
};

SimulatedArgb ArrowPixel(int x, int y) {
    const char mark = ARROW[static_cast<std::size_t>(y)][static_cast<std::size_t>(x)];
    if (mark == 'X')
        return Opaque(0);
    return mark == '.' ? Opaque(0xFFFFFF) : 0;
}

SimulatedCursor::Representation ArrowOfScale(int scale) {
    return {static_cast<int>(ARROW[0].size()) * scale, static_cast<int>(ARROW.size()) * scale,
            static_cast<float>(scale),
            SimulatedContent::Painted([scale](int x, int y) { return ArrowPixel(x / scale, y / scale); })};
}

SimulatedContent Painted(SimulatedArgb (*paint)(int, int)) {
    return SimulatedContent::Painted(paint);
}

/// What is there before anything is started.
void AddSurroundings(Scene& scene) {
    scene.Display(0, 0, 1280, 800).Named("Simulated Display").Reserving({0, 24, 0, 48});
    scene.Display(1280, 100, 800, 600).Named("Simulated Side Display").Background(0x1D3B4F);
    scene.App(DESKTOP, "Desktop").Kind(ApplicationKind::Other);
    scene.Window(1).At(0, 0, 1280, 800).Level(SIMULATED_LEVEL_DESKTOP).Showing(Painted(Wallpaper));
    scene.App(MENU_BAR, "Menu Bar").Kind(ApplicationKind::Other);
    scene.Window(2).At(0, 0, 1280, 24).Level(SIMULATED_LEVEL_MAIN_MENU).Showing(Painted(MenuBar));
    scene.App(DOCK, "Dock").Kind(ApplicationKind::Other);
    scene.Window(3).At(532, 752, 216, 44).Level(SIMULATED_LEVEL_DOCK).Showing(Painted(DockPanel));
}

/// The one started last is in front.
void AddApplications(Scene& scene) {
    constexpr std::chrono::nanoseconds BALL_STEP = std::chrono::milliseconds(33);
    scene.App(TERMINAL, "Terminal").FileName("terminal");
    scene.Window(4).At(1360, 180, 520, 340).Titled("Terminal").Showing(Painted(TerminalWindow)).Shadow(6);
    scene.App(EDITOR, "Editor").FileName("editor");
    scene.Window(5).At(90, 80, 620, 460).Titled("Chapter One").Showing(Painted(EditorWindow)).Shadow(6);
    scene.App(KEYS, "Keys").FileName("keys");
    scene.Window(6).At(860, 120, 260, 160).Titled("Keys").Colour(0x303848).Unshared();
    scene.App(NOTES, "Notes").FileName("notes");
    scene.Window(7).At(600, 420, 250, 200).Titled("Shopping").Alpha(0.9F).Showing(Painted(NotesWindow));
    scene.App(BALL, "Bouncing Ball").FileName("ball");
    scene.Window(8).At(820, 330, 320, 220).Titled("Bouncing Ball").Shadow(6);
    scene.Showing(SimulatedContent::Moving(BALL_STEP, BallWindow));
}

} // namespace

SimulatedCursor ArrowCursor() {
    return {{0, 0}, {ArrowOfScale(1), ArrowOfScale(2)}};
}

SimulatedDesktop DefaultScene() {
    Scene scene;
    AddSurroundings(scene);
    AddApplications(scene);
    return scene.Pointer(640, 380).Cursor(ArrowCursor()).Build();
}

} // namespace platform
