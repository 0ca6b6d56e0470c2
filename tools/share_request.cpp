// SPDX-License-Identifier: Apache-2.0
#include "tools/share_request.h"

#include "tools/desktop_lists.h"

#include <algorithm>

namespace {

bool Contains(const std::vector<unsigned>& values, unsigned value) {
    return std::find(values.begin(), values.end(), value) != values.end();
}

std::vector<unsigned> MonitorIds() {
    std::vector<unsigned> ids;
    for (const ListedMonitor& monitor : ListMonitors())
        ids.push_back(monitor.id);
    return ids;
}

std::vector<unsigned> WindowIds() {
    std::vector<unsigned> ids;
    for (const platform::CGWindowDescription& window : ListWindows())
        ids.push_back(window.kCGWindowNumber);
    return ids;
}

/// Those that have a window on the screen, the frontmost first.
std::vector<unsigned> AppIds() {
    std::vector<unsigned> ids;
    for (const platform::CGWindowDescription& window : ListWindows()) {
        const auto pid = static_cast<unsigned>(window.kCGWindowOwnerPID);
        if (pid != 0 && !Contains(ids, pid))
            ids.push_back(pid);
    }
    return ids;
}

std::string Joined(const std::vector<unsigned>& values) {
    std::string text;
    for (const unsigned value : values)
        text += (text.empty() ? "" : ", ") + std::to_string(value);
    return text.empty() ? "none" : text;
}

/// Empty when all of them are there.
std::string MissingFrom(const std::vector<unsigned>& there, const std::vector<unsigned>& asked,
                        const std::string& kind) {
    for (const unsigned id : asked) {
        if (!Contains(there, id))
            return "there is no " + kind + " " + std::to_string(id) + "; there are: " + Joined(there);
    }
    return "";
}

} // namespace

std::string CompleteRequest(ShareRequest& request) {
    const std::vector<unsigned> monitors = MonitorIds();
    if (monitors.empty())
        return "there is no monitor to share";
    if (!request.monitor && request.apps.empty() && request.windows.empty())
        request.monitor = monitors.front();
    if (request.monitor) {
        if (std::string problem = MissingFrom(monitors, {*request.monitor}, "monitor"); !problem.empty())
            return problem;
    }
    for (const std::vector<unsigned>* asked : {&request.apps, &request.excludedApps}) {
        if (std::string problem = MissingFrom(AppIds(), *asked, "application with a window");
            !problem.empty())
            return problem;
    }
    for (const std::vector<unsigned>* asked : {&request.windows, &request.excludedWindows}) {
        if (std::string problem = MissingFrom(WindowIds(), *asked, "window"); !problem.empty())
            return problem;
    }
    return "";
}
