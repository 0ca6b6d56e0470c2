// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/cpu_meter.h"
#include "bench/meter/shared_picture.h"
#include "bench/meter/statistics.h"
#include "bench/meter/x11_bench.h"
#include "platform/window_server.h"
#include "platform/x11/x11_window_server.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_thumbnail.h>

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <numeric>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// What the thumbnails of 30 windows of 1280x720, most of them covered, cost a picker, and how long a caller
/// waits who asks for thumbnails or cancels them while others are being captured.
///
/// The goals: under 10 ms for each thumbnail of windows that have changed everywhere, under 3 ms for each of
/// windows that have not; no caller waits longer than 2 ms.

namespace {

using Clock = std::chrono::steady_clock;
using Milliseconds = std::chrono::duration<double, std::milli>;

constexpr int WINDOWS = 30;
constexpr int WIDTH = 1280;
constexpr int HEIGHT = 720;
constexpr std::chrono::seconds PATIENCE{60};

double MillisecondsSince(Clock::time_point start) {
    return Milliseconds(Clock::now() - start).count();
}

/// Puts an X server in force as long as it lives, watched from the beginning.
class ServerInForce {
public:
    explicit ServerInForce(const std::string& display)
        : m_server(std::make_shared<platform::X11WindowServer>(display)),
          m_former(platform::ReplaceWindowServer(m_server)) {
        m_server->GetWindows();
    }
    ~ServerInForce() { platform::ReplaceWindowServer(m_former); }
    ServerInForce(const ServerInForce&) = delete;
    ServerInForce& operator=(const ServerInForce&) = delete;

private:
    const std::shared_ptr<platform::X11WindowServer> m_server;
    const std::shared_ptr<platform::WindowServer> m_former;
};

/// Windows one upon another, each a little further down and to the right, painted with known pixels.
class ManyWindows {
public:
    explicit ManyWindows(const std::string& display)
        : m_link(display),
          m_context(xcb_generate_id(m_link.Get())) {
        for (int i = 0; i < WINDOWS; ++i) {
            m_pictures.push_back(std::make_unique<SharedPicture>(m_link.Get(), WIDTH, HEIGHT));
            PaintSquares(*m_pictures.back(), static_cast<std::uint32_t>(i) + 1);
            m_windows.push_back(Map(10 + 20 * i, 5 + 11 * i));
        }
        xcb_create_gc(m_link.Get(), m_context, m_windows.front(), 0, nullptr);
        Change();
    }

    const std::vector<unsigned>& Ids() const { return m_windows; }

    /// Everywhere, all of them. Comes back when it is done.
    void Change() {
        ++m_shift;
        for (std::size_t i = 0; i < m_windows.size(); ++i)
            PictureOf(i).Put(m_windows[i], m_context, 0, 0);
        m_link.RoundTrip();
    }

    /// Looks at some rows only, or looking would be what is measured.
    bool IsShownBy(std::size_t index, const ImageData& image) const {
        if (image.width != WIDTH || image.height != HEIGHT)
            return false;
        for (const int y : {0, HEIGHT / 2, HEIGHT - 1}) {
            const std::uint32_t* const expected = PictureOf(index).Pixels() + std::ptrdiff_t{y} * WIDTH;
            const unsigned char* at = image.data + static_cast<std::ptrdiff_t>(y) * image.lineBytes;
            for (int x = 0; x < WIDTH; ++x, at += 4) {
                const std::uint32_t rgb =
                    static_cast<std::uint32_t>(at[0]) << 16 | static_cast<std::uint32_t>(at[1]) << 8 | at[2];
                if (rgb != (expected[x] & 0xFFFFFFU))
                    return false;
            }
        }
        return true;
    }

private:
    const SharedPicture& PictureOf(std::size_t index) const {
        return *m_pictures[(index + m_shift) % m_pictures.size()];
    }

    xcb_window_t Map(int x, int y) const {
        const xcb_window_t window = xcb_generate_id(m_link.Get());
        const std::uint32_t background = 0x405060;
        xcb_create_window(m_link.Get(), XCB_COPY_FROM_PARENT, window, m_link.Root(),
                          static_cast<std::int16_t>(x), static_cast<std::int16_t>(y), WIDTH, HEIGHT, 0,
                          XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL,
                          &background);
        xcb_map_window(m_link.Get(), window);
        m_link.RoundTrip();
        return window;
    }

