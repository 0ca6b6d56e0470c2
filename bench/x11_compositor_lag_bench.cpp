// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/x11_bench.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// How long a compositor lags: milliseconds from the moment at which the server has another stack of windows
/// until the screen shows it. On a desktop at rest; with everything painted anew all the time; and with more
/// programs that compute than there are processors besides.

namespace {

using Clock = std::chrono::steady_clock;
using Milliseconds = std::chrono::duration<double, std::milli>;

constexpr std::chrono::seconds LIMIT{20};

/// A window past the window manager.
xcb_window_t MakeWindow(const XLink& link, const xcb_rectangle_t& place, std::uint32_t pixel) {
    const xcb_window_t window = xcb_generate_id(link.Get());
    const std::uint32_t values[] = {pixel, 1};
    xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, window, link.Root(), place.x, place.y, place.width,
                      place.height, 0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT,
                      XCB_CW_BACK_PIXEL | XCB_CW_OVERRIDE_REDIRECT, values);
    xcb_map_window(link.Get(), window);
    return window;
}

/// Threads that do something again and again as long as it lives.
class Unrest {
public:
    template <class Stroke>
    Unrest(unsigned threads, Stroke stroke) {
        for (unsigned i = 0; i < threads; ++i)
            m_threads.emplace_back([this, stroke] {
                while (!m_ends)
                    stroke();
            });
    }
    ~Unrest() {
        m_ends = true;
        for (std::thread& thread : m_threads)
            thread.join();
    }
    Unrest(const Unrest&) = delete;
    Unrest& operator=(const Unrest&) = delete;

private:
    std::atomic<bool> m_ends{false};
    std::vector<std::thread> m_threads;
};

/// Fills a large window with one colour after the other.
class Painter {
public:
    explicit Painter(const XServer& server) : m_link(server.Display()), m_window(MakeWindow(m_link, ALL, 0)) {
        const std::uint32_t below = XCB_STACK_MODE_BELOW;
        xcb_configure_window(m_link.Get(), m_window, XCB_CONFIG_WINDOW_STACK_MODE, &below);
        xcb_create_gc(m_link.Get(), m_context, m_window, 0, nullptr);
        m_link.RoundTrip();
    }

    void Paint() {
        m_colour += 0x010203;
        xcb_change_gc(m_link.Get(), m_context, XCB_GC_FOREGROUND, &m_colour);
        xcb_poly_fill_rectangle(m_link.Get(), m_window, m_context, 1, &ALL);
        m_link.RoundTrip();
    }

private:
    static constexpr xcb_rectangle_t ALL{0, 0, 1920, 1080};

    const XLink m_link;
    const xcb_window_t m_window;
    const xcb_gcontext_t m_context = xcb_generate_id(m_link.Get());
    std::uint32_t m_colour = 0;
};

/// Two windows at one place, of which now this and now that one is seen.
class Stack {
public:
    explicit Stack(const XServer& server) : m_link(server.Display()) {
        for (const std::uint32_t colour : COLOURS)
            m_windows.push_back(MakeWindow(m_link, {600, 300, 400, 300}, colour));
        m_link.RoundTrip();
        AwaitSight(1);
    }

    /// Nothing when the screen never shows it.
    std::optional<double> MeasureChange(int number) {
        const std::size_t shown = number % 2 == 0 ? 0 : 1;
        if (number % 4 < 2)
            Restack(m_windows[shown]);
        else
            Remap(shown);
        m_link.RoundTrip();
        const Clock::time_point changed = Clock::now();
        if (!AwaitSight(shown))
            return std::nullopt;
        return Milliseconds(Clock::now() - changed).count();
    }

private:
    static constexpr std::array<std::uint32_t, 2> COLOURS{0x00FF00, 0xFF0000};

