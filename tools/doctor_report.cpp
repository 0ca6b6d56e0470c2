// SPDX-License-Identifier: Apache-2.0
#include "tools/doctor_report.h"

#include "tools/text_table.h"

#include <array>
#include <cstddef>
#include <cstdio>
#include <sstream>
#include <utility>
#include <vector>

namespace {

using platform::Life;
using platform::X11Extension;
using platform::X11Obstacle;
using platform::X11Report;
using Rows = std::vector<std::vector<std::string>>;

constexpr std::size_t LINE_LENGTH = 100;
constexpr std::size_t INDENT = 2;
constexpr std::size_t DEEP_INDENT = 6;

/// Words in lines of that length, where words allow it, each line so far from the left.
std::string Wrapped(const std::string& text, std::size_t indent) {
    std::string lines;
    std::string line;
    std::istringstream words(text);
    for (std::string word; words >> word;) {
        if (!line.empty() && indent + line.size() + 1 + word.size() > LINE_LENGTH) {
            lines += std::string(indent, ' ') + line + "\n";
            line.clear();
        }
        line += (line.empty() ? "" : " ") + word;
    }
    return lines + std::string(indent, ' ') + line + "\n";
}

/// The lines of a table, each so far from the left; the first row is one as all others.
std::vector<std::string> TableLines(const Rows& rows) {
    TextTable table({rows.front()});
    for (std::size_t i = 1; i < rows.size(); ++i)
        table.AddRow(rows[i]);
    std::vector<std::string> lines;
    std::istringstream text(table.Text());
    for (std::string line; std::getline(text, line);)
        lines.push_back(std::string(INDENT, ' ') + line + "\n");
    return lines;
}

std::string Section(const std::string& heading, const Rows& rows) {
    std::string text = "\n" + heading + "\n";
    for (const std::string& line : TableLines(rows))
        text += line;
    return text;
}

std::string Sentence(const Finding& finding) {
    return "because " + finding.because + (finding.remedy.empty() ? "" : "; mend it by " + finding.remedy) +
           ".";
}

std::string Number(float value) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%g", static_cast<double>(value));
    return text.data();
}

std::string ServerOf(const X11Report& x11) {
    return x11.vendor + " " + std::to_string(x11.release);
}

// ---- What is there

std::string ServerName(const DoctorFacts& facts) {
    const std::string& name = facts.server.name;
    if (name != "x11")
        return name;
    const bool isKnown = facts.x11.obstacle == X11Obstacle::None;
    return "X11, display " + (facts.x11.display.empty() ? "not named" : facts.x11.display) +
           (isKnown ? " (" + ServerOf(facts.x11) + ")" : "");
}

std::string LifeWords(const ServerFacts& server) {
    if (server.name == "none" || server.life == Life::Alive)
        return {};
    return server.life == Life::Stalled ? ", not answering" : ", lost";
}

std::string OrNotSet(const std::string& value, const std::string& standIn = {}) {
    if (!value.empty())
        return value;
    return standIn.empty() ? "not set" : "not set, which means " + standIn;
}

std::string DebugFileWords(DebugFileState state) {
    switch (state) {
        case DebugFileState::Absent:
            return "none";
        case DebugFileState::Counts:
            return "share_config.json is there and counts";
        case DebugFileState::Refused:
            break;
    }
    return "share_config.json is there and refused";
}

std::string EnvironmentSection(const EnvironmentFacts& environment) {
    return Section("Environment",
                   {{"SCREENSHARE_PLATFORM", OrNotSet(environment.platform, "auto")},
                    {"DISPLAY", OrNotSet(environment.display)},
                    {"WAYLAND_DISPLAY", OrNotSet(environment.waylandDisplay)},
                    {"XDG_SESSION_TYPE", OrNotSet(environment.sessionType)},
                    {"SCREENSHARE_DEBUG_DIR",
                     OrNotSet(environment.debugFolder, EnvironmentFacts().DebugFolderInForce())},
                    {"Debug file", DebugFileWords(environment.debugFile)}});
}

std::string VersionWords(const X11Extension& extension) {
    if (!extension.present)
        return "missing";
    return std::to_string(extension.major) + "." + std::to_string(extension.minor) +
           (extension.suffices ? "" : " (too old)");
}

std::string NameOr(bool isThere, const std::string& name) {
    if (!isThere)
        return "none";
    return name.empty() ? "one without a name" : name;
}

std::string MonitorNames(const X11Report& x11) {
    if (!x11.randr.suffices)
        return "not told without RandR 1.5";
    std::string names;
    for (const platform::X11Monitor& each : x11.monitors)
        names += (names.empty() ? "" : ", ") + each.name + " " + std::to_string(each.width) + "x" +
                 std::to_string(each.height) + "+" + std::to_string(each.x) + "+" + std::to_string(each.y);
    return names.empty() ? "none" : names;
}

