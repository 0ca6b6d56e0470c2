// SPDX-License-Identifier: Apache-2.0
#include "tools/list_command.h"

#include "tools/desktop_lists.h"
#include "tools/json_text.h"
#include "tools/text_table.h"

#include <array>
#include <cstdio>

namespace {

std::string Number(float value) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%g", static_cast<double>(value));
    return text.data();
}

std::string PositionOf(const platform::CGRect& rect) {
    return Number(rect.origin.x) + "," + Number(rect.origin.y);
}

std::string SizeOf(const platform::CGRect& rect) {
    return Number(rect.size.width) + "x" + Number(rect.size.height);
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

std::string MonitorTable(const std::vector<ListedMonitor>& monitors) {
    TextTable table({"ID", "POSITION", "SIZE", "SCALE", "NAME"});
    for (const ListedMonitor& monitor : monitors)
        table.AddRow({std::to_string(monitor.id), PositionOf(monitor.bounds), SizeOf(monitor.bounds),
                      Number(monitor.scale), monitor.name});
    return table.Text();
}

std::string MonitorJson(const std::vector<ListedMonitor>& monitors) {
    std::vector<std::string> objects;
    for (const ListedMonitor& monitor : monitors) {
        JsonObjectText object;
        object.Number("id", monitor.id).String("name", monitor.name);
        AddRect(object, monitor.bounds);
        object.Number("scale", monitor.scale).Bool("main", &monitor == &monitors.front());
        objects.push_back(object.Text());
    }
    return JsonArrayText(objects);
}

std::string WindowTable(const std::vector<platform::CGWindowDescription>& windows) {
    TextTable table({"ID", "PID", "APPLICATION", "POSITION", "SIZE", "LEVEL", "ALPHA", "SHARING", "TITLE"});
    for (const platform::CGWindowDescription& window : windows)
        table.AddRow({std::to_string(window.kCGWindowNumber), std::to_string(window.kCGWindowOwnerPID),
                      window.kCGWindowOwnerName, PositionOf(window.kCGWindowBounds),
                      SizeOf(window.kCGWindowBounds), std::to_string(window.kCGWindowLayer),
                      Number(window.kCGWindowAlpha), SharingText(window.kCGWindowSharingState),
                      window.kCGWindowName});
    return table.Text();
}

std::string WindowJson(const std::vector<platform::CGWindowDescription>& windows) {
    std::vector<std::string> objects;
    for (const platform::CGWindowDescription& window : windows) {
        JsonObjectText object;
        object.Number("id", window.kCGWindowNumber)
            .Number("pid", window.kCGWindowOwnerPID)
            .String("application", window.kCGWindowOwnerName)
            .String("title", window.kCGWindowName);
        AddRect(object, window.kCGWindowBounds);
        object.Number("level", window.kCGWindowLayer)
            .Number("alpha", window.kCGWindowAlpha)
            .String("sharing", SharingText(window.kCGWindowSharingState));
        objects.push_back(object.Text());
    }
    return JsonArrayText(objects);
}

} // namespace

std::string MonitorListText(ListForm form) {
    const std::vector<ListedMonitor> monitors = ListMonitors();
    return form == ListForm::Json ? MonitorJson(monitors) : MonitorTable(monitors);
}

std::string WindowListText(ListForm form) {
    const std::vector<platform::CGWindowDescription> windows = ListWindows();
    return form == ListForm::Json ? WindowJson(windows) : WindowTable(windows);
}
