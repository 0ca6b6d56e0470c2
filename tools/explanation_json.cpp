// SPDX-License-Identifier: Apache-2.0
#include "tools/explanation_json.h"

#include "tools/json_text.h"
#include "tools/list_rows.h"

namespace {

std::string MonitorElements(const std::vector<unsigned>& monitors) {
    std::vector<std::string> elements;
    elements.reserve(monitors.size());
    for (const unsigned monitor : monitors)
        elements.push_back(std::to_string(monitor));
    return JsonArrayText(elements);
}

std::string WindowElements(const std::vector<ExplainedWindow>& windows) {
    std::vector<std::string> elements;
    for (const ExplainedWindow& each : windows) {
        JsonObjectText object = WindowRows({each.window}).front().json;
        object.String("verdict", VerdictText(each.verdict)).String("reason", each.reason);
        elements.push_back(object.Text());
    }
    return JsonArrayText(elements);
}

std::string RectElements(const std::vector<TVLRect>& rects) {
    std::vector<std::string> elements;
    for (const TVLRect& rect : rects) {
        JsonObjectText object;
        object.Number("x", rect.left)
            .Number("y", rect.top)
            .Number("width", rect.right - rect.left)
            .Number("height", rect.bottom - rect.top);
        elements.push_back(object.Text());
    }
    return JsonArrayText(elements);
}

} // namespace

std::string ExplanationJson(const Explanation& explanation) {
    JsonObjectText object;
    object.String("share", explanation.title)
        .String("kept_out", explanation.keptOut)
        .Array("monitors", MonitorElements(explanation.sharedMonitors))
        .Array("windows", WindowElements(explanation.windows))
        .Array("visible", RectElements(explanation.visible))
        .Array("overlap", RectElements(explanation.overlap))
        .Array("background", RectElements(explanation.background));
    return object.Text() + "\n";
}
