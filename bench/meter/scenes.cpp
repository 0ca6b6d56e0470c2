// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/scenes.h"

#include "bench/meter/shared_picture.h"
#include "tests/x11/x11_rig.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <thread>

namespace {

constexpr const char* SCENE_WORD = "--play-scene";
constexpr int ARGUMENTS = 8;
constexpr int READY_MS = 30000;

// ---- In the scene's own process

/// A plain window, as it is where there is no window manager.
xcb_window_t MapWindow(const XLink& link, const xcb_rectangle_t& place, const std::string& title) {
    const xcb_window_t window = xcb_generate_id(link.Get());
    const std::uint32_t background = 0x202830;
    xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, window, link.Root(), place.x, place.y, place.width,
                      place.height, 0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL,
                      &background);
    xcb_change_property(link.Get(), XCB_PROP_MODE_REPLACE, window, XCB_ATOM_WM_NAME, XCB_ATOM_STRING, 8,
                        static_cast<std::uint32_t>(title.size()), title.data());
    xcb_map_window(link.Get(), window);
    return window;
}

void TellReady() {
    std::puts("ready");
    std::fflush(stdout);
}

[[noreturn]] void StandStill() {
    while (true)
        pause();
}

[[noreturn]] void PlayWindows(const XLink& link, const Scene& scene) {
    for (int i = 0; i < scene.windows; ++i) {
        const auto x = static_cast<std::int16_t>(i * 7 % 1000);
        const auto y = static_cast<std::int16_t>(i * 11 % 600);
        MapWindow(link, {x, y, 100, 80}, "a window with a title");
    }
    link.RoundTrip();
    TellReady();
    StandStill();
}

/// Waits for the server each time: a scene that it can't keep up with would pile up.
[[noreturn]] void PlayMotion(const XLink& link, const Scene& scene, xcb_window_t window,
                             xcb_gcontext_t context) {
    using Clock = std::chrono::steady_clock;
    const std::array<SharedPicture, 2> pictures{
        {{link.Get(), scene.width, scene.height}, {link.Get(), scene.width, scene.height}}};
    for (std::uint32_t i = 0; i < pictures.size(); ++i)
        PaintSquares(pictures[i], i + 1);
    const int x = (link.Screen().width_in_pixels - scene.width) / 2;
    const int y = (link.Screen().height_in_pixels - scene.height) / 2;
    const auto period = std::chrono::nanoseconds(std::chrono::seconds(1)) / scene.framesPerSecond;
    Clock::time_point next = Clock::now();
    for (std::size_t frame = 0; link.Works(); ++frame) {
        pictures[frame % pictures.size()].Put(window, context, x, y);
        link.RoundTrip();
        if (frame == 0)
            TellReady();
        next = std::max(next + period, Clock::now());
        std::this_thread::sleep_until(next);
    }
    std::exit(EXIT_FAILURE);
}

[[noreturn]] void Play(const std::string& display, const Scene& scene) {
    const XLink link(display);
    if (!link.Works())
        std::exit(EXIT_FAILURE);
    if (scene.windows > 0)
        PlayWindows(link, scene);
    const std::uint16_t width = link.Screen().width_in_pixels;
    const std::uint16_t height = link.Screen().height_in_pixels;
    const xcb_window_t window = MapWindow(link, {0, 0, width, height}, scene.name);
    const xcb_gcontext_t context = xcb_generate_id(link.Get());
    xcb_create_gc(link.Get(), context, window, 0, nullptr);
    {
        const SharedPicture desktop(link.Get(), width, height);
        PaintSquares(desktop, 0);
        desktop.Put(window, context, 0, 0);
        link.RoundTrip();
    }
    if (scene.framesPerSecond > 0)
        PlayMotion(link, scene, window, context);
    TellReady();
    StandStill();
}

// ---- In the process that measures

class Pipe {
public:
    Pipe() {
        if (pipe2(m_ends.data(), O_CLOEXEC) != 0)
            throw std::runtime_error("no pipe");
    }
    ~Pipe() {
        CloseWriter();
        close(m_ends[0]);
    }
    Pipe(const Pipe&) = delete;
    Pipe& operator=(const Pipe&) = delete;

    int Writer() const { return m_ends[1]; }
    void CloseWriter() {
        if (m_ends[1] >= 0)
            close(m_ends[1]);
        m_ends[1] = -1;
    }
    bool WaitForBytes() const {
        char byte = 0;
        pollfd readable{m_ends[0], POLLIN, 0};
        return poll(&readable, 1, READY_MS) == 1 && read(m_ends[0], &byte, 1) == 1;
    }

private:
    std::array<int, 2> m_ends{{-1, -1}};
};

} // namespace

const std::vector<Scene>& MovingScenes() {
    static const std::vector<Scene> scenes{{"static", 0, 0, 0, 0},
                                           {"typing", 300, 20, 10, 0},
                                           {"video", 1280, 720, 30, 0},
                                           {"full_motion", 1920, 1080, 30, 0}};
    return scenes;
}

Scene SceneOfWindows(int count) {
    return {"windows", 0, 0, 0, count};
}

SceneProcess::SceneProcess(const std::string& display, const Scene& scene) {
    Pipe pipe;
    CChildProcess::Plan plan;
    plan.command = {std::filesystem::read_symlink("/proc/self/exe").string(),
                    SCENE_WORD,
                    display,
                    scene.name,
                    std::to_string(scene.width),
                    std::to_string(scene.height),
                    std::to_string(scene.framesPerSecond),
                    std::to_string(scene.windows)};
    plan.output = pipe.Writer();
    m_process = std::make_unique<CChildProcess>(plan);
    pipe.CloseWriter();
    if (!pipe.WaitForBytes())
        throw std::runtime_error("the scene '" + scene.name + "' is not played");
}

std::optional<int> PlaySceneIfAsked(int argc, const char* const* argv) {
    if (argc != ARGUMENTS || std::string(argv[1]) != SCENE_WORD)
        return std::nullopt;
    try {
        Play(argv[2],
             {argv[3], std::stoi(argv[4]), std::stoi(argv[5]), std::stoi(argv[6]), std::stoi(argv[7])});
    } catch (const std::exception&) {
        return EXIT_FAILURE;
    }
}