    const XLink m_link;
    const xcb_gcontext_t m_context;
    std::vector<std::unique_ptr<SharedPicture>> m_pictures;
    std::vector<unsigned> m_windows;
    std::size_t m_shift = 0;
};

/// Notes how long each item took, and whether it was right.
class Picker final : public ThumbnailCallback {
public:
    explicit Picker(const ManyWindows& windows) : m_windows(windows) {}
    ~Picker() { CancelThumbnail(this); }
    Picker(const Picker&) = delete;
    Picker& operator=(const Picker&) = delete;

    /// All windows, from the request to the last thumbnail: milliseconds of each item. Throws when something
    /// fails or never comes.
    std::vector<double> Take() {
        m_items.clear();
        m_isRight = true;
        m_isDone = false;
        m_began = Clock::now();
        if (EnumWindowThumbnail(m_windows.Ids().data(), WINDOWS, this) != 0)
            throw std::runtime_error("the request is refused");
        std::unique_lock<std::mutex> lock(m_mutex);
        if (!m_done.wait_for(lock, PATIENCE, [this] { return m_isDone; }))
            throw std::runtime_error("the thumbnails don't come");
        return m_items;
    }
    /// Of the thumbnails that were taken last.
    bool IsRight() const { return m_isRight; }

    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return false; }
    bool onThumbnailError(int) override { return false; }
    bool onWindowThumbnail(unsigned, ImageData image, bool failed, bool last) override {
        const double time = MillisecondsSince(m_began);
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_isRight = m_isRight && !failed && m_windows.IsShownBy(m_items.size(), image);
        m_items.push_back(time);
        m_isDone = last;
        m_done.notify_all();
        m_began = Clock::now();
        return true;
    }

private:
    const ManyWindows& m_windows;
    Clock::time_point m_began; // of the item under way
    std::mutex m_mutex;
    std::condition_variable m_done;
    // Guarded by m_mutex while a request runs.
    std::vector<double> m_items;
    bool m_isRight = true;
    bool m_isDone = false;
};

/// Has all windows captured over and over until its end.
class Traffic final : public ThumbnailCallback {
public:
    explicit Traffic(const std::vector<unsigned>& windows) : m_windows(windows) { Ask(); }
    ~Traffic() { CancelThumbnail(this); }
    Traffic(const Traffic&) = delete;
    Traffic& operator=(const Traffic&) = delete;

    void Ask() { EnumWindowThumbnail(m_windows.data(), static_cast<int>(m_windows.size()), this); }
    int Captures() const { return m_captures; }

    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return false; }
    bool onThumbnailError(int) override { return false; }
    bool onWindowThumbnail(unsigned, ImageData, bool, bool last) override {
        ++m_captures;
        if (last)
            Ask();
        return true;
    }

private:
    const std::vector<unsigned>& m_windows;
    std::atomic<int> m_captures{0};
};

/// Hears nothing of interest.
class Bystander final : public ThumbnailCallback {
public:
    ~Bystander() { CancelThumbnail(this); }
    bool onAppThumbnail(unsigned, ImageData, bool, bool) override { return true; }
    bool onWindowThumbnail(unsigned, ImageData, bool, bool) override { return true; }
    bool onThumbnailError(int) override { return true; }
};

/// What so many of a hundred values don't exceed.
double Percentile(std::vector<double> values, double percent) {
    std::sort(values.begin(), values.end());
    const auto at = static_cast<std::size_t>(static_cast<double>(values.size() - 1) * percent / 100);
    return values.at(at);
}

class Bench {
public:
    Bench(const XServer& server, const BenchOptions& options, BenchResults& results)
        : m_options(options),
          m_results(results),
          m_prefix("x11_thumbnails/" + NameOf(server.Options().kind) + "/"),
          m_pid(server.Pid()),
          m_server(server.Display()),
          m_windows(server.Display()) {
        WaitUntilShown();
    }

    void Run() {
        std::printf("\nmilliseconds for each thumbnail, medians [lowest .. highest]\n");
        MeasureThumbnails("cold", true);
        MeasureThumbnails("unchanged", false);
        std::printf("\nmilliseconds that a caller waits beside captures: median, of 99 in 100, longest\n");
        const std::vector<unsigned> one{m_windows.Ids().front()};
        Bystander bystander;
        const auto cancel = [&] { CancelThumbnail(&bystander); };
        const auto request = [&] { EnumWindowThumbnail(one.data(), 1, &bystander); };
        MeasureWait(
            "request_windows", [&](Traffic&) { request(); }, [&](Traffic&) { cancel(); });
        MeasureWait(
            "request_all", [&](Traffic&) { EnumAppThumbnail(nullptr, 0, &bystander); },
            [&](Traffic&) { cancel(); });
        MeasureWait(
            "cancel_other", [&](Traffic&) { cancel(); }, [&](Traffic&) { request(); });
        MeasureWait(
            "cancel_running", [](Traffic& traffic) { CancelThumbnail(&traffic); },
            [](Traffic& traffic) { traffic.Ask(); });
    }

private:
    void WaitUntilShown() {
        const Clock::time_point limit = Clock::now() + PATIENCE;
        Picker picker(m_windows);
        for (;;) {
            picker.Take();
            if (picker.IsRight())
                return;
            if (Clock::now() > limit)
                throw std::runtime_error("the windows are never shown whole");
            std::this_thread::sleep_for(std::chrono::milliseconds(50));
        }
    }

