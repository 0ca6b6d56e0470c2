// SPDX-License-Identifier: Apache-2.0
#include "tools/list_rows.h"

#include <array>
#include <cstdio>

namespace {

std::string NumberText(float value) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%g", static_cast<double>(value));
    return text.data();
}

std::string PositionOf(const platform::CGRect& rect) {
    return NumberText(rect.origin.x) + "," + NumberText(rect.origin.y);
}

std::string SizeOf(const platform::CGRect& rect) {
    return NumberText(rect.size.width) + "x" + NumberText(rect.size.height);
}

JsonObjectText& AddRect(JsonObjectText& object, const platform::CGRect& rect) {
    return object.Number("x", rect.origin.x)
        .Number("y", rect.origin.y)
        .Number("width", rect.size.width)
        .Number("height", rect.size.height);
}

const char* SharingText(platform::CGWindowSharingType sharing) {
    switch (sharing) {
        case platform::kCGWindowSharingNone:
            return "none";
        case platform::kCGWindowSharingReadOnly:
            return "read";
        case platform::kCGWindowSharingReadWrite:
            break;
    }
    return "write";
}

ListRow MonitorRow(const ListedMonitor& monitor, bool isMain) {
    ListRow row{monitor.id,
                {std::to_string(monitor.id), PositionOf(monitor.bounds), SizeOf(monitor.bounds),
                 NumberText(monitor.scale), monitor.name},
                {}};
    row.json.Number("id", monitor.id).String("name", monitor.name);
    AddRect(row.json, monitor.bounds).Number("scale", monitor.scale).Bool("main", isMain);
    return row;
}

ListRow WindowRow(const platform::CGWindowDescription& window) {
    const char* const sharing = SharingText(window.kCGWindowSharingState);
    ListRow row{window.kCGWindowNumber,
                {std::to_string(window.kCGWindowNumber), std::to_string(window.kCGWindowOwnerPID),
                 window.kCGWindowOwnerName, PositionOf(window.kCGWindowBounds),
                 SizeOf(window.kCGWindowBounds), std::to_string(window.kCGWindowLayer),
                 NumberText(window.kCGWindowAlpha), sharing, window.kCGWindowName},
                {}};
    row.json.Number("id", window.kCGWindowNumber)
        .Number("pid", window.kCGWindowOwnerPID)
        .String("application", window.kCGWindowOwnerName)
        .String("title", window.kCGWindowName);
    AddRect(row.json, window.kCGWindowBounds)
        .Number("level", window.kCGWindowLayer)
        .Number("alpha", window.kCGWindowAlpha)
        .String("sharing", sharing);
    return row;
}

ListRow ApplicationRow(const ListedApplication& application) {
    ListRow row{application.pid,
                {std::to_string(application.pid), application.name, std::to_string(application.windows)},
                {}};
    row.json.Number("pid", application.pid)
        .String("name", application.name)
        .Number("windows", static_cast<double>(application.windows));
    return row;
}

} // namespace

ListRows MonitorRows(const std::vector<ListedMonitor>& monitors) {
    ListRows rows;
    for (const ListedMonitor& monitor : monitors)
        rows.push_back(MonitorRow(monitor, &monitor == &monitors.front()));
    return rows;
}

ListRows WindowRows(const std::vector<platform::CGWindowDescription>& windows) {
    ListRows rows;
    for (const platform::CGWindowDescription& window : windows)
        rows.push_back(WindowRow(window));
    return rows;
}

ListRows ApplicationRows(const std::vector<ListedApplication>& applications) {
    ListRows rows;
    for (const ListedApplication& application : applications)
        rows.push_back(ApplicationRow(application));
    return rows;
}

const ListKind& ListOfMonitors() {
    static const ListKind list{{"ID", "POSITION", "SIZE", "SCALE", "NAME"},
                               [] { return MonitorRows(ListMonitors()); }};
    return list;
}

const ListKind& ListOfWindows() {
    static const ListKind list{
        {"ID", "PID", "APPLICATION", "POSITION", "SIZE", "LEVEL", "ALPHA", "SHARING", "TITLE"},
        [] { return WindowRows(ListWindows()); }};
    return list;
}

const ListKind& ListOfApplications() {
    static const ListKind list{{"PID", "NAME", "WINDOWS"},
                               [] { return ApplicationRows(ListApplications()); }};
    return list;
}
