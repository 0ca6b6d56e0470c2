// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/x11/window_tree_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <random>
#include <string>
#include <vector>

/// A client that does anything to its windows, and the mirror of them against a reading that begins anew.

namespace {

using platform::WindowInfo;
using platform::x11::TopLevel;

class RandomClient {
public:
    RandomClient(const XServer& server, unsigned seed) : m_client(server), m_random(seed) {}

    void Act() {
        switch (Any(16)) {
            case 0:
            case 1:
                return Create();
            case 2:
                return Frame();
            case 3:
                return Unframe();
            case 4:
                return Destroy();
            case 5:
            case 6:
                xcb_map_window(m_client.Get(), Pick());
                return;
            case 7:
                xcb_unmap_window(m_client.Get(), Pick());
                return;
            case 8:
            case 9:
                return Stack();
            case 10:
                return Place();
            case 11:
                xcb_circulate_window(m_client.Get(), static_cast<std::uint8_t>(Any(2)), m_client.Root());
                return;
            case 12:
                return Shape();
            default:
                return Write();
        }
    }
    void End(xcb_window_t window) { xcb_destroy_window(m_client.Get(), window); }
    void RoundTrip() { m_client.RoundTrip(); }

private:
    struct Framed {
        xcb_window_t frame = 0;
        xcb_window_t client = 0;
    };

    unsigned Any(unsigned below) { return static_cast<unsigned>(m_random()) % below; }
    xcb_window_t Pick() { return m_windows.empty() ? m_client.Root() : m_windows[Any(Size())]; }
    unsigned Size() const { return static_cast<unsigned>(m_windows.size()); }
    bool IsFree(xcb_window_t window) const {
        return std::none_of(m_framed.begin(), m_framed.end(), [window](const Framed& each) {
            return each.frame == window || each.client == window;
        });
    }

    void Create() {
        if (m_windows.size() > 25)
            return;
        xcb_window_t name = 0;
        if (!m_used.empty() && Any(2) == 0) {
            name = m_used.back();
            m_used.pop_back();
        }
        const ForeignClient::Look look{static_cast<int>(Any(300)),
                                       static_cast<int>(Any(300)),
                                       1 + Any(200),
                                       1 + Any(200),
                                       Any(4),
                                       Any(3) == 0,
                                       Any(10) == 0};
        const ForeignClient::Look real{look.x,
                                       look.y,
                                       look.width,
                                       look.height,
                                       look.inputOnly ? 0 : look.border,
                                       look.overrideRedirect,
                                       look.inputOnly};
        m_windows.push_back(m_client.Create(real, name));
    }

    /// As a window manager does it, at times two windows deep.
    void Frame() {
        const xcb_window_t window = Pick();
        if (m_windows.size() > 25 || window == m_client.Root() || !IsFree(window))
            return;
        const xcb_window_t frame = m_client.Create({static_cast<int>(Any(300)), 20, 100, 100});
        xcb_window_t parent = frame;
        if (Any(2) == 0)
            parent = m_client.Create({2, 2, 90, 90}, 0, frame);
        m_client.Words(window, "WM_STATE", "WM_STATE", {1, 0});
        if (Any(2) == 0)
            xcb_map_window(m_client.Get(), frame);
        xcb_reparent_window(m_client.Get(), window, parent, 1, 1);
        if (Any(2) == 0)
            xcb_map_window(m_client.Get(), frame);
        m_framed.push_back({frame, window});
        m_windows.push_back(frame);
    }

    void Unframe() {
        if (m_framed.empty())
            return;
        const std::size_t place = Any(static_cast<unsigned>(m_framed.size()));
        const Framed framed = m_framed[place];
        m_framed.erase(m_framed.begin() + static_cast<std::ptrdiff_t>(place));
        xcb_reparent_window(m_client.Get(), framed.client, m_client.Root(),
                            static_cast<std::int16_t>(Any(50)), 7);
        if (Any(2) == 0)
            Forget(framed.frame);
    }

    void Destroy() {
        if (m_windows.empty())
            return;
        const xcb_window_t window = Pick();
        // What is inside goes with it.
        const auto framed = std::find_if(m_framed.begin(), m_framed.end(), [window](const Framed& each) {
            return each.frame == window || each.client == window;
        });
        if (framed != m_framed.end()) {
            const xcb_window_t inside = framed->client;
            m_framed.erase(framed);
            if (inside != window)
                Drop(inside);
        }
        Forget(window);
    }

    void Forget(xcb_window_t window) {
        xcb_destroy_window(m_client.Get(), window);
        Drop(window);
    }
    void Drop(xcb_window_t window) {
        m_windows.erase(std::remove(m_windows.begin(), m_windows.end(), window), m_windows.end());
        m_used.push_back(window);
    }