    void MeasureThumbnails(const char* name, bool isChanged) {
        const std::string row = m_prefix + name;
        if (!m_options.Wants(row))
            return;
        std::vector<double> means;
        std::vector<double> items;
        std::vector<double> clientCpu;
        std::vector<double> serverCpu;
        Picker picker(m_windows);
        for (int i = 0; i < 2 * m_options.repeats; ++i) {
            if (isChanged)
                m_windows.Change();
            std::this_thread::sleep_for(std::chrono::milliseconds(20));
            const auto client = ReadCpuClock(getpid());
            const auto server = ReadCpuClock(m_pid);
            const std::vector<double> each = picker.Take();
            clientCpu.push_back(Milliseconds(ReadCpuClock(getpid()) - client).count() / WINDOWS);
            serverCpu.push_back(Milliseconds(ReadCpuClock(m_pid) - server).count() / WINDOWS);
            if (!picker.IsRight())
                throw std::runtime_error("a wrong thumbnail");
            means.push_back(std::accumulate(each.begin(), each.end(), 0.0) / WINDOWS);
            items.insert(items.end(), each.begin(), each.end());
        }
        const Spread mean = SpreadOf(means);
        TellThumbnails(row, {{"wall_ms", mean.median},
                             {"wall_ms_lowest", mean.lowest},
                             {"wall_ms_highest", mean.highest},
                             {"wall_ms_longest_item", SpreadOf(items).highest},
                             {"client_cpu_ms", SpreadOf(clientCpu).median},
                             {"server_cpu_ms", SpreadOf(serverCpu).median}});
    }

    void TellThumbnails(const std::string& row, const BenchResults::Values& values) {
        std::printf("%-36s %8.3f [%8.3f ..%8.3f] longest %8.3f client CPU %8.3f server CPU %8.3f\n",
                    row.c_str(), values[0].second, values[1].second, values[2].second, values[3].second,
                    values[4].second, values[5].second);
        std::fflush(stdout);
        m_results.Add(row, values);
    }

    /// The time of `call`; what `after` does isn't measured.
    void MeasureWait(const char* name, const std::function<void(Traffic&)>& call,
                     const std::function<void(Traffic&)>& after) {
        const std::string row = m_prefix + "wait_" + name;
        if (!m_options.Wants(row))
            return;
        std::mt19937 random(20263);
        std::vector<double> waits;
        Traffic traffic(m_windows.Ids());
        const int calls = 200 * m_options.repeats;
        for (int i = 0; i < calls; ++i) {
            std::this_thread::sleep_for(std::chrono::microseconds(random() % 4000));
            const Clock::time_point start = Clock::now();
            call(traffic);
            waits.push_back(MillisecondsSince(start));
            after(traffic);
        }
        const double median = Percentile(waits, 50);
        const double most = Percentile(waits, 99);
        const double longest = Percentile(waits, 100);
        std::printf("%-44s %8.3f %8.3f %8.3f  of %d calls beside %d captures\n", row.c_str(), median, most,
                    longest, calls, traffic.Captures());
        std::fflush(stdout);
        m_results.Add(row, {{"wait_ms", median}, {"wait_ms_99", most}, {"wait_ms_longest", longest}});
    }

    const BenchOptions& m_options;
    BenchResults& m_results;
    const std::string m_prefix;
    const pid_t m_pid;            // of the X server
    const ServerInForce m_server; // before the windows, whose painting it has to see
    ManyWindows m_windows;
};

} // namespace

int main(int argc, char** argv) {
    try {
        const BenchOptions options = ReadBenchOptions(argc, argv);
        BenchResults results;
        for (const auto kind : options.servers) {
            if (const auto server = StartBenchServer(kind))
                Bench(*server, options, results).Run();
        }
        return options.out.empty() || results.Write(options.out) ? EXIT_SUCCESS : EXIT_FAILURE;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "x11_thumbnails_bench: %s\n", failure.what());
        return EXIT_FAILURE;
    }
}
