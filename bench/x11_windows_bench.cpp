// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/cpu_meter.h"
#include "bench/meter/scenes.h"
#include "bench/meter/shared_picture.h"
#include "bench/meter/statistics.h"
#include "bench/meter/x11_bench.h"
#include "platform/window_server.h"
#include "platform/x11/x11_window_server.h"
#include "tests/x11/window_tree_bench.h"
#include "util/cm_clock.h"

#include <unistd.h>
#include <xcb/composite.h>

#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// What a list of windows and a picture of a covered one cost.
///
/// The goals: a list that is read from the server under 25 microseconds a window, one from the mirror under
/// 1; a picture of an unchanged window of 1280x720 under 0.1 ms and without a transfer, of one that has
/// changed everywhere at most 1.3 times a bare fetch of its pixmap.

namespace {

using Clock = std::chrono::steady_clock;
using Microseconds = std::chrono::duration<double, std::micro>;
using platform::WindowSnapshot;
using platform::X11WindowServer;

constexpr std::chrono::seconds PATIENCE{30};

void WaitFor(const std::function<bool()>& condition, const char* what) {
    const Clock::time_point limit = Clock::now() + PATIENCE;
    while (!condition()) {
        if (Clock::now() > limit)
            throw std::runtime_error(std::string("in vain: ") + what);
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
}

/// Microseconds of operations that were measured one by one.
struct Timings {
    std::vector<double> wall;
    std::vector<double> client; ///< CPU of this process.
    std::vector<double> server; ///< CPU of the X server.
};

template <class Operation>
void Time(pid_t server, Timings& timings, const Operation& operation) {
    const auto serverBefore = ReadCpuClock(server);
    const auto clientBefore = ReadCpuClock(getpid());
    const Clock::time_point start = Clock::now();
    operation();
    timings.wall.push_back(Microseconds(Clock::now() - start).count());
    timings.client.push_back(Microseconds(ReadCpuClock(getpid()) - clientBefore).count());
    timings.server.push_back(Microseconds(ReadCpuClock(server) - serverBefore).count());
}

/// The table, microseconds divided by `share`.
class Table {
public:
    explicit Table(BenchResults& results) : m_results(results) {
        std::printf("\nmicroseconds, medians [lowest .. highest]\n%-52s %10s %24s %10s %10s %6s\n", "",
                    "wall", "", "client CPU", "server CPU", "ratio");
    }

    void Tell(const std::string& row, const Timings& timings, double share, double yardstick = 0) {
        const Spread wall = SpreadOf(timings.wall);
        const double client = SpreadOf(timings.client).median / share;
        const double server = SpreadOf(timings.server).median / share;
        std::printf("%-52s %10.3f [%10.3f ..%10.3f] %10.3f %10.3f", row.c_str(), wall.median / share,
                    wall.lowest / share, wall.highest / share, client, server);
        BenchResults::Values values{{"wall_us", wall.median / share},
                                    {"wall_us_lowest", wall.lowest / share},
                                    {"wall_us_highest", wall.highest / share},
                                    {"client_cpu_us", client},
                                    {"server_cpu_us", server}};
        if (yardstick > 0) {
            std::printf(" %6.2f", wall.median / yardstick);
            values.emplace_back("ratio_to_bare", wall.median / yardstick);
        }
        std::printf("\n");
        std::fflush(stdout);
        m_results.Add(row, values);
    }

private:
    BenchResults& m_results;
};

// ---- Lists

class ListBench {
public:
    ListBench(const XServer& server, int count)
        : m_server(server),
          m_count(static_cast<std::size_t>(count)),
          m_scene(server.Display(), SceneOfWindows(count)),
          m_link(server.Display()) {}

    /// From nothing to the first list: connects, and asks the server about everything.
    Timings ReadCold(int repeats) const {
        Timings timings;
        for (int i = 0; i < repeats; ++i) {
            std::unique_ptr<X11WindowServer> server;
            Time(m_server.Pid(), timings, [&] {
                server = std::make_unique<X11WindowServer>(m_server.Display());
                if (server->GetWindows()->Windows().size() < m_count)
                    throw std::runtime_error("the first list is not the whole one");
            });
            server.reset();
            WaitForGoodbye();
        }
        return timings;
    }

    /// What being able to take pictures of covered windows costs: the server gives each window a storage of
    /// its own. Part of what the first list waits for.
    Timings RedirectBare(int repeats) const {
        Timings timings;
        for (int i = 0; i < repeats; ++i) {
            {
                const XLink other(m_server.Display());
                const auto version = xcb_composite_query_version(other.Get(), 0, 4);
                std::free(xcb_composite_query_version_reply(other.Get(), version, nullptr));
                Time(m_server.Pid(), timings, [&] {
                    xcb_composite_redirect_subwindows(other.Get(), other.Root(),
                                                      XCB_COMPOSITE_REDIRECT_AUTOMATIC);
                    other.RoundTrip();
                });
            }
            WaitForGoodbye();
        }
        return timings;
    }

    /// The mirror without pictures: reads everything about all windows.
    Timings ReadMirror(int repeats) const {
        Timings timings;
        for (int i = 0; i < repeats; ++i) {
            TreeBench mirror(m_server.Display());
            Time(m_server.Pid(), timings, [&] { mirror.Begin(); });
            if (mirror.tree.Snapshot()->Windows().size() < m_count)
                throw std::runtime_error("the mirror has not read all windows");
        }
        return timings;
    }

    /// Makes another list of what the mirror holds, without asking anything.
    Timings ListMirror(int repeats) const {
        Timings timings;
        TreeBench mirror(m_server.Display());
        mirror.Begin();
        for (int i = 0; i < repeats; ++i) {
            const auto former = mirror.tree.Snapshot();
            mirror.tree.SetComposited(i % 2 == 0);
            Time(m_server.Pid(), timings, [&] { mirror.tree.Snapshot(); });
            if (mirror.tree.Snapshot() == former)
                throw std::runtime_error("the mirror has given the same list again");
        }
        return timings;
    }

    /// What a list without pictures costs at least: three questions a window, all asked before the first
    /// answer is read.
    Timings ReadBare(int repeats) const {
        Timings timings;
        for (int i = 0; i < repeats; ++i)
            Time(m_server.Pid(), timings, [&] { AskOfAll(Children()); });
        return timings;
    }

    /// With nothing new, as at most ticks.
    Timings LookAgain(int repeats) const {
        constexpr int LOOKS = 1000;
        const X11WindowServer server(m_server.Display());
        Timings timings;
        server.GetWindows();
        for (int i = 0; i < repeats; ++i) {
            Time(m_server.Pid(), timings, [&] {
                for (int look = 0; look < LOOKS; ++look)
                    server.GetWindows();
            });
            for (auto* const values : {&timings.wall, &timings.client, &timings.server})
                values->back() /= LOOKS;
        }
        return timings;
    }

    /// One window has moved. The wall time holds the breaks between looks, so it is only the CPU time that
    /// tells something.
    Timings LookAfterMoves(int repeats) const {
        const X11WindowServer server(m_server.Display());
        const xcb_window_t window = Children().back();
        Timings timings;
        std::uint64_t generation = server.GetWindows()->Generation();
        for (int i = 0; i < repeats; ++i) {
            Time(m_server.Pid(), timings, [&] {
                const std::uint32_t x = static_cast<std::uint32_t>(i % 50);
                xcb_configure_window(m_link.Get(), window, XCB_CONFIG_WINDOW_X, &x);
                m_link.RoundTrip();
                WaitFor([&] { return server.GetWindows()->Generation() != generation; }, "a new list");
            });
            generation = server.GetWindows()->Generation();
        }
        return timings;
    }

private:
    /// The X server takes back what it did for a client some time after it has gone, all in one go.
    void WaitForGoodbye() const {
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
        m_link.RoundTrip();
    }

    /// Back to front.
    std::vector<xcb_window_t> Children() const {
        const auto asked = xcb_query_tree(m_link.Get(), m_link.Root());
        xcb_query_tree_reply_t* const reply = xcb_query_tree_reply(m_link.Get(), asked, nullptr);
        if (reply == nullptr || reply->children_len == 0)
            throw std::runtime_error("there are no windows");
        const xcb_window_t* const first = xcb_query_tree_children(reply);
        const std::vector<xcb_window_t> children(first, first + reply->children_len);
        std::free(reply);
        return children;
    }

    void AskOfAll(const std::vector<xcb_window_t>& windows) const {
        xcb_connection_t* const connection = m_link.Get();
        struct Questions {
            xcb_get_geometry_cookie_t geometry;
            xcb_get_window_attributes_cookie_t attributes;
            xcb_get_property_cookie_t title;
        };
        std::vector<Questions> questions;
        for (const xcb_window_t window : windows) {
            questions.push_back({xcb_get_geometry(connection, window),
                                 xcb_get_window_attributes(connection, window),
                                 xcb_get_property(connection, 0, window, XCB_ATOM_WM_NAME,
                                                  XCB_GET_PROPERTY_TYPE_ANY, 0, 256)});
        }
        for (const Questions& each : questions) {
            std::free(xcb_get_geometry_reply(connection, each.geometry, nullptr));
            std::free(xcb_get_window_attributes_reply(connection, each.attributes, nullptr));
            std::free(xcb_get_property_reply(connection, each.title, nullptr));
        }
    }

    const XServer& m_server;
    const std::size_t m_count;
    const SceneProcess m_scene;
    const XLink m_link;
};

// ---- Pictures

/// A window of 1280x720 behind another one of the same place.
class CoveredWindow {
public:
    explicit CoveredWindow(const std::string& display)
        : m_link(display),
          m_pictures{{{m_link.Get(), WIDTH, HEIGHT}, {m_link.Get(), WIDTH, HEIGHT}}},
          m_fetched(m_link.Get(), WIDTH, HEIGHT),
          m_window(Map()),
          m_context(xcb_generate_id(m_link.Get())),
          m_pixmap(xcb_generate_id(m_link.Get())) {
        Map();
        xcb_create_gc(m_link.Get(), m_context, m_window, 0, nullptr);
        xcb_composite_name_window_pixmap(m_link.Get(), m_window, m_pixmap);
        for (std::uint32_t i = 0; i < m_pictures.size(); ++i)
            PaintSquares(m_pictures[i], i + 1);
        Change();
    }

    xcb_window_t Window() const { return m_window; }
    platform::CGRect Frame() const { return {{X, Y}, {WIDTH, HEIGHT}}; }

    /// Everywhere. Comes back when it is done.
    void Change() {
        m_shown = (m_shown + 1) % m_pictures.size();
        m_pictures[m_shown].Put(m_window, m_context, 0, 0);
        m_link.RoundTrip();
    }
    void FetchBare() const {
        if (!m_fetched.Fetch(m_pixmap))
            throw std::runtime_error("the bare fetch fails");
    }
    bool IsShownBy(const platform::Picture& picture) const {
        if (picture.width != WIDTH || picture.height != HEIGHT)
            return false;
        constexpr std::uint32_t COLOURS = 0xFFFFFF;
        for (const int y : {0, HEIGHT / 2, HEIGHT - 1}) {
            const std::uint32_t* const expected = m_pictures[m_shown].Pixels() + y * WIDTH;
            const std::uint8_t* const row = picture.pixels + static_cast<std::size_t>(y) * picture.stride;
            for (int x = 0; x < WIDTH; ++x) {
                std::uint32_t pixel = 0;
                std::memcpy(&pixel, row + 4 * x, sizeof pixel);
                if (((pixel ^ expected[x]) & COLOURS) != 0)
                    return false;
            }
        }
        return true;
    }

private:
    static constexpr int X = 100;
    static constexpr int Y = 100;
    static constexpr int WIDTH = 1280;
    static constexpr int HEIGHT = 720;

    xcb_window_t Map() const {
        const xcb_window_t window = xcb_generate_id(m_link.Get());
        const std::uint32_t background = 0x405060;
        xcb_create_window(m_link.Get(), XCB_COPY_FROM_PARENT, window, m_link.Root(), X, Y, WIDTH, HEIGHT, 0,
                          XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL,
                          &background);
        xcb_map_window(m_link.Get(), window);
        m_link.RoundTrip();
        return window;
    }

    const XLink m_link;
    const std::array<SharedPicture, 2> m_pictures;
    const SharedPicture m_fetched;
    const xcb_window_t m_window;
    const xcb_gcontext_t m_context;
    const xcb_pixmap_t m_pixmap;
    std::size_t m_shown = 0;
};

class PictureBench {
public:
    explicit PictureBench(const XServer& server)
        : m_pid(server.Pid()),
          m_server(Began(server.Display())),
          m_covered(server.Display()) {
        WaitFor([&] { return m_server->GetWindows()->Find(m_covered.Window()) != nullptr; }, "the window");
    }

    void Measure(bool isChanged, int repeats) {
        platform::PicturePtr former = Take();
        for (int i = 0; i < repeats; ++i) {
            if (isChanged)
                m_covered.Change();
            Rest();
            platform::PicturePtr taken;
            Time(m_pid, m_ours, [&] { taken = Take(); });
            // Pixels that have been given out never change, so the same object means that none were fetched.
            if ((taken == former) == isChanged || !m_covered.IsShownBy(*taken))
                throw std::runtime_error("a wrong picture");
            former = taken;
            Rest();
            Time(m_pid, m_bare, [&] { m_covered.FetchBare(); });
        }
    }

    const Timings& Ours() const { return m_ours; }
    const Timings& Bare() const { return m_bare; }

private:
    static std::unique_ptr<X11WindowServer> Began(const std::string& display) {
        auto server = std::make_unique<X11WindowServer>(display);
        if (server->GetLife().life != platform::Life::Alive)
            throw std::runtime_error("no connection to " + display);
        return server;
    }

    /// Between ticks everybody sleeps.
    static void Rest() { std::this_thread::sleep_for(std::chrono::milliseconds(3)); }

    platform::PicturePtr Take() const {
        platform::WindowPictureRequest request;
        request.windows = {m_covered.Window()};
        request.rect = m_covered.Frame();
        request.deadline = CmSteadyNow() + platform::DEFAULT_IMAGE_DEADLINE;
        const platform::WindowPictureResult result = m_server->TakeWindowPicture(request);
        if (result.outcome != platform::PictureOutcome::Ok || result.picture->layers.size() != 1)
            throw std::runtime_error("no picture of the covered window");
        return result.picture->layers[0].picture;
    }

    const pid_t m_pid;
    const std::unique_ptr<X11WindowServer> m_server; // before the window, whose painting it has to see
    CoveredWindow m_covered;
    Timings m_ours;
    Timings m_bare;
};

// ---- What is measured on a server

constexpr int PICTURES_A_REPEAT = 60;

class Bench {
public:
    Bench(const XServer& server, const BenchOptions& options, BenchResults& results)
        : m_server(server),
          m_options(options),
          m_prefix("x11_windows/" + NameOf(server.Options().kind) + "/"),
          m_table(results) {}

    void Run() {
        for (const int count : {50, 200, 1000})
            MeasureLists(count);
        MeasurePictures("picture_unchanged", false);
        MeasurePictures("picture_changed", true);
    }

private:
    void MeasureLists(int count) {
        const std::string windows = "/" + std::to_string(count);
        const std::string cold = m_prefix + "list_cold_each" + windows;
        const std::string mirror = m_prefix + "list_mirror_each" + windows;
        const std::string again = m_prefix + "list_again_each" + windows;
        const std::string moved = m_prefix + "list_moved_each" + windows;
        if (!m_options.Wants(cold) && !m_options.Wants(mirror) && !m_options.Wants(again) &&
            !m_options.Wants(moved))
            return;
        const ListBench bench(m_server, count);
        if (m_options.Wants(cold))
            MeasureCold(bench, cold, count);
        if (m_options.Wants(mirror))
            m_table.Tell(mirror, bench.ListMirror(4 * m_options.repeats), count);
        if (m_options.Wants(again))
            m_table.Tell(again, bench.LookAgain(m_options.repeats), count);
        if (m_options.Wants(moved))
            m_table.Tell(moved, bench.LookAfterMoves(4 * m_options.repeats), count);
    }

    void MeasureCold(const ListBench& bench, const std::string& row, int count) {
        m_table.Tell(row, bench.ReadCold(m_options.repeats), count);
        m_table.Tell(row + "/mirror_alone", bench.ReadMirror(m_options.repeats), count);
        m_table.Tell(row + "/bare_redirect", bench.RedirectBare(m_options.repeats), count);
        m_table.Tell(row + "/bare_read", bench.ReadBare(m_options.repeats), count);
    }

    void MeasurePictures(const char* name, bool isChanged) {
        const std::string row = m_prefix + name;
        if (!m_options.Wants(row))
            return;
        PictureBench bench(m_server);
        bench.Measure(isChanged, PICTURES_A_REPEAT * m_options.repeats);
        const double bare = SpreadOf(bench.Bare().wall).median;
        m_table.Tell(row, bench.Ours(), 1, bare);
        m_table.Tell(row + "/bare", bench.Bare(), 1, bare);
    }

    const XServer& m_server;
    const BenchOptions& m_options;
    const std::string m_prefix;
    Table m_table;
};

} // namespace

int main(int argc, char** argv) {
    if (const auto played = PlaySceneIfAsked(argc, argv))
        return *played;
    try {
        const BenchOptions options = ReadBenchOptions(argc, argv);
        BenchResults results;
        for (const auto kind : options.servers) {
            if (const auto server = StartBenchServer(kind))
                Bench(*server, options, results).Run();
        }
        return options.out.empty() || results.Write(options.out) ? EXIT_SUCCESS : EXIT_FAILURE;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "x11_windows_bench: %s\n", failure.what());
        return EXIT_FAILURE;
    }
}
