// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"

#include <string>
#include <vector>

/// What there is to share.

struct ListedMonitor {
    unsigned id = 0;
    std::string name;
    platform::CGRect bounds; ///< Global points.
    float scale = 1.0F;      ///< Pixels per point.
};

/// The main one first.
std::vector<ListedMonitor> ListMonitors();

/// The windows on the screen, the front one first.
std::vector<platform::CGWindowDescription> ListWindows();
