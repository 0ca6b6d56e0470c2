// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"

#include "util/cm_trace.h"

#include <algorithm>
#include <utility>

namespace platform {

namespace {

/// The last one; one without a name where there is none.
template <class T>
T& LastOf(std::vector<T>& things, const char* check) {
    if (things.empty()) {
        CmReportFailedCheck(check);
        things.emplace_back();
    }
    return things.back();
}

} // namespace

SimulatedDisplay& Scene::LastDisplay() {
    return LastOf(m_desktop.displays, "a scene names a display before it says something of it");
}

ApplicationInfo& Scene::LastApp() {
    return LastOf(m_desktop.applications, "a scene names an application before it says something of it");
}

SimulatedWindow& Scene::LastWindow() {
    return LastOf(m_windows, "a scene names a window before it says something of it");
}

// ---- Displays

Scene& Scene::Display(float x, float y, float width, float height) {
    CGDirectDisplayID last = 0;
    for (const SimulatedDisplay& display : m_desktop.displays)
        last = std::max(last, display.id);
    SimulatedDisplay& display = m_desktop.displays.emplace_back();
    display.id = last + 1;
    display.bounds = {{x, y}, {width, height}};
    return *this;
}

Scene& Scene::DisplayId(CGDirectDisplayID id) {
    LastDisplay().id = id;
    return *this;
}

Scene& Scene::Scale(float scale) {
    LastDisplay().scale = scale;
    return *this;
}

Scene& Scene::Named(std::string name) {
    LastDisplay().name = std::move(name);
    return *this;
}

Scene& Scene::Reserving(SimulatedEdges edges) {
    LastDisplay().reserved = edges;
    return *this;
}

Scene& Scene::Background(std::uint32_t rgb) {
    return Background(SimulatedContent::Colour(rgb));
}

Scene& Scene::Background(SimulatedContent content) {
    LastDisplay().background = std::move(content);
    return *this;
}

// ---- Applications

Scene& Scene::App(pid_t pid, std::string name) {
    ApplicationInfo& application = m_desktop.applications.emplace_back();
    application.pid = pid;
    application.fileName = name;
    application.name = std::move(name);
    return *this;
}

Scene& Scene::FileName(std::string fileName) {
    LastApp().fileName = std::move(fileName);
    return *this;
}

Scene& Scene::Kind(ApplicationKind kind) {
    LastApp().kind = kind;
    return *this;
}

Scene& Scene::BackgroundOnly() {
    LastApp().backgroundOnly = true;
    return *this;
}

// ---- Windows

Scene& Scene::Window(CGWindowID id) {
    constexpr std::uint32_t GREY = 0x808080;
    SimulatedWindow& window = m_windows.emplace_back();
    window.info.id = id;
    window.content = SimulatedContent::Colour(GREY);
    if (!m_desktop.applications.empty())
        window.info.owner = m_desktop.applications.back().pid;
    return *this;
}

Scene& Scene::Of(pid_t pid) {
    LastWindow().info.owner = pid;
    return *this;
}

Scene& Scene::At(float x, float y, float width, float height) {
    LastWindow().info.frame = {{x, y}, {width, height}};
    return *this;
}

Scene& Scene::Colour(std::uint32_t rgb) {
    return Showing(SimulatedContent::Colour(rgb));
}

Scene& Scene::Showing(SimulatedContent content) {
    LastWindow().content = std::move(content);
    return *this;
}

Scene& Scene::Unpainted() {
    return Showing(SimulatedContent());
}

Scene& Scene::Titled(std::string title) {
    LastWindow().info.title = std::move(title);
    return *this;
}

Scene& Scene::Level(int level) {
    LastWindow().info.level = level;
    return *this;
}

Scene& Scene::Alpha(float alpha) {
    LastWindow().info.alpha = alpha;
    return *this;
}

Scene& Scene::Sharing(SharingState sharing) {
    LastWindow().info.sharing = sharing;
    return *this;
}

Scene& Scene::Unshared() {
    return Sharing(SharingState::None);
}

Scene& Scene::OffScreen() {
    LastWindow().info.onScreen = false;
    return *this;
}

Scene& Scene::Shadow(float width) {
    LastWindow().shadow = {width, width, width, width};
    return *this;
}

Scene& Scene::Format(PixelFormat format, std::size_t rowGap) {
    LastWindow().format = format;
    LastWindow().rowGap = rowGap;
    return *this;
}

Scene& Scene::StackedAsNamed() {
    m_asNamed = true;
    return *this;
}

// ---- Pointer

Scene& Scene::Pointer(float x, float y) {
    m_desktop.pointer = CGPoint{x, y};
    return *this;
}

Scene& Scene::Cursor(SimulatedCursor cursor) {
    m_desktop.cursor = std::move(cursor);
    return *this;
}

// ---- The end

SimulatedDesktop Scene::Build() const {
    SimulatedDesktop desktop = m_desktop;
    for (const SimulatedWindow& window : m_windows) {
        if (m_asNamed)
            desktop.windows.insert(desktop.windows.begin(), window);
        else
            PutAtFrontOfItsLevel(desktop, window);
    }
    return desktop;
}

std::shared_ptr<SimulatedWindowServer> Scene::Serve() const {
    return std::make_shared<SimulatedWindowServer>(Build());
}

} // namespace platform
