// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

/// What the command line asks to share and to keep out.
struct ShareRequest {
    std::optional<unsigned> monitor{};
    std::vector<unsigned> apps{}; ///< Process ids.
    std::vector<unsigned> windows{};
    // What is to be shared by its name, until the request is completed.
    std::vector<std::string> appNames{};
    std::vector<std::string> windowTitles{};
    std::vector<unsigned> excludedApps{};
    std::vector<unsigned> excludedWindows{};
    /// Keeps menu bars, and what lies in one, out of a share of applications or windows.
    bool excludesMenuBars = false;
};

/// The main monitor stands in for a request that names nothing to share, and ids take the place of names.
/// Gives what is wrong with the request on the desktop as it is now: an id that isn't there, a name that
/// nobody or more than one has. Empty when nothing is.
std::string CompleteRequest(ShareRequest& request);

inline bool Contains(const std::vector<unsigned>& ids, unsigned id) {
    return std::find(ids.begin(), ids.end(), id) != ids.end();
}
