// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/scenes.h"

#include "bench/meter/shared_picture.h"
#include "tests/x11/x11_rig.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>
#include <xcb/composite.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <stdexcept>
#include <thread>

namespace {

constexpr const char* SCENE_WORD = "--play-scene";
constexpr int ARGUMENTS = 11;
constexpr int READY_MS = 30000;

// ---- In the scene's own process

/// The pointer that most desktops have.
xcb_cursor_t ArrowOf(const XLink& link) {
    constexpr std::uint16_t LEFT_PTR = 68; // in the font of that name, and its mask behind it
    const std::string name = "cursor";
    const xcb_font_t font = xcb_generate_id(link.Get());
    const xcb_cursor_t cursor = xcb_generate_id(link.Get());
    xcb_open_font(link.Get(), font, static_cast<std::uint16_t>(name.size()), name.data());
    xcb_create_glyph_cursor(link.Get(), cursor, font, font, LEFT_PTR, LEFT_PTR + 1, 0, 0, 0, 0xFFFF, 0xFFFF,
                            0xFFFF);
    return cursor;
}

/// A plain window, as it is where there is no window manager; marked as one that is shown, as a window
/// manager does, because some list no others.
xcb_window_t MapWindow(const XLink& link, const xcb_rectangle_t& place, const std::string& title) {
    const xcb_window_t window = xcb_generate_id(link.Get());
    const std::array<std::uint32_t, 3> values{0x202830, XCB_EVENT_MASK_EXPOSURE, ArrowOf(link)};
    xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, window, link.Root(), place.x, place.y, place.width,
                      place.height, 0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT,
                      XCB_CW_BACK_PIXEL | XCB_CW_EVENT_MASK | XCB_CW_CURSOR, values.data());
    xcb_change_property(link.Get(), XCB_PROP_MODE_REPLACE, window, XCB_ATOM_WM_NAME, XCB_ATOM_STRING, 8,
                        static_cast<std::uint32_t>(title.size()), title.data());
    const std::array<std::uint32_t, 2> shown{1, 0};
    const xcb_atom_t state = link.Atom("WM_STATE");
    xcb_change_property(link.Get(), XCB_PROP_MODE_REPLACE, window, state, state, 32, shown.size(),
                        shown.data());
    xcb_map_window(link.Get(), window);
    return window;
}

void TellReady(xcb_window_t window) {
    std::printf("%u\n", window);
    std::fflush(stdout);
}

/// What the windows' events ask for.
bool IsExposure(xcb_generic_event_t* event) {
    const bool is = (event->response_type & 0x7F) == XCB_EXPOSE;
    std::free(event);
    return is;
}

[[noreturn]] void PlayWindows(const XLink& link, const Scene& scene) {
    xcb_window_t hindmost = 0;
    for (int i = 0; i < scene.windows; ++i) {
        const auto x = static_cast<std::int16_t>(i * 7 % 1000);
        const auto y = static_cast<std::int16_t>(i * 11 % 600);
        const xcb_window_t window = MapWindow(link, {x, y, 100, 80}, "a window with a title");
        hindmost = i == 0 ? window : hindmost;
    }
    link.RoundTrip();
    TellReady(hindmost);
    while (xcb_generic_event_t* const event = xcb_wait_for_event(link.Get()))
        std::free(event); // the server paints all that they show
    std::exit(EXIT_FAILURE);
}

xcb_rectangle_t PlaceOf(const XLink& link, const Scene& scene) {
    if (scene.windowWidth > 0)
        return {0, 0, static_cast<std::uint16_t>(scene.windowWidth),
                static_cast<std::uint16_t>(scene.windowHeight)};
    return {0, 0, link.Screen().width_in_pixels, link.Screen().height_in_pixels};
}

/// A window, and what is painted in it. Like any program it paints anew what the
/// server asks for, as it does of covered windows once somebody wants to see all of them.
class Stage {
public:
    Stage(const XLink& link, const Scene& scene)
        : m_link(link),
          m_size(PlaceOf(link, scene)),
          m_window(MapWindow(link, m_size, scene.name)),
          m_context(xcb_generate_id(link.Get())),
          m_desktop(link.Get(), m_size.width, m_size.height) {
        xcb_create_gc(link.Get(), m_context, m_window, 0, nullptr);
        PaintSquares(m_desktop, 0);
        Paint();
        if (scene.covered)
            Cover();
        link.RoundTrip();
    }

    [[noreturn]] void StandStill() const {
        TellReady(m_window);
        while (xcb_generic_event_t* const event = xcb_wait_for_event(m_link.Get())) {
            if (IsExposure(event))
                Paint();
        }
        std::exit(EXIT_FAILURE);
    }

