// SPDX-License-Identifier: Apache-2.0
#include "tools/doctor_report.h"
#include "tools/json_text.h"

#include <string_view>
#include <utility>
#include <vector>

namespace {

using platform::X11Extension;
using platform::X11Obstacle;
using platform::X11Report;

/// Names with values that are JSON already.
using Members = std::vector<std::pair<std::string_view, std::string>>;

std::string ObjectText(const Members& members) {
    std::string text;
    for (const auto& [name, value] : members)
        text += (text.empty() ? "{" : ", ") + JsonStringText(name) + ": " + value;
    return text + "}";
}

/// An element a line.
std::string ListText(const std::vector<std::string>& elements) {
    std::string text = JsonArrayText(elements);
    text.pop_back();
    return text;
}

const char* LifeWord(platform::Life life) {
    switch (life) {
        case platform::Life::Alive:
            return "alive";
        case platform::Life::Stalled:
            return "stalled";
        case platform::Life::Lost:
            break;
    }
    return "lost";
}

const char* DebugFileWord(DebugFileState state) {
    switch (state) {
        case DebugFileState::Absent:
            return "absent";
        case DebugFileState::Counts:
            return "counts";
        case DebugFileState::Refused:
            break;
    }
    return "refused";
}

const char* ObstacleWord(X11Obstacle obstacle) {
    switch (obstacle) {
        case X11Obstacle::None:
            return "";
        case X11Obstacle::NoName:
            return "no name";
        case X11Obstacle::UnreadableName:
            return "unreadable name";
        case X11Obstacle::AnotherMachine:
            return "another machine";
        case X11Obstacle::NobodyThere:
            return "nobody there";
        case X11Obstacle::Refused:
            return "refused";
        case X11Obstacle::NoSuchScreen:
            return "no such screen";
        case X11Obstacle::NoAnswer:
            return "no answer";
        case X11Obstacle::Lost:
            break;
    }
    return "lost";
}

std::string EnvironmentText(const EnvironmentFacts& environment) {
    return JsonObjectText()
        .String("SCREENSHARE_PLATFORM", environment.platform)
        .String("DISPLAY", environment.display)
        .String("WAYLAND_DISPLAY", environment.waylandDisplay)
        .String("XDG_SESSION_TYPE", environment.sessionType)
        .String("SCREENSHARE_DEBUG_DIR", environment.debugFolder)
        .String("debug_file", DebugFileWord(environment.debugFile))
        .Text();
}

std::string ExtensionText(const char* name, const X11Extension& extension) {
    return JsonObjectText()
        .String("name", name)
        .Bool("present", extension.present)
        .Number("major", extension.major)
        .Number("minor", extension.minor)
        .Bool("suffices", extension.suffices)
        .Text();
}

std::string ExtensionsText(const X11Report& x11) {
    return ListText({ExtensionText("Composite", x11.composite), ExtensionText("Damage", x11.damage),
                     ExtensionText("XFixes", x11.xfixes), ExtensionText("MIT-SHM", x11.shm),
                     ExtensionText("RandR", x11.randr), ExtensionText("Shape", x11.shape),
                     ExtensionText("X-Resource", x11.xres), ExtensionText("XInput", x11.xinput)});
}

std::string OutputsText(const X11Report& x11) {
    std::vector<std::string> monitors;
    for (const platform::X11Monitor& each : x11.monitors)
        monitors.push_back(JsonObjectText()
                               .String("name", each.name)
                               .Number("x", each.x)
                               .Number("y", each.y)
                               .Number("width", each.width)
                               .Number("height", each.height)
                               .Bool("primary", each.primary)
                               .Text());
    return ListText(monitors);
}

std::string NameOrNull(bool isThere, const std::string& name) {
    return isThere ? JsonStringText(name) : "null";
}

std::string X11Text(const X11Report& x11) {
    Members members = {{"display", JsonStringText(x11.display)},
                       {"obstacle", JsonStringText(ObstacleWord(x11.obstacle))},
                       {"over_network", x11.overNetwork ? "true" : "false"}};
    if (x11.obstacle == X11Obstacle::None) {
        const Members connected = {{"vendor", JsonStringText(x11.vendor)},
                                   {"release", std::to_string(x11.release)},
                                   {"width", std::to_string(x11.width)},
                                   {"height", std::to_string(x11.height)},
                                   {"depth", std::to_string(x11.depth)},
                                   {"depth_readable", x11.depthReadable ? "true" : "false"},
                                   {"extensions", ExtensionsText(x11)},
                                   {"monitors", OutputsText(x11)},
                                   {"window_manager", NameOrNull(x11.hasWindowManager, x11.windowManager)},
                                   {"compositor", NameOrNull(x11.hasCompositor, x11.compositor)},
                                   {"wayland_bridge", x11.isWaylandBridge ? "true" : "false"}};
        members.insert(members.end(), connected.begin(), connected.end());
    }
    return ObjectText(members);
}

std::string MonitorsText(const platform::DisplayList& displays) {
    std::vector<std::string> monitors;
    for (const platform::DisplayInfo& each : displays)
        monitors.push_back(JsonObjectText()
                               .Number("id", each.id)
                               .String("name", each.productName)
                               .Number("x", each.bounds.origin.x)
                               .Number("y", each.bounds.origin.y)
                               .Number("width", each.bounds.size.width)
                               .Number("height", each.bounds.size.height)
                               .Number("scale", each.scale)
                               .Bool("main", &each == &displays.front())
                               .Text());
    return ListText(monitors);
}

std::string ServerText(const ServerFacts& server, const Diagnosis& diagnosis) {
    return ObjectText({{"name", JsonStringText(server.name)},
                       {"choice", JsonStringText(diagnosis.choice)},
                       {"life", JsonStringText(LifeWord(server.life))},
                       {"monitors", MonitorsText(server.displays)},
                       {"windows", std::to_string(server.windows)},
                       {"windows_on_screen", std::to_string(server.windowsOnScreen)},
                       {"applications", std::to_string(server.applications)}});
}

std::string AbilitiesText(const std::vector<Ability>& abilities) {
    std::vector<std::string> objects;
    for (const Ability& each : abilities) {
        JsonObjectText object;
        object.String("ability", each.key)
            .Bool("works", !each.obstacle.has_value())
            .Bool("needed", each.isNeeded)
            .String("for", each.purpose);
        if (each.obstacle)
            object.String("because", each.obstacle->because).String("remedy", each.obstacle->remedy);
        objects.push_back(object.Text());
    }
    return ListText(objects);
}

std::string HintsText(const std::vector<Hint>& hints) {
    std::vector<std::string> objects;
    objects.reserve(hints.size());
    for (const Hint& each : hints)
        objects.push_back(JsonObjectText()
                              .String("what", each.what)
                              .String("because", each.finding.because)
                              .String("remedy", each.finding.remedy)
                              .Text());
    return ListText(objects);
}

} // namespace

std::string DoctorJson(const DoctorFacts& facts, const Diagnosis& diagnosis) {
    return ObjectText({{"can_share", diagnosis.CanShare() ? "true" : "false"},
                       {"window_server", ServerText(facts.server, diagnosis)},
                       {"environment", EnvironmentText(facts.environment)},
                       {"x11", X11Text(facts.x11)},
                       {"abilities", AbilitiesText(diagnosis.abilities)},
                       {"hints", HintsText(diagnosis.hints)}}) +
           "\n";
}