/// Nothing where the environment names no display.
std::string X11Section(const DoctorFacts& facts) {
    const X11Report& x11 = facts.x11;
    if (x11.obstacle == X11Obstacle::NoName)
        return {};
    const std::string heading =
        "X display " + x11.display + (facts.server.name == "x11" ? "" : ", not in use");
    if (x11.obstacle != X11Obstacle::None)
        return "\n" + heading + "\n" +
               Wrapped("It cannot be looked at: " + X11ObstacleFinding(x11).because + ".", INDENT);
    return Section(
        heading,
        {{"Server", ServerOf(x11)},
         {"Screen", std::to_string(x11.width) + "x" + std::to_string(x11.height) + ", depth " +
                        std::to_string(x11.depth)},
         {"Monitors", MonitorNames(x11)},
         {"Window manager", NameOr(x11.hasWindowManager, x11.windowManager)},
         {"Compositor", NameOr(x11.hasCompositor, x11.compositor)},
         {"Extensions", "Composite " + VersionWords(x11.composite) + ", Damage " + VersionWords(x11.damage) +
                            ", XFixes " + VersionWords(x11.xfixes) + ", MIT-SHM " + VersionWords(x11.shm) +
                            ","},
         {" ", "RandR " + VersionWords(x11.randr) + ", Shape " + VersionWords(x11.shape) + ", X-Resource " +
                   VersionWords(x11.xres) + ", XInput " + VersionWords(x11.xinput)}});
}

/// What the library makes of the desktop. Nothing when there is none.
std::string DesktopSection(const ServerFacts& server) {
    if (server.name == "none" || server.life == Life::Lost)
        return {};
    Rows rows = {{"MONITOR", "POSITION", "SIZE", "SCALE", "NAME"}};
    for (const platform::DisplayInfo& each : server.displays)
        rows.push_back({std::to_string(each.id),
                        Number(each.bounds.origin.x) + "," + Number(each.bounds.origin.y),
                        Number(each.bounds.size.width) + "x" + Number(each.bounds.size.height),
                        Number(each.scale), each.productName});
    return Section("Desktop", rows) + "  Windows: " + std::to_string(server.windows) + " (" +
           std::to_string(server.windowsOnScreen) +
           " on the screen). Applications: " + std::to_string(server.applications) + ".\n";
}

// ---- What it means

/// A reason is given once and not again where the next ability has the same.
std::string AbilitySection(const std::vector<Ability>& abilities) {
    Rows rows;
    const std::optional<Finding>* before = nullptr;
    std::vector<std::string> reasons;
    for (const Ability& each : abilities) {
        const bool isRepeated = before != nullptr && each.obstacle && *before == each.obstacle;
        const char* const answer = isRepeated ? "no, likewise" : "no";
        rows.push_back({each.name, each.obstacle ? answer : "yes", "for " + each.purpose});
        reasons.push_back(each.obstacle && !isRepeated ? Wrapped(Sentence(*each.obstacle), DEEP_INDENT) : "");
        before = &each.obstacle;
    }
    std::string text = "\nWhat works\n";
    const std::vector<std::string> lines = TableLines(rows);
    for (std::size_t i = 0; i < lines.size(); ++i)
        text += lines[i] + reasons[i];
    return text;
}

std::string HintSection(const std::vector<Hint>& hints) {
    std::string text = hints.empty() ? "" : "\nGood to know\n";
    for (const Hint& each : hints)
        text += Wrapped(each.what + ",", INDENT) + Wrapped(Sentence(each.finding), DEEP_INDENT);
    return text;
}

std::string VerdictSection(const Diagnosis& diagnosis) {
    if (diagnosis.CanShare())
        return "\nVerdict: all that sharing monitors and windows needs is there.\n";
    std::string missing;
    for (const Ability& each : diagnosis.abilities) {
        if (each.isNeeded && each.obstacle)
            missing += (missing.empty() ? "" : ", ") + each.name;
    }
    return "\nVerdict: something that sharing needs is missing: " + missing + ".\n";
}

} // namespace

std::string DoctorText(const DoctorFacts& facts, const Diagnosis& diagnosis) {
    return "Window server: " + ServerName(facts) + LifeWords(facts.server) + "\n" +
           Wrapped(diagnosis.choice, INDENT) + EnvironmentSection(facts.environment) + X11Section(facts) +
           DesktopSection(facts.server) + AbilitySection(diagnosis.abilities) + HintSection(diagnosis.hints) +
           VerdictSection(diagnosis);
}
