// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>
#include <string>
#include <vector>

/// What people want to know of an X display when sharing doesn't go as they expect. Independent of the window
/// server in force, which may well not be this one. No header of the X libraries is needed.
namespace platform {

/// Why a display can't be looked at.
enum class X11Obstacle {
    None,
    NoName,         ///< Neither an argument nor DISPLAY.
    UnreadableName, ///< Not of the form "host:display.screen".
    AnotherMachine, ///< Only displays of this machine can be shared.
    NobodyThere,    ///< No server listens under that number.
    Refused,        ///< Somebody listens and doesn't let us in.
    NoSuchScreen,
    NoAnswer, ///< Not in time.
    Lost,     ///< It let us in and went away.
};

struct X11Extension {
    bool present = false;
    /// What the server and we have agreed on, so never more than we know of. 0 when it isn't present.
    unsigned major = 0;
    unsigned minor = 0;
    bool suffices = false; ///< Present, and new enough to be used.
};

struct X11Monitor {
    std::string name; ///< That of its output, unless somebody has arranged monitors by hand.
    int x = 0;        ///< Pixels of the root, likewise the others.
    int y = 0;
    int width = 0;
    int height = 0;
    bool primary = false;
};

/// All texts are UTF-8 without control characters, whatever the server and its clients say.
struct X11Report {
    std::string display;
    X11Obstacle obstacle = X11Obstacle::None;
    bool hasCookie = false;   ///< The user's authority file has an entry for this display.
    bool overNetwork = false; ///< The display is reached by a network connection, as through a secure shell.

    // Only without an obstacle.
    std::string vendor;
    unsigned release = 0;
    int width = 0; ///< Of the root, in pixels.
    int height = 0;
    int depth = 0;
    bool depthReadable = false; ///< Pictures of that depth can be converted.
    X11Extension composite;
    X11Extension damage;
    X11Extension shm;   ///< Suffices when it takes descriptors.
    X11Extension randr; ///< Suffices when it tells monitors.
    X11Extension xfixes;
    X11Extension shape;
    X11Extension xres;
    X11Extension xinput;              ///< Suffices when it tells of motion anywhere.
    std::vector<X11Monitor> monitors; ///< None without RandR.
    bool hasWindowManager = false;
    std::string windowManager; ///< Its name, empty when it has none; likewise the compositor's.
    bool hasCompositor = false;
    std::string compositor;
    /// A server inside a Wayland session: it knows the windows of X programs, and the rest of it is black.
    bool isWaylandBridge = false;
};

/// Connects, looks and disconnects. `display` as in the variable DISPLAY, which an empty one means.
/// `deadline` on CmSteadyNow; what is not told by then is missing, and the obstacle says so. Throws only for
/// want of memory.
X11Report ReportOnX11(const std::string& display, std::chrono::nanoseconds deadline);

} // namespace platform
