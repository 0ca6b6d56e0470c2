// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_subject.h"

#include "platform/simulated/scene.h"
#include "platform/simulated/simulated_window_server.h"
#include "platform/utf8.h"
#include "tools/desktop_state.h"
#include "tools/doctor_command.h"
#include "tools/doctor_diagnosis.h"

#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <iterator>
#include <utility>

namespace {

std::string InQuotes(const std::string& name) {
    return "\"" + platform::WithoutControls(name) + "\"";
}

std::string WindowWords(const platform::CGWindowDescription& window) {
    const std::string id = " (id " + std::to_string(window.kCGWindowNumber) + ")";
    if (window.kCGWindowName.empty())
        return "the window" + id + " of " + InQuotes(window.kCGWindowOwnerName);
    return "the window " + InQuotes(window.kCGWindowName) + id;
}

std::string MonitorWords(const ListedMonitor& monitor) {
    return "monitor " + std::to_string(monitor.id) + " " + InQuotes(monitor.name);
}

const platform::CGWindowDescription* FindListed(const std::vector<platform::CGWindowDescription>& windows,
                                                unsigned id) {
    const auto found = std::find_if(windows.begin(), windows.end(),
                                    [id](const auto& window) { return window.kCGWindowNumber == id; });
    return found != windows.end() ? &*found : nullptr;
}

/// 0 when it can't be told.
pid_t ParentOf(pid_t pid) {
    std::ifstream file("/proc/" + std::to_string(pid) + "/stat");
    const std::string text{std::istreambuf_iterator<char>(file), {}};
    // "PID (NAME) STATE PARENT ...", where the name may hold anything.
    const std::size_t nameEnd = text.rfind(") ");
    return nameEnd != std::string::npos && text.size() > nameEnd + 4 ? std::atoi(text.c_str() + nameEnd + 4)
                                                                     : 0;
}

/// This process and those that it was started from.
std::vector<unsigned> OwnProcesses() {
    std::vector<unsigned> processes;
    for (pid_t pid = getpid(); pid > 1; pid = ParentOf(pid))
        processes.push_back(static_cast<unsigned>(pid));
    return processes;
}

bool Meet(const platform::CGRect& one, const platform::CGRect& other) {
    return one.origin.x < other.origin.x + other.size.width &&
           other.origin.x < one.origin.x + one.size.width &&
           one.origin.y < other.origin.y + other.size.height &&
           other.origin.y < one.origin.y + one.size.height;
}

bool IsOrdinary(const platform::CGWindowDescription& window) {
    return window.kCGWindowLayer == platform::CGWindowLevelForKey(platform::kCGNormalWindowLevelKey) &&
           window.kCGWindowAlpha > 0;
}

const platform::CGWindowDescription* FrontmostOf(const std::vector<platform::CGWindowDescription>& windows,
                                                 const platform::CGRect& bounds) {
    const std::vector<unsigned> own = OwnProcesses();
    const auto found = std::find_if(windows.begin(), windows.end(), [&](const auto& window) {
        return IsOrdinary(window) && Meet(window.kCGWindowBounds, bounds) &&
               !Contains(own, static_cast<unsigned>(window.kCGWindowOwnerPID));
    });
    return found != windows.end() ? &*found : nullptr;
}

std::string DesktopWords() {
    const char* const display = std::getenv("DISPLAY");
    const bool isX11 = std::string(platform::CurrentWindowServer()->Name()) == "x11";
    return isX11 && display != nullptr ? "your X display " + platform::WithoutControls(display)
                                       : "your desktop";
}

} // namespace

SceneInForce::SceneInForce() {
    platform::DemoScene scene = platform::MakeDemoScene();
    m_shared = static_cast<unsigned>(scene.shared);
    m_secret = scene.secret;
    m_former = platform::ReplaceWindowServer(
        std::make_shared<platform::SimulatedWindowServer>(std::move(scene.desktop)));
}

SceneInForce::~SceneInForce() {
    platform::ReplaceWindowServer(m_former);
}

DemoSubject SceneInForce::Subject() const {
    const std::vector<platform::CGWindowDescription> windows = ListWindows();
    DemoSubject subject;
    subject.isScene = true;
    subject.request.apps = {m_shared};
    subject.monitors = ListMonitors();
    const auto shared = std::find_if(windows.begin(), windows.end(), [this](const auto& window) {
        return static_cast<unsigned>(window.kCGWindowOwnerPID) == m_shared;
    });
    if (shared != windows.end())
        subject.shared = "the application " + InQuotes(shared->kCGWindowOwnerName) + ", with its two windows";
    if (const platform::CGWindowDescription* const secret = FindListed(windows, m_secret); secret != nullptr)
        subject.keptOut = WindowWords(*secret) + " of another application";
    return subject;
}

std::optional<std::string> WhyScene(const DemoOptions& options) {
    const bool isSimulated = std::string(platform::CurrentWindowServer()->Name()) == "simulated";
    if (options.usesScene || isSimulated)
        return "As asked for, nothing is captured of a real desktop";
    const Diagnosis diagnosis = Diagnose(GatherDoctorFacts());
    for (const Ability& ability : diagnosis.abilities) {
        if (ability.isNeeded && ability.obstacle)
            return "No X display can be captured here: " + ability.obstacle->because +
                   " (screenshare doctor tells more)";
    }
    return std::nullopt;
}

WriteResult ChooseOnDesktop(const DemoOptions& options, DemoSubject& subject) {
    if (options.excludedWindow)
        subject.request.excludedWindows = {*options.excludedWindow};
    const DesktopLook look;
    if (const std::string misfit = CompleteRequest(subject.request); !misfit.empty()) {
        const std::string problem = look.ProblemSince();
        return WriteFailure{EXIT_CODE_FAILED, problem.empty() ? misfit : problem};
    }
    const std::vector<ListedMonitor> monitors = ListMonitors();
    const std::vector<platform::CGWindowDescription> windows = ListWindows();
    if (monitors.empty())
        return WriteFailure{EXIT_CODE_FAILED, "there is no monitor to share"};
    subject.monitors = {monitors.front()};
    subject.place = "This is " + DesktopWords() + ".";
    subject.shared = MonitorWords(monitors.front());
    const platform::CGWindowDescription* const keptOut = options.excludedWindow
                                                             ? FindListed(windows, *options.excludedWindow)
                                                             : FrontmostOf(windows, monitors.front().bounds);
    if (keptOut == nullptr) {
        subject.note =
            "No window is kept out: there is no ordinary one here but what this runs in. Open "
            "another one, or name one with --exclude-window.";
        return std::nullopt;
    }
    subject.request.excludedWindows = {keptOut->kCGWindowNumber};
    subject.keptOut = WindowWords(*keptOut);
    return std::nullopt;
}
