// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_desk.h"

#include <cstddef>
#include <stdexcept>

namespace {

constexpr std::size_t MOST_WINDOWS = 6;
constexpr std::size_t FEWEST_WINDOWS = 2;

XServerOptions ServerFor(const SoakOptions& options) {
    XServerOptions server;
    server.width = 2 * options.width;
    server.height = options.height;
    return server;
}

} // namespace

SoakDesk::SoakDesk(const SoakOptions& options)
    : m_width(options.width),
      m_height(options.height),
      m_random(options.seed),
      m_server(ServerFor(options)),
      m_shown(m_server, "Shown"),
      m_guest(m_server, "Guest"),
      m_stranger(m_server, "Stranger") {
    SplitScreen();
    OpenWindows();
}

std::vector<std::string> SoakDesk::Programs() {
    return {"Xvfb", "xrandr"};
}

SoakScene SoakDesk::Scene() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_scene;
}

bool SoakDesk::Due::Comes() {
    if (Clock::now() < next)
        return false;
    Begin();
    return true;
}

void SoakDesk::Step() {
    if (m_turn.Comes())
        Turn();
    if (m_paint.Comes())
        Paint();
    if (!m_isLively) {
        m_isCalm = m_isCalm || m_settle.Comes();
        return;
    }
    if (m_stir.Comes())
        Stir();
    if (m_move.Comes())
        MoveShown();
    if (m_visit.Comes())
        Visit();
}

// ---- Setting up

void SoakDesk::SplitScreen() const {
    const std::string size = std::to_string(m_width) + "/200x" + std::to_string(m_height) + "/150+";
    const std::string left = size + "0+0";
    const std::string right = size + std::to_string(m_width) + "+0";
    if (!XProgram::Run(m_server, {"xrandr", "--setmonitor", "left", left, "screen"}) ||
        !XProgram::Run(m_server, {"xrandr", "--setmonitor", "right", right, "none"}))
        throw std::runtime_error("the screen can't be split into two monitors");
}

void SoakDesk::OpenWindows() {
    SoakScene scene;
    scene.shown = static_cast<unsigned>(m_shown.Pid());
    scene.guest = static_cast<unsigned>(m_guest.Pid());
    scene.stranger = static_cast<unsigned>(m_stranger.Pid());
    for (int i = 0; i < 2; ++i)
        scene.shownWindows[static_cast<std::size_t>(i)] =
            Create(m_shown, "shown" + std::to_string(i),
                   PlaceText(m_width / 8 + i * m_width, m_height / 8, m_width / 2, m_height / 2) + " 00ff00");
    scene.guestWindow =
        Create(m_guest, "guest", PlaceText(m_width / 2, m_height / 2, m_width / 3, m_height / 3) + " 0000ff");
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_scene = scene;
    }
    while (m_windows.size() < FEWEST_WINDOWS)
        Open();
}

// ---- What happens

void SoakDesk::Turn() {
    m_isLively = !m_isLively;
    m_isCalm = false;
    m_settle.Begin();
    if (!m_isLively)
        m_visitor.reset();
}

void SoakDesk::Paint() {
    static constexpr const char* COLOURS[] = {"00ff00", "00e000", "00c000"};
    ++m_paints;
    Tell(m_shown, "recolour shown" + std::to_string(m_paints % 2) + " " + COLOURS[m_paints / 2 % 3]);
}

void SoakDesk::MoveShown() {
    const int monitor = Random(2);
    const int x = monitor * m_width + Random(m_width / 4);
    Tell(m_shown, "place shown" + std::to_string(monitor) + " " +
                      PlaceText(x, Random(m_height / 4), m_width / 2 + Random(m_width / 8), m_height / 2));
}

void SoakDesk::Visit() {
    if (m_visitor != nullptr) {
        m_visitor.reset();
        return;
    }
    m_visitor = std::make_unique<X11Client>(m_server, "Visitor");
    Create(*m_visitor, "visit", AnyPlace() + " 808000");
    ++m_visits;
}

void SoakDesk::Stir() {
    if (m_windows.size() < FEWEST_WINDOWS)
        return Open();
    const std::string window =
        m_windows[static_cast<std::size_t>(Random(static_cast<int>(m_windows.size())))].name;
    switch (Random(8)) {
        case 0:
        case 1:
            return m_windows.size() < MOST_WINDOWS ? Open() : Close();
        case 2:
            return Close();
        case 3:
            return Tell(m_stranger, "raise " + window);
        case 4:
            return Tell(m_stranger, "lower " + window);
        case 5:
            return Tell(m_stranger, "unmap " + window);
        case 6:
            return Tell(m_stranger, "map " + window);
        default:
            return Tell(m_stranger, "place " + window + " " + AnyPlace());
    }
}

void SoakDesk::Open() {
    const std::string name = "w" + std::to_string(++m_opened);
    m_windows.push_back({name, Create(m_stranger, name, AnyPlace() + " ff0000")});
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_scene.strangersWindows.push_back(m_windows.back().id);
}

/// The oldest one.
void SoakDesk::Close() {
    Tell(m_stranger, "destroy " + m_windows.front().name);
    m_windows.erase(m_windows.begin());
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_scene.strangersWindows.erase(m_scene.strangersWindows.begin());
}

// ---- Telling

void SoakDesk::Tell(X11Client& application, const std::string& line) const {
    if (!application.Tell(line))
        throw std::runtime_error("an application doesn't do it: " + line);
}

unsigned SoakDesk::Create(X11Client& application, const std::string& name, const std::string& rest) const {
    const auto id = application.Create(name, rest);
    if (!id)
        throw std::runtime_error("an application doesn't open the window " + name);
    // As a window manager does: only what is managed makes an application that people know.
    if (!application.SetWords(name, "WM_STATE", "WM_STATE", {1, 0}))
        throw std::runtime_error("an application doesn't describe the window " + name);
    return *id;
}

std::string SoakDesk::AnyPlace() {
    const int width = m_width / 8 + Random(m_width / 4);
    const int height = m_height / 8 + Random(m_height / 4);
    return PlaceText(Random(2 * m_width - width), Random(m_height - height), width, height);
}

std::string SoakDesk::PlaceText(int x, int y, int width, int height) const {
    return std::to_string(x) + " " + std::to_string(y) + " " + std::to_string(width) + " " +
           std::to_string(height);
}
