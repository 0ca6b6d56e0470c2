// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_window_server.h"

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace platform {

/// Describes a simulated desktop in a row of short calls:
///
///     Scene().Display(0, 0, 200, 120)
///         .App(100, "Editor")
///         .Window(1).At(10, 10, 80, 60).Colour(0x00FF00)
///         .Window(2).At(20, 20, 80, 60).Colour(0x0000FF).Alpha(0.5F)
///         .Serve();
///
/// Each word says something of the last display, application or window before it; without one it is a failed
/// check, and a nameless one takes it. Colours are 0xRRGGBB.
class Scene {
public:
    // ---- Displays; the first is the main one

    /// In points. Gets the next id, from 1.
    Scene& Display(float x, float y, float width, float height);
    Scene& DisplayId(CGDirectDisplayID id);
    Scene& Scale(float scale);
    Scene& Named(std::string name);
    Scene& Reserving(SimulatedEdges edges);
    Scene& Background(std::uint32_t rgb);
    Scene& Background(SimulatedContent content);

    // ---- Applications

    Scene& App(pid_t pid, std::string name);
    /// Else it is the name.
    Scene& FileName(std::string fileName);
    Scene& Kind(ApplicationKind kind);
    Scene& BackgroundOnly();

    // ---- Windows; each comes to the front of its level, as a window does that opens

    /// It belongs to the last application, if there is one, and is grey.
    Scene& Window(CGWindowID id);
    Scene& Of(pid_t pid);
    Scene& At(float x, float y, float width, float height);
    Scene& Colour(std::uint32_t rgb);
    Scene& Showing(SimulatedContent content);
    Scene& Unpainted();
    Scene& Titled(std::string title);
    Scene& Level(int level);
    Scene& Alpha(float alpha);
    Scene& Sharing(SharingState sharing);
    Scene& Unshared();
    Scene& OffScreen();
    /// Of that width on all sides.
    Scene& Shadow(float width);
    Scene& Format(PixelFormat format, std::size_t rowGap = 0);

    /// The windows stand as they were named, the last one in front, whatever their levels.
    Scene& StackedAsNamed();

    // ---- Pointer

    Scene& Pointer(float x, float y);
    Scene& Cursor(SimulatedCursor cursor);

    // ---- The end

    SimulatedDesktop Build() const;
    std::shared_ptr<SimulatedWindowServer> Serve() const;

private:
    SimulatedDisplay& LastDisplay();
    ApplicationInfo& LastApp();
    SimulatedWindow& LastWindow();

    SimulatedDesktop m_desktop; // but for the windows
    std::vector<SimulatedWindow> m_windows;
    bool m_asNamed = false;
};

/// The desktop that SCREENSHARE_PLATFORM=simulated shows: two displays, a few applications, and a ball that
/// moves with the clock.
SimulatedDesktop DefaultScene();

/// A desktop to show a share on.
struct DemoScene {
    SimulatedDesktop desktop;
    pid_t shared = 0;      ///< An application with two windows, one of which lies on both displays.
    CGWindowID secret = 0; ///< Somebody else's, in front of the first of them; all of it is red.
};

/// That of DefaultScene, moved about for it, and with titles that can be read.
DemoScene MakeDemoScene();

/// Whether a colour is one of the secret window's: red leads in it, as in nothing else of that desktop. That
/// goes for mixtures of its colours, too, and for what mostly consists of them.
bool LooksSecret(std::uint8_t red, std::uint8_t green, std::uint8_t blue) noexcept;

/// A black arrow with a white edge, for displays of scale 1 and 2.
SimulatedCursor ArrowCursor();

} // namespace platform
