// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"
#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "util/cm_trace.h"

#include <benchmark/benchmark.h>

#include <sys/types.h>

#include <memory>
#include <random>

/// What a walk over a simulated desktop costs, by the number of windows: one that is made, silent and with
/// every line traced, and one that stands. The goal for 200 windows is 1 millisecond.

namespace {

constexpr pid_t SHARED_APP = 500;
constexpr pid_t OTHER_APP = 600;

struct WindowSizes {
    int smallest;
    int largest;
};
constexpr WindowSizes WINDOWS{200, 1200};
/// Tool tips and palettes: they hide little of each other, so the regions grow with every one of them.
constexpr WindowSizes SMALL_WINDOWS{40, 160};

constexpr int DISPLAY_WIDTH = 2560;
constexpr int DISPLAY_HEIGHT = 1440;

int Pick(std::mt19937& random, int lowest, int highest) {
    return lowest + static_cast<int>(random() % static_cast<unsigned>(highest - lowest + 1));
}

/// Two displays side by side, and scattered windows of two applications by turns.
std::shared_ptr<platform::SimulatedWindowServer> ServeWindows(int count, const WindowSizes& sizes) {
    platform::Scene scene;
    scene.Display(0, 0, DISPLAY_WIDTH, DISPLAY_HEIGHT).Reserving({0, 24, 0, 60});
    scene.Display(DISPLAY_WIDTH, 0, DISPLAY_WIDTH, DISPLAY_HEIGHT);
    std::mt19937 random(1);
    for (int i = 0; i < count; ++i) {
        const int width = Pick(random, sizes.smallest, sizes.largest);
        const int height = Pick(random, sizes.smallest, sizes.largest) * 2 / 3;
        const int left = Pick(random, -width / 2, 2 * DISPLAY_WIDTH - width / 2);
        const int top = Pick(random, 0, DISPLAY_HEIGHT - height / 2);
        scene.Window(static_cast<unsigned>(i + 1))
            .Of(i % 2 == 0 ? SHARED_APP : OTHER_APP)
            .At(static_cast<float>(left), static_cast<float>(top), static_cast<float>(width),
                static_cast<float>(height));
    }
    return scene.Serve();
}

enum class Desktop {
    AtRest,
    Changing, ///< Something is another before each walk.
};

void WalkOver(benchmark::State& state, SHARE_TYPE shareType, const WindowSizes& sizes, Desktop desktop) {
    const auto former = platform::ReplaceWindowServer(ServeWindows(static_cast<int>(state.range(0)), sizes));
    {
        ShareCapturerContextMac context;
        context.AddSharedDisplay(1);
        context.AddSharedDisplay(2);
        context.AddSharedApp(SHARED_APP);
        context.AddUnSharedApp(OTHER_APP);
        context.SetShareType(shareType);
        auto& rule = AppShareConfig::Instance()->m_bAppDisplayByWindow;
        for ([[maybe_unused]] const auto turn : state) {
            if (desktop == Desktop::Changing)
                rule = !rule;
            benchmark::DoNotOptimize(context.UpdateShareCapturerContext());
        }
    }
    platform::ReplaceWindowServer(former);
}

void Walk(benchmark::State& state, SHARE_TYPE shareType, const WindowSizes& sizes) {
    WalkOver(state, shareType, sizes, Desktop::Changing);
}

void WalkAtRest(benchmark::State& state, SHARE_TYPE shareType) {
    WalkOver(state, shareType, WINDOWS, Desktop::AtRest);
}

void WalkTraced(benchmark::State& state, SHARE_TYPE shareType, const WindowSizes& sizes) {
    CmSetTraceReceiver([](void*, int, const char*, const char*, int) {}, nullptr);
    CmSetTraceThreshold(CM_TRACE_DETAIL);
    Walk(state, shareType, sizes);
    CmSetTraceThreshold(-1);
    CmSetTraceReceiver(nullptr, nullptr);
}

void WindowCounts(benchmark::internal::Benchmark* bench) {
    for (const int count : {10, 50, 200, 1'000})
        bench->Arg(count);
    bench->Unit(benchmark::kMicrosecond);
}

BENCHMARK_CAPTURE(Walk, application, SHARE_TYPE_APP, WINDOWS)->Apply(WindowCounts);
BENCHMARK_CAPTURE(Walk, desktop, SHARE_TYPE_DESKTOP, WINDOWS)->Apply(WindowCounts);
BENCHMARK_CAPTURE(Walk, application_small_windows, SHARE_TYPE_APP, SMALL_WINDOWS)->Apply(WindowCounts);
BENCHMARK_CAPTURE(WalkAtRest, application, SHARE_TYPE_APP)->Apply(WindowCounts);
BENCHMARK_CAPTURE(WalkAtRest, desktop, SHARE_TYPE_DESKTOP)->Apply(WindowCounts);
BENCHMARK_CAPTURE(WalkTraced, application, SHARE_TYPE_APP, WINDOWS)->Apply(WindowCounts);

} // namespace
