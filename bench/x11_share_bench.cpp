// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/bare_loop.h"
#include "bench/meter/scenes.h"
#include "bench/meter/share_cost.h"
#include "bench/meter/x11_bench.h"
#include "platform/window_server.h"
#include "platform/x11/x11_window_server.h"

#include <screenshare/share_engine.h>

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

/// What the share of a desktop of 1920x1080 costs at 30 frames a second, by the default back-end and by a
/// capture session: CPU milliseconds a tick of this process and of the X server, without what the scene costs
/// the server anyway. Beside it a bare loop, which
/// fetches the whole desktop by shared memory as often and does nothing with it.

namespace {

using Clock = std::chrono::steady_clock;

/// What first frames cost is not looked at.
constexpr int FRAMES_BEFORE = 10;
constexpr std::chrono::seconds START_LIMIT{20};

/// Who looks at the desktop while it is measured.
class Watcher {
public:
    virtual ~Watcher() = default;
    virtual int FrameCount() const = 0;
};

// ---- The desktop share

/// Frames stay where they are, in their own memory.
class CountingSink final : public IShareCaptureEngineSink {
public:
    int Frames() const { return m_frames; }

    void OnCaptureData(IShareFrame* frame, TVLRect&) override { m_frames += frame != nullptr ? 1 : 0; }
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

private:
    std::atomic<int> m_frames{0};
};

/// Puts an X server in force as long as it lives. Nothing of it is left on the server afterwards.
class ServerInForce {
public:
    explicit ServerInForce(const std::string& display)
        : m_former(platform::ReplaceWindowServer(std::make_shared<platform::X11WindowServer>(display))) {}
    ~ServerInForce() { platform::ReplaceWindowServer(m_former); }
    ServerInForce(const ServerInForce&) = delete;
    ServerInForce& operator=(const ServerInForce&) = delete;

private:
    const std::shared_ptr<platform::WindowServer> m_former;
};

struct DestroyEngine {
    void operator()(IShareCaptureEngine* engine) const { DestroyShareCaptureEngine(engine); }
};

class DesktopShare {
public:
    DesktopShare(const std::string& display, SCREEN_CAPTURER_TYPE mode)
        : m_server(display),
          m_engine(CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)) {
        m_engine->SetCaptureFps(TICKS_PER_SECOND);
        if (m_engine->SetCaptureMode(mode) != SHARE_RESULT_OK || !ShareFirstMonitor() ||
            m_engine->SetSink(&m_sink) != SHARE_RESULT_OK || m_engine->Start() != SHARE_RESULT_OK)
            throw std::runtime_error("the share doesn't start");
    }

    int FrameCount() const { return m_sink.Frames(); }

private:
    bool ShareFirstMonitor() {
        IShareSourceEnumerator* const monitors =
            CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR, false);
        monitors->Refresh();
        IShareSource* source = nullptr;
        bool shared = monitors->GetSource(0, &source) == SHARE_RESULT_OK;
        if (shared) {
            shared = m_engine->AddCaptureShareSource(source) == SHARE_RESULT_OK;
            source->Release();
        }
        DestroyShareSourceEnumerator(monitors);
        return shared;
    }

    const ServerInForce m_server;
    CountingSink m_sink;
    const std::unique_ptr<IShareCaptureEngine, DestroyEngine> m_engine;
};

// ---- Who looks

class BareWatcher final : public Watcher {
public:
    explicit BareWatcher(const std::string& display) : m_loop(display) {}
    int FrameCount() const override { return m_loop.FrameCount(); }

private:
    const BareLoop m_loop;
};

class SessionShare final : public Watcher {
public:
    explicit SessionShare(const std::string& display) : m_share(display, SCREEN_CAPTURER_TYPE_AVFOUNDATION) {}
    int FrameCount() const override { return m_share.FrameCount(); }

private:
    const DesktopShare m_share;
};

class DefaultShare final : public Watcher {
public:
    explicit DefaultShare(const std::string& display) : m_share(display, SCREEN_CAPTURER_TYPE_DEFAULT) {}
    int FrameCount() const override { return m_share.FrameCount(); }

private:
    const DesktopShare m_share;
};

/// The scene on its own.
class Nobody final : public Watcher {
public:
    int FrameCount() const override { return 0; }
};

// ---- Measuring

