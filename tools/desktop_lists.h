// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"

#include <cstddef>
#include <string>
#include <vector>

/// What there is to share. Empty where the desktop has gone; nothing here waits for it.

struct ListedMonitor {
    unsigned id = 0;
    std::string name;
    platform::CGRect bounds; ///< Global points.
    float scale = 1.0F;      ///< Pixels per point.
};

struct ListedApplication {
    unsigned pid = 0;
    std::string name;        ///< UTF-8.
    std::size_t windows = 0; ///< On the screen.
};

/// The main one first.
std::vector<ListedMonitor> ListMonitors();

/// The windows on the screen, the front one first.
std::vector<platform::CGWindowDescription> ListWindows();

/// The running applications that a client's picker would list, each once.
std::vector<ListedApplication> ListApplications();