    /// Waits for the server each time: a scene that it can't keep up with would pile up.
    [[noreturn]] void Move(const Scene& scene) const {
        using Clock = std::chrono::steady_clock;
        const std::array<SharedPicture, 2> pictures{
            {{m_link.Get(), scene.width, scene.height}, {m_link.Get(), scene.width, scene.height}}};
        for (std::uint32_t i = 0; i < pictures.size(); ++i)
            PaintSquares(pictures[i], i + 1);
        const int x = (m_size.width - scene.width) / 2;
        const int y = (m_size.height - scene.height) / 2;
        const auto period = std::chrono::nanoseconds(std::chrono::seconds(1)) / scene.framesPerSecond;
        Clock::time_point next = Clock::now();
        for (std::size_t frame = 0; m_link.Works(); ++frame) {
            PaintWhatIsAskedFor();
            pictures[frame % pictures.size()].Put(m_window, m_context, x, y);
            m_link.RoundTrip();
            if (frame == 0)
                TellReady(m_window);
            next = std::max(next + period, Clock::now());
            std::this_thread::sleep_until(next);
        }
        std::exit(EXIT_FAILURE);
    }

private:
    /// The window gets a storage of its own first, as all have under a compositor: else what is painted
    /// behind the cover costs nothing until somebody looks, and much from then on.
    void Cover() const {
        xcb_composite_query_version(m_link.Get(), 0, 4);
        xcb_composite_redirect_window(m_link.Get(), m_window, XCB_COMPOSITE_REDIRECT_AUTOMATIC);
        MapWindow(m_link, m_size, "in front");
    }

    void Paint() const {
        m_desktop.Put(m_window, m_context, 0, 0);
        xcb_flush(m_link.Get());
    }

    void PaintWhatIsAskedFor() const {
        bool asked = false;
        while (xcb_generic_event_t* const event = xcb_poll_for_event(m_link.Get()))
            asked = IsExposure(event) || asked;
        if (asked)
            Paint();
    }

    const XLink& m_link;
    const xcb_rectangle_t m_size;
    const xcb_window_t m_window;
    const xcb_gcontext_t m_context;
    const SharedPicture m_desktop;
};

[[noreturn]] void Play(const std::string& display, const Scene& scene) {
    const XLink link(display);
    if (!link.Works())
        std::exit(EXIT_FAILURE);
    if (scene.windows > 0)
        PlayWindows(link, scene);
    const Stage stage(link, scene);
    if (scene.framesPerSecond > 0)
        stage.Move(scene);
    stage.StandStill();
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
    /// Empty when none comes in time.
    std::string ReadLine() const {
        std::string line;
        pollfd readable{m_ends[0], POLLIN, 0};
        char byte = 0;
        while (poll(&readable, 1, READY_MS) == 1 && read(m_ends[0], &byte, 1) == 1) {
            if (byte == '\n')
                return line;
            line += byte;
        }
        return {};
    }

private:
    std::array<int, 2> m_ends{{-1, -1}};
};

} // namespace

const std::vector<Scene>& MovingScenes() {
    static const std::vector<Scene> scenes{{"static", 0, 0, 0, 0, false, 0, 0},
                                           {"typing", 300, 20, 10, 0, false, 0, 0},
                                           {"video", 1280, 720, 30, 0, false, 0, 0},
                                           {"full_motion", 1920, 1080, 30, 0, false, 0, 0}};
    return scenes;
}

Scene SceneOfChange(double part, int desktopWidth, int desktopHeight) {
    if (!(part > 0))
        return MovingScenes().front();
    const double side = std::sqrt(part);
    return {"change",
            static_cast<int>(std::lround(desktopWidth * side)),
            static_cast<int>(std::lround(desktopHeight * side)),
            30,
            0,
            false,
            0,
            0};
}

Scene SceneOfWindows(int count) {
    return {"windows", 0, 0, 0, count, false, 0, 0};
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
                    std::to_string(scene.windows),
                    std::to_string(static_cast<int>(scene.covered)),
                    std::to_string(scene.windowWidth),
                    std::to_string(scene.windowHeight)};
    plan.output = pipe.Writer();
    m_process = std::make_unique<CChildProcess>(plan);
    pipe.CloseWriter();
    const std::string window = pipe.ReadLine();
    if (window.empty())
        throw std::runtime_error("the scene '" + scene.name + "' is not played");
    m_window = static_cast<unsigned>(std::stoul(window));
}

std::optional<int> PlaySceneIfAsked(int argc, const char* const* argv) {
    if (argc != ARGUMENTS || std::string(argv[1]) != SCENE_WORD)
        return std::nullopt;
    try {
        Play(argv[2], {argv[3], std::stoi(argv[4]), std::stoi(argv[5]), std::stoi(argv[6]),
                       std::stoi(argv[7]), std::stoi(argv[8]) != 0, std::stoi(argv[9]), std::stoi(argv[10])});
    } catch (const std::exception&) {
        return EXIT_FAILURE;
    }
}