    void Stack() {
        const auto mode = static_cast<xcb_stack_mode_t>(Any(5));
        m_client.Stack(Pick(), mode, Any(2) == 0 ? Pick() : 0U);
    }

    void Place() {
        const std::uint32_t values[] = {Any(400), Any(400), 1 + Any(200), 1 + Any(200), Any(5)};
        const auto mask = static_cast<std::uint16_t>(
            Any(2) == 0 ? XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y
                        : XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y | XCB_CONFIG_WINDOW_WIDTH |
                              XCB_CONFIG_WINDOW_HEIGHT | XCB_CONFIG_WINDOW_BORDER_WIDTH);
        const xcb_window_t window = Pick();
        if (window != m_client.Root())
            xcb_configure_window(m_client.Get(), window, mask, values);
    }

    void Shape() {
        const xcb_rectangle_t rects[] = {{static_cast<std::int16_t>(Any(40)), 3, 30, 20}, {10, 30, 60, 9}};
        const xcb_window_t window = Pick();
        if (window == m_client.Root())
            return;
        if (Any(2) == 0)
            xcb_shape_mask(m_client.Get(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, window, 0, 0, XCB_NONE);
        else
            xcb_shape_rectangles(m_client.Get(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING,
                                 XCB_CLIP_ORDERING_UNSORTED, window, 0, 0, 2, rects);
    }

    void Write() {
        const xcb_window_t window = Pick();
        switch (Any(9)) {
            case 0:
                return m_client.Text(window, "WM_NAME", "STRING", "title " + std::to_string(Any(100)));
            case 1:
                return m_client.Words(window, "_NET_WM_PID", "CARDINAL", {1000 + Any(5)});
            case 2:
                return m_client.Words(window, "_NET_WM_WINDOW_OPACITY", "CARDINAL",
                                      {static_cast<std::uint32_t>(m_random())});
            case 3:
                return m_client.Words(window, "_NET_WM_DESKTOP", "CARDINAL", {Any(3)});
            case 4:
                return m_client.Words(m_client.Root(), "_NET_CURRENT_DESKTOP", "CARDINAL", {Any(3)});
            case 5:
                return m_client.Words(window, "_GTK_FRAME_EXTENTS", "CARDINAL", {Any(9), Any(9), 1, 2});
            case 6:
                return m_client.Words(window, "_NET_WM_WINDOW_TYPE", "ATOM", {m_client.Atom(AnyType())});
            case 7:
                return m_client.Words(window, "_NET_WM_STATE", "ATOM",
                                      {m_client.Atom("_NET_WM_STATE_HIDDEN")});
            default:
                // A frame that is said to be managed itself would have two to tell of it.
                if (IsFree(window) || IsClient(window))
                    m_client.Words(window, "WM_STATE", "WM_STATE", {Any(2) * 3, 0});
        }
    }
    bool IsClient(xcb_window_t window) const {
        return std::any_of(m_framed.begin(), m_framed.end(),
                           [window](const Framed& each) { return each.client == window; });
    }
    std::string AnyType() {
        const char* const types[] = {"DESKTOP", "DOCK", "NORMAL", "TOOLTIP", "MENU"};
        return std::string("_NET_WM_WINDOW_TYPE_") + types[Any(5)];
    }

    ForeignClient m_client;
    std::mt19937 m_random;
    std::vector<xcb_window_t> m_windows;
    std::vector<xcb_window_t> m_used;
    std::vector<Framed> m_framed;
};

std::string Text(const WindowInfo& info) {
    char text[256];
    std::snprintf(text, sizeof text, "%x of %d level %d alpha %.3f %g,%g %gx%g %s \"%s\"\n", info.id,
                  info.owner, info.level, static_cast<double>(info.alpha),
                  static_cast<double>(info.frame.origin.x), static_cast<double>(info.frame.origin.y),
                  static_cast<double>(info.frame.size.width), static_cast<double>(info.frame.size.height),
                  info.onScreen ? "seen" : "hidden", info.title.c_str());
    return text;
}

std::string Listed(TreeBench& bench) {
    std::string text;
    for (const WindowInfo& info : bench.Windows()->Windows())
        text += Text(info);
    return text;
}

/// Destroys frames whose client is gone: who comes later can't know that they are not to be listed.
bool EndBereft(const TreeBench& bench, RandomClient& client) {
    bool isAny = false;
    for (const TopLevel* const window : bench.tree.FrontFirst()) {
        if (!window->bereft)
            continue;
        client.End(window->window);
        isAny = true;
    }
    client.RoundTrip();
    return isAny;
}

/// What of the tree is known without asking anything.
std::string Tree(const TreeBench& bench) {
    std::string text;
    for (const TopLevel* const window : bench.tree.FrontFirst()) {
        char line[200];
        std::snprintf(line, sizeof line, "%x %d,%d %dx%d+%d %s\n", window->window, window->x, window->y,
                      window->width, window->height, window->border, window->mapped ? "mapped" : "");
        text += line;
        if (!window->IsListed())
            continue;
        std::snprintf(line, sizeof line, "  depth %d client %x class \"%s\" shape %zu\n", window->depth,
                      window->client, window->windowClass.c_str(), window->shape.size());
        text += line;
    }
    return text;
}

/// What was told while it happened, against what is there.
std::string Told(const TreeBench& bench) {
    std::string text = bench.watcher.wrong == 0 ? "" : "calls that make no sense\n";
    std::size_t count = 0;
    for (const TopLevel* const window : bench.tree.FrontFirst()) {
        const auto found = bench.watcher.seen.find(window->window);
        ++count;
        if (found == bench.watcher.seen.end() || found->second.mapped != window->mapped ||
            found->second.width != window->StorageWidth() || found->second.height != window->StorageHeight())
            text += "not as told: " + std::to_string(window->window) + "\n";
    }
    return count == bench.watcher.seen.size() ? text : text + "told of others\n";
}

TEST(WindowTreeOracle, FindsTheMirrorEqualToAReadingAnewWhateverAClientDoes) {
    if (const auto missing = MissingProgram({"Xvfb"}))
        GTEST_SKIP() << *missing;
    const unsigned seed = static_cast<unsigned>(std::chrono::steady_clock::now().time_since_epoch().count());
    const int rounds = 120 * TestEffort();
    std::printf("seed %u, %d comparisons\n", seed, rounds);
    std::mt19937 random(seed);
    const XServer server;
    RandomClient client(server, seed);
    TreeBench mirror(server.Display());
    mirror.tree.SetComposited(true);
    mirror.Begin();
    std::size_t compared = 0;
    for (int round = 0; round < rounds; ++round) {
        for (auto action = random() % 30; action > 0; --action) {
            client.Act();
            if (random() % 8 == 0)
                client.RoundTrip();
            // Answers tell of what has been done since, ahead of the events.
            for (auto events = random() % 8 == 0 ? random() % 32 : 0; events > 0; --events) {
                if (const platform::x11::Event event = mirror.connection.NextEvent())
                    mirror.tree.OnEvent(*event);
            }
            if (random() % 16 == 0)
                mirror.tree.Settle();
        }
        client.RoundTrip();
        ASSERT_TRUE(mirror.CatchUp());
        while (EndBereft(mirror, client))
            ASSERT_TRUE(mirror.CatchUp());
        TreeBench anew(server.Display(), mirror.memory);
        anew.tree.SetComposited(true);
        anew.Begin();
        ASSERT_EQ(Tree(mirror), Tree(anew)) << "round " << round << " seed " << seed;
        ASSERT_EQ(Listed(mirror), Listed(anew)) << "round " << round << " seed " << seed;
        ASSERT_EQ(Told(mirror), "") << "round " << round << " seed " << seed;
        compared += mirror.tree.Snapshot()->Windows().size();
    }
    std::printf("%zu windows compared\n", compared);
    EXPECT_GT(compared, static_cast<std::size_t>(rounds));
}

/// Told, not judged: what a reading costs depends on the machine.
TEST(WindowTreeOracle, ReadsAThousandWindowsAndListsThemAgainWithoutAsking) {
    if (const auto missing = MissingProgram({"Xvfb"}))
        GTEST_SKIP() << *missing;
    using Clock = std::chrono::steady_clock;
    using Microseconds = std::chrono::duration<double, std::micro>;
    const XServer server;
    ForeignClient client(server);
    int count = 0;
    for (const int wanted : {50, 200, 1000}) {
        for (; count < wanted; ++count) {
            const xcb_window_t window = client.CreateMapped({count % 100, count % 70, 100, 80});
            client.Text(window, "WM_NAME", "STRING", "a window with a title");
        }
        TreeBench bench(server.Display());
        const auto start = Clock::now();
        bench.Begin();
        const auto read = Clock::now();
        ASSERT_EQ(bench.tree.Snapshot()->Windows().size(), static_cast<std::size_t>(wanted));
        bench.tree.SetComposited(true); // another list
        const auto again = Clock::now();
        ASSERT_EQ(bench.tree.Snapshot()->Windows().size(), static_cast<std::size_t>(wanted));
        const auto end = Clock::now();
        std::printf("%d windows: %.2f us each to read, %.3f us each to list\n", wanted,
                    Microseconds(read - start).count() / wanted, Microseconds(end - again).count() / wanted);
    }
}

} // namespace
