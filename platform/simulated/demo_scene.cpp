// SPDX-License-Identifier: Apache-2.0
#include "platform/bitmap_font.h"
#include "platform/simulated/scene.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <string>
#include <utility>

namespace platform {

namespace {

constexpr int DEMO_TITLE_BAR = 22;
constexpr int DEMO_TITLE_LEFT = 66; // behind the buttons

constexpr std::uint32_t DEMO_TITLE_RGB = 0x39424E;

// Red leads in all of these, and in nothing else on the desktop.
constexpr std::uint32_t SECRET_BAR_RGB = 0x8E1F1F;
constexpr std::uint32_t SECRET_GROUND_RGB = 0xC0392B;
constexpr std::uint32_t SECRET_INK_RGB = 0xFFB3A8;

constexpr int DemoSquare(int value) {
    return value * value;
}

/// A ring with a stem and two teeth, some 100 by 44 pixels.
constexpr bool IsInKey(int x, int y) {
    const int fromCentre = DemoSquare(x - 22) + DemoSquare(y - 22);
    const bool ring = fromCentre <= DemoSquare(22) && fromCentre >= DemoSquare(10);
    const bool stem = x >= 40 && x < 100 && y >= 18 && y < 26;
    const bool teeth = y >= 26 && y < 36 && ((x >= 74 && x < 81) || (x >= 88 && x < 95));
    return ring || stem || teeth;
}

/// A row of dots, as passwords are shown.
constexpr bool IsInDots(int x, int y, int count) {
    return x >= 0 && x < count * 16 && DemoSquare(x % 16 - 5) + DemoSquare(y) <= DemoSquare(5);
}

SimulatedArgb SecretWindow(int x, int y) {
    if (y < DEMO_TITLE_BAR)
        return Opaque(HasInk("Keys", x - 12, y - 1) ? SECRET_INK_RGB : SECRET_BAR_RGB);
    const bool ink = IsInKey(x - 28, y - 50) || IsInDots(x - 150, y - 58, 8) ||
                     IsInDots(x - 150, y - 86, 6) || HasInk("private, not shared", x - 28, y - 124);
    return Opaque(ink ? SECRET_INK_RGB : SECRET_GROUND_RGB);
}

/// The same content with a title in its bar.
SimulatedContent WithTitle(const SimulatedContent& content, const std::string& title) {
    const auto paint = [content, title](int x, int y, std::uint64_t frame) {
        return HasInk(title, x - DEMO_TITLE_LEFT, y - 1) ? Opaque(DEMO_TITLE_RGB) : content.At(x, y, frame);
    };
    using std::chrono::nanoseconds;
    if (const auto step = content.NextFrameAfter(nanoseconds(0)))
        return SimulatedContent::Moving(*step, paint);
    return SimulatedContent::Painted([paint](int x, int y) { return paint(x, y, 0); });
}

SimulatedWindow TakeWindow(SimulatedDesktop& desktop, const std::string& title) {
    const auto found =
        std::find_if(desktop.windows.begin(), desktop.windows.end(),
                     [&title](const SimulatedWindow& window) { return window.info.title == title; });
    SimulatedWindow window = *found;
    desktop.windows.erase(found);
    return window;
}

void Put(SimulatedDesktop& desktop, SimulatedWindow window, const CGRect& frame) {
    window.info.frame = frame;
    PutAtFrontOfItsLevel(desktop, std::move(window));
}

void WriteTitles(SimulatedDesktop& desktop) {
    for (SimulatedWindow& window : desktop.windows) {
        if (window.info.level == 0)
            window.content = WithTitle(window.content, window.info.title);
    }
}

} // namespace

DemoScene MakeDemoScene() {
    SimulatedDesktop desktop = DefaultScene();
    const SimulatedWindow chapter = TakeWindow(desktop, "Chapter One");
    SimulatedWindow figure = TakeWindow(desktop, "Bouncing Ball");
    SimulatedWindow notes = TakeWindow(desktop, "Shopping");
    SimulatedWindow secret = TakeWindow(desktop, "Keys");

    const pid_t shared = chapter.info.owner;
    std::erase_if(desktop.applications,
                  [&figure](const ApplicationInfo& each) { return each.pid == figure.info.owner; });
    figure.info.owner = shared;
    figure.info.title = "Figure 1";
    Put(desktop, std::move(notes), {{800, 90}, {250, 200}});
    Put(desktop, chapter, {{90, 80}, {700, 520}});
    Put(desktop, std::move(figure), {{1080, 400}, {320, 220}});
    WriteTitles(desktop);

    secret.info.sharing = SharingState::ReadOnly;
    secret.content = SimulatedContent::Painted(SecretWindow);
    DemoScene scene{{}, shared, secret.info.id};
    Put(desktop, std::move(secret), {{520, 330}, {330, 190}});
    desktop.pointer = CGPoint{300, 420};
    scene.desktop = std::move(desktop);
    return scene;
}

bool LooksSecret(std::uint8_t red, std::uint8_t green, std::uint8_t blue) noexcept {
    constexpr int LEAD = 40;
    return red > std::max(green, blue) + LEAD;
}

} // namespace platform
