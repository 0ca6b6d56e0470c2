// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/x11_report.h"

#include <array>
#include <cstddef>
#include <string>

/// What `screenshare doctor` has found, before anybody judges it. All texts are UTF-8 without control
/// characters.

enum class DebugFileState {
    Absent,
    Counts,
    Refused, ///< It is there, and others may have written it, or it is no file to be read.
};

/// Variables of the environment; empty means unset as well, here as in the library.
struct EnvironmentFacts {
    std::string platform;       ///< SCREENSHARE_PLATFORM
    std::string display;        ///< DISPLAY
    std::string waylandDisplay; ///< WAYLAND_DISPLAY
    std::string sessionType;    ///< XDG_SESSION_TYPE
    std::string debugFolder;    ///< SCREENSHARE_DEBUG_DIR
    DebugFileState debugFile = DebugFileState::Absent;

    /// Where the debug file is looked for.
    std::string DebugFolderInForce() const { return debugFolder.empty() ? "/tmp/screen_share" : debugFolder; }

    bool IsWaylandSession() const { return !waylandDisplay.empty() || sessionType == "wayland"; }
};

/// The window server in force.
struct ServerFacts {
    std::string name = "none";
    platform::Life life = platform::Life::Lost;
    platform::Permission permission = platform::Permission::NotNeeded;
    std::array<platform::Availability, 7> capabilities{}; ///< By platform::Capability.
    platform::DisplayList displays;
    std::size_t windows = 0;
    std::size_t windowsOnScreen = 0;
    std::size_t applications = 0;

    platform::Availability Of(platform::Capability capability) const {
        return capabilities[static_cast<std::size_t>(capability)];
    }
};

struct DoctorFacts {
    EnvironmentFacts environment;
    ServerFacts server;
    platform::X11Report x11; ///< Of DISPLAY, whatever is in force.
};
