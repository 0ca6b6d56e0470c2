// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "tools/desktop_lists.h"
#include "tools/share_request.h"

#include <screenshare/share_types.h>

#include <string>
#include <vector>

/// What the window walk made of each window, and why; found out without capturing anything.

enum class WindowVerdict {
    Kept,
    KeptOut,
    Skipped, ///< The walk passed it over.
    Missed,  ///< It came, went or was listed anew while the walk was under way.
};

struct ExplainedWindow {
    platform::CGWindowDescription window;
    WindowVerdict verdict = WindowVerdict::Missed;
    std::string reason; ///< For people: the list or the rule that decided.
};

struct Explanation {
    std::string title;   ///< "Share of monitor 1"
    std::string keptOut; ///< What the request keeps out; empty when it is nothing.
    std::vector<ListedMonitor> monitors;
    std::vector<unsigned> sharedMonitors;
    std::vector<ExplainedWindow> windows; ///< The front one first.
    /// Rectangles in global points.
    std::vector<TVLRect> visible;
    std::vector<TVLRect> overlap;
    std::vector<TVLRect> background;
};

/// Walks over the windows as a share of that request would. The request is a completed one.
Explanation Explain(const ShareRequest& request);

/// "kept", "kept out" and so on.
const char* VerdictText(WindowVerdict verdict);