void WaitForFrames(const Watcher& watcher, int count) {
    const Clock::time_point limit = Clock::now() + START_LIMIT;
    while (watcher.FrameCount() < count) {
        if (Clock::now() > limit)
            throw std::runtime_error("no frames come");
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
}

Cost Measure(const Watcher& watcher, pid_t server, double seconds) {
    return MeasureCost({getpid(), [&watcher] { return watcher.FrameCount(); }}, server, seconds);
}

class SceneBench {
public:
    SceneBench(const XServer& server, const BenchOptions& options) : m_server(server), m_options(options) {}

    void Run(const Scene& scene, const std::string& row, BenchResults& results) {
        SceneProcess playing(m_server.Display(), scene);
        Costs share;
        Costs session;
        Costs bare;
        std::vector<double> alone;
        for (int i = 0; i < m_options.repeats; ++i) {
            alone.push_back(Measure(Nobody(), m_server.Pid(), m_options.seconds).server);
            share.Add(MeasureOne<DefaultShare>(), alone.back());
            session.Add(MeasureOne<SessionShare>(), alone.back());
            bare.Add(MeasureOne<BareWatcher>(), alone.back());
        }
        if (!playing.IsPlaying())
            throw std::runtime_error("the scene has ended before its time");
        Tell(row, "share", share, SpreadOf(bare.total).median, results);
        Tell(row, "session", session, SpreadOf(bare.total).median, results);
        Tell(row, "bare", bare, SpreadOf(bare.total).median, results);
        std::printf("%-28s %-7s %8s %8.3f\n", row.c_str(), "scene", "", SpreadOf(alone).median);
        TellThreads(row, share);
        TellThreads(row, session);
        std::fflush(stdout);
    }

    static void TellHeader() {
        std::printf(
            "\nCPU ms a tick, medians of the repeats [lowest .. highest]\n%-28s %-7s %8s %8s %8s %20s "
            "%6s %6s\n",
            "", "", "client", "server", "total", "", "ratio", "fps");
    }

private:
    template <class Kind>
    Cost MeasureOne() const {
        const Kind watcher(m_server.Display());
        WaitForFrames(watcher, FRAMES_BEFORE);
        return Measure(watcher, m_server.Pid(), m_options.seconds);
    }

    static void Tell(const std::string& row, const char* who, const Costs& costs, double bareTotal,
                     BenchResults& results) {
        const Spread total = SpreadOf(costs.total);
        const double client = SpreadOf(costs.client).median;
        const double server = SpreadOf(costs.server).median;
        const double rate = SpreadOf(costs.framesPerSecond).median;
        std::printf("%-28s %-7s %8.3f %8.3f %8.3f [%8.3f ..%8.3f] %6.2f %6.1f\n", row.c_str(), who, client,
                    server, total.median, total.lowest, total.highest, total.median / bareTotal, rate);
        results.Add(row + "/" + who, {{"client_ms", client},
                                      {"server_ms", server},
                                      {"total_ms", total.median},
                                      {"total_ms_lowest", total.lowest},
                                      {"total_ms_highest", total.highest},
                                      {"ratio_to_bare", total.median / bareTotal},
                                      {"frames_per_second", rate}});
    }

    static void TellThreads(const std::string& row, const Costs& share) {
        std::printf("%-28s client by thread:", row.c_str());
        for (const auto& [thread, times] : share.clientByThread)
            std::printf(" %s %.3f", thread.c_str(), SpreadOf(times).median);
        std::printf("\n");
    }

    const XServer& m_server;
    const BenchOptions& m_options;
};

void RunOn(XServerOptions::Kind kind, const BenchOptions& options, BenchResults& results) {
    std::unique_ptr<XServer> server;
    for (const Scene& scene : MovingScenes()) {
        const std::string row = "x11_share/" + NameOf(kind) + "/" + scene.name;
        if (!options.Wants(row))
            continue;
        if (server == nullptr) {
            server = StartBenchServer(kind);
            if (server == nullptr)
                return;
            SceneBench::TellHeader();
        }
        SceneBench(*server, options).Run(scene, row, results);
    }
}

} // namespace

int main(int argc, char** argv) {
    if (const auto played = PlaySceneIfAsked(argc, argv))
        return *played;
    try {
        const BenchOptions options = ReadBenchOptions(argc, argv);
        BenchResults results;
        for (const auto kind : options.servers)
            RunOn(kind, options, results);
        return options.out.empty() || results.Write(options.out) ? EXIT_SUCCESS : EXIT_FAILURE;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "x11_share_bench: %s\n", failure.what());
        return EXIT_FAILURE;
    }
}
