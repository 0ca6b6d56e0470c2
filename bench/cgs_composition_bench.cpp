// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"
#include "platform/simulated/scene.h"
#include "src/mac/cgs_composition.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_capture_engine_kinds.h"
#include "src/share_frame.h"
#include "src/share_ref.h"
#include "tests/support/forwarding_window_server.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_engine.h>

#include <benchmark/benchmark.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <utility>
#include <vector>

/// What it costs to compose a desktop of 1920x1080 into the two frames of an engine, which take turns: a
/// wallpaper and ten windows, of which one has painted since the pass before. The pictures are there already,
/// so that nothing but the composing is measured.

namespace {

std::atomic<long> g_allocations{0};

} // namespace

// Not inlined: a compiler that sees through them holds new and free for a mismatched pair.
[[gnu::noinline]] void* operator new(std::size_t size) {
    g_allocations.fetch_add(1, std::memory_order_relaxed);
    if (void* const memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}

[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}

[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace {

using namespace platform;

constexpr unsigned DISPLAY = 1;
constexpr int WIDTH = 1920;
constexpr int HEIGHT = 1080;
constexpr CGWindowID WALLPAPER = 1;
constexpr CGWindowID VIDEO = 11; // in front of all others
constexpr TVLSize SIZE{WIDTH, HEIGHT};

Scene Desk() {
    Scene scene;
    scene.Display(0, 0, WIDTH, HEIGHT).Pointer(700, 400).Cursor(ArrowCursor());
    scene.Window(WALLPAPER)
        .At(0, 0, WIDTH, HEIGHT)
        .Format(PixelFormat::BGRX)
        .Level(SIMULATED_LEVEL_DESKTOP)
        .Colour(0x204060);
    for (CGWindowID id = WALLPAPER + 1; id < VIDEO; ++id) {
        const auto step = static_cast<float>(id);
        scene.Window(id).At(60 * step, 40 * step, 800, 500).Format(PixelFormat::BGRX).Colour(0x101010 * id);
    }
    return scene.Window(VIDEO).At(300, 200, 1280, 720).Format(PixelFormat::BGRX).Colour(0x808080);
}

/// Gives the same pictures again and again, but for those of one window, which has painted.
class CCannedPictures final : public CForwardingWindowServer {
public:
    using CForwardingWindowServer::CForwardingWindowServer;

    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override {
        if (m_last == nullptr) {
            WindowPictureResult result = CForwardingWindowServer::TakeWindowPicture(request);
            m_last = result.picture != nullptr ? std::make_shared<WindowPicture>(*result.picture) : nullptr;
        } else if (m_painted) {
            Paint();
        }
        return {m_last != nullptr ? PictureOutcome::Ok : PictureOutcome::Failed, m_last};
    }

    /// What that window paints before each picture.
    void PaintEachTime(CGWindowID window, const PixelRect& rect) { m_painted = {window, PixelRegion(rect)}; }

private:
    /// The pixels need not be others: nobody knows that.
    void Paint() {
        for (PictureLayer& layer : m_last->layers) {
            if (layer.window != m_painted->first)
                continue;
            auto picture = std::make_shared<Picture>(*layer.picture);
            picture->serial = NextPictureSerial();
            picture->steps = StepsAfter(*layer.picture, m_painted->second);
            layer.picture = std::move(picture);
        }
    }

    std::shared_ptr<WindowPicture> m_last;
    std::optional<std::pair<CGWindowID, PixelRegion>> m_painted;
};

struct Case {
    const char* name;
    CGWindowID window; // 0: none paints
    PixelRect painted;
    bool keepsNotes;
    TVLSize size = SIZE; // of the frame
};

void Compose(benchmark::State& state, const Case& each) {
    const auto server = std::make_shared<CCannedPictures>(Desk().Serve());
    const CWindowServerScope scope(server);
    if (each.window != 0)
        server->PaintEachTime(each.window, each.painted);
    CShareCGSCapturer capturer(std::make_shared<ShareCapturerContextMac>());
    std::array<ShareRef<CShareFrame>, 2> frames{ShareRef<CShareFrame>(new CShareFrame),
                                                ShareRef<CShareFrame>(new CShareFrame)};
    for (const ShareRef<CShareFrame>& frame : frames) {
        if (each.keepsNotes)
            frame.Get()->AllowNote();
        for (int i = 0; i < 2; ++i)
            capturer.capture(frame.Get(), DISPLAY, each.size, each.size);
    }
    const long before = g_allocations.load();
    std::size_t next = 0;
    while (state.KeepRunning()) {
        if (capturer.capture(frames[next].Get(), DISPLAY, each.size, each.size) != SHARE_CAPTURE_OK)
            state.SkipWithError("no picture");
        next = 1 - next;
    }
    state.counters["allocations"] =
        static_cast<double>(g_allocations.load() - before) / static_cast<double>(state.iterations());
}

constexpr Case CASES[] = {
    {"nothing", 0, {}, true},
    {"typing", VIDEO, {100, 100, 400, 120}, true},
    {"video", VIDEO, {0, 0, 1280, 720}, true},
    {"all", WALLPAPER, {0, 0, WIDTH, HEIGHT}, true},
    {"from scratch", 0, {}, false},
    {"typing, scaled to two thirds", VIDEO, {100, 100, 400, 120}, true, {1280, 720}},
    {"video, scaled to two thirds", VIDEO, {0, 0, 1280, 720}, true, {1280, 720}},
    {"from scratch, scaled to two thirds", 0, {}, false, {1280, 720}},
    {"typing, scaled to a third", VIDEO, {100, 100, 400, 120}, true, {640, 360}},
};

class CIdleSink final : public IShareCaptureEngineSink {
public:
    void OnCaptureDisplaySizeChanged(TVLSize) override {}
    void OnCapturedWindowListChanged(const unsigned*, int) override {}
    void OnCaptureStatusChanged(int) override {}
    void OnCaptureData(IShareFrame*, TVLRect&) override { ++frames; }
    void OnCaptureError(int) override {}
    void OnCapturePositionChanged(int, int, int, int) override {}
    void OnCaptureEvent(int, int, void*) override {}

    long frames = 0;
};

/// An engine whose passes run on the thread of the benchmark: it counts as started and has no worker.
class CBenchedEngine final : public CShareCaptureDesktopEngine {
public:
    void BelieveStarted() { m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STARTED; }
};

/// A whole pass of an engine: with the walk, the duplicate check if it is wanted, and the sink.
void Pass(benchmark::State& state, bool checksDuplicates, const Case& each) {
    const auto server = std::make_shared<CCannedPictures>(Desk().Serve());
    const CWindowServerScope scope(server);
    if (each.window != 0)
        server->PaintEachTime(each.window, each.painted);
    CIdleSink sink;
    auto* const engine = new CBenchedEngine;
    engine->SelectSharedDisplay(DISPLAY);
    engine->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &checksDuplicates, sizeof checksDuplicates);
    engine->SetSink(&sink);
    engine->BelieveStarted();
    for (int i = 0; i < 4; ++i)
        CShareCaptureEngine::ThreadRun(engine);
    const long before = g_allocations.load();
    while (state.KeepRunning())
        CShareCaptureEngine::ThreadRun(engine);
    state.counters["allocations"] =
        static_cast<double>(g_allocations.load() - before) / static_cast<double>(state.iterations());
    if (sink.frames == 0)
        state.SkipWithError("no frame");
    engine->SetSink(nullptr);
    DestroyShareCaptureEngine(engine);
}

const bool g_isRegistered = [] {
    for (const Case& each : CASES)
        benchmark::RegisterBenchmark((std::string("Compose/") + each.name).c_str(), Compose, each)
            ->Unit(benchmark::kMicrosecond);
    benchmark::RegisterBenchmark("Pass/nothing", Pass, false, CASES[0])->Unit(benchmark::kMicrosecond);
    benchmark::RegisterBenchmark("Pass/nothing, duplicates held back", Pass, true, CASES[0])
        ->Unit(benchmark::kMicrosecond);
    benchmark::RegisterBenchmark("Pass/typing", Pass, false, CASES[1])->Unit(benchmark::kMicrosecond);
    return true;
}();

} // namespace