    void Restack(xcb_window_t window) const {
        const std::uint32_t above = XCB_STACK_MODE_ABOVE;
        xcb_map_window(m_link.Get(), window);
        xcb_configure_window(m_link.Get(), window, XCB_CONFIG_WINDOW_STACK_MODE, &above);
    }
    void Remap(std::size_t shown) const {
        Restack(m_windows[shown]);
        xcb_unmap_window(m_link.Get(), m_windows[1 - shown]);
    }
    bool AwaitSight(std::size_t shown) const {
        const Clock::time_point limit = Clock::now() + LIMIT;
        while (Clock::now() < limit) {
            if (Seen() == COLOURS[shown])
                return true;
        }
        return false;
    }
    std::uint32_t Seen() const {
        const auto cookie = xcb_get_image(m_link.Get(), XCB_IMAGE_FORMAT_Z_PIXMAP, m_link.Root(), 700, 400, 1,
                                          1, ~std::uint32_t{0});
        const std::unique_ptr<xcb_get_image_reply_t, decltype(&std::free)> reply(
            xcb_get_image_reply(m_link.Get(), cookie, nullptr), &std::free);
        if (reply == nullptr || xcb_get_image_data_length(reply.get()) < 3)
            return 0;
        const std::uint8_t* const bytes = xcb_get_image_data(reply.get());
        return static_cast<std::uint32_t>(bytes[2] << 16 | bytes[1] << 8 | bytes[0]);
    }

    const XLink m_link;
    std::vector<xcb_window_t> m_windows;
};

std::vector<double> MeasureChanges(const XServer& server, int count) {
    Stack stack(server);
    std::vector<double> lags;
    for (int i = 0; i < count; ++i) {
        const std::optional<double> lag = stack.MeasureChange(i);
        if (!lag)
            throw std::runtime_error("the screen doesn't show the stack");
        lags.push_back(*lag);
        // At no fixed distance from what the compositor did last.
        std::this_thread::sleep_for(std::chrono::milliseconds(20 + i * 7 % 31));
    }
    std::sort(lags.begin(), lags.end());
    return lags;
}

void Tell(const std::string& row, const std::vector<double>& lags, BenchResults& results) {
    const auto at = [&lags](double share) {
        return lags[static_cast<std::size_t>(share * static_cast<double>(lags.size() - 1))];
    };
    std::printf("%-36s %6zu changes: median %7.2f  99 of 100 %7.2f  longest %7.2f\n", row.c_str(),
                lags.size(), at(0.5), at(0.99), at(1));
    results.Add(row, {{"median_ms", at(0.5)}, {"p99_ms", at(0.99)}, {"longest_ms", at(1)}});
}

void MeasureServer(XServerOptions::Kind kind, const BenchOptions& options, BenchResults& results) {
    const std::unique_ptr<XServer> server = StartBenchServer(kind);
    if (server == nullptr)
        return;
    const std::unique_ptr<XProgram> compositor = XProgram::Picom(*server);
    const int changes = 100 * options.repeats;
    const std::string name = "x11_compositor_lag/" + NameOf(kind) + "/picom/";
    if (options.Wants(name + "rest"))
        Tell(name + "rest", MeasureChanges(*server, changes), results);
    if (options.Wants(name + "painting")) {
        const auto painter = std::make_shared<Painter>(*server);
        const Unrest painting(1, [painter] { painter->Paint(); });
        Tell(name + "painting", MeasureChanges(*server, changes), results);
    }
    if (options.Wants(name + "overload")) {
        const auto painter = std::make_shared<Painter>(*server);
        const Unrest painting(1, [painter] { painter->Paint(); });
        std::atomic<unsigned> sum{0};
        const Unrest computing(4 * std::thread::hardware_concurrency(), [&sum] { ++sum; });
        Tell(name + "overload", MeasureChanges(*server, changes), results);
    }
}

} // namespace

int main(int argc, char** argv) {
    try {
        const BenchOptions options = ReadBenchOptions(argc, argv);
        if (const auto missing = MissingProgram({"picom"})) {
            std::printf("%s\n", missing->c_str());
            return EXIT_SUCCESS;
        }
        BenchResults results;
        for (const XServerOptions::Kind kind : options.servers)
            MeasureServer(kind, options, results);
        return options.out.empty() || results.Write(options.out) ? EXIT_SUCCESS : EXIT_FAILURE;
    } catch (const std::exception& error) {
        std::fprintf(stderr, "%s\n", error.what());
        return EXIT_FAILURE;
    }
}
