// SPDX-License-Identifier: Apache-2.0
#include "tools/share_request.h"

#include "tools/desktop_lists.h"

namespace {

std::vector<unsigned> MonitorIds() {
    std::vector<unsigned> ids;
    for (const ListedMonitor& monitor : ListMonitors())
        ids.push_back(monitor.id);
    return ids;
}

/// Something on the desktop that may be shared by its name.
struct Named {
    unsigned id = 0;
    std::string name;
};

std::vector<Named> NamedWindows() {
    std::vector<Named> all;
    for (const platform::CGWindowDescription& window : ListWindows())
        all.push_back({window.kCGWindowNumber, window.kCGWindowName});
    return all;
}

/// Those that have a window on the screen, the frontmost first.
std::vector<Named> NamedApps() {
    std::vector<Named> all;
    std::vector<unsigned> known;
    for (const platform::CGWindowDescription& window : ListWindows()) {
        const auto pid = static_cast<unsigned>(window.kCGWindowOwnerPID);
        if (pid == 0 || Contains(known, pid))
            continue;
        known.push_back(pid);
        all.push_back({pid, window.kCGWindowOwnerName});
    }
    return all;
}

std::vector<unsigned> IdsOf(const std::vector<Named>& all) {
    std::vector<unsigned> ids;
    ids.reserve(all.size());
    for (const Named& each : all)
        ids.push_back(each.id);
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

/// Appends the id that goes with each name. Gives the first problem, or nothing.
std::string TakeNamed(const std::vector<Named>& there, const std::vector<std::string>& names,
                      const std::string& kind, std::vector<unsigned>& ids) {
    for (const std::string& name : names) {
        std::vector<unsigned> found;
        for (const Named& each : there) {
            if (each.name == name)
                found.push_back(each.id);
        }
        if (found.empty())
            return "there is no " + kind + " '" + name + "'";
        if (found.size() > 1)
            return "there is more than one " + kind + " '" + name + "': " + Joined(found);
        if (!Contains(ids, found.front()))
            ids.push_back(found.front());
    }
    return "";
}

/// Ids for all names of a request.
std::string TakeNames(ShareRequest& request) {
    std::string problem;
    if (!request.appNames.empty())
        problem = TakeNamed(NamedApps(), request.appNames, "application with a window", request.apps);
    if (problem.empty() && !request.windowTitles.empty())
        problem = TakeNamed(NamedWindows(), request.windowTitles, "window", request.windows);
    if (problem.empty()) {
        request.appNames.clear();
        request.windowTitles.clear();
    }
    return problem;
}

} // namespace

std::string CompleteRequest(ShareRequest& request) {
    const std::vector<unsigned> monitors = MonitorIds();
    if (monitors.empty())
        return "there is no monitor to share";
    if (std::string problem = TakeNames(request); !problem.empty())
        return problem;
    if (!request.monitor && request.apps.empty() && request.windows.empty())
        request.monitor = monitors.front();
    if (request.monitor) {
        if (std::string problem = MissingFrom(monitors, {*request.monitor}, "monitor"); !problem.empty())
            return problem;
    }
    for (const std::vector<unsigned>* asked : {&request.apps, &request.excludedApps}) {
        if (std::string problem = MissingFrom(IdsOf(NamedApps()), *asked, "application with a window");
            !problem.empty())
            return problem;
    }
    for (const std::vector<unsigned>* asked : {&request.windows, &request.excludedWindows}) {
        if (std::string problem = MissingFrom(IdsOf(NamedWindows()), *asked, "window"); !problem.empty())
            return problem;
    }
    return "";
}
