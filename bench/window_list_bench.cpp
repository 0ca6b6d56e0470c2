// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/scene.h"

#include <benchmark/benchmark.h>

#include <screenshare/share_engine.h>
#include <screenshare/share_window_info.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

/// What a picker's list of windows costs on a simulated desktop, by the number of windows: the ids alone, and
/// with what is told of each. `each` is the time for one window; its goal is 25 microseconds.

namespace {

constexpr pid_t FIRST_APP = 100;
constexpr int APPS = 8;
constexpr int DISPLAY_WIDTH = 1920;
constexpr int DISPLAY_HEIGHT = 1080;

class Ids final : public ITvlEnumWindowsCallback {
public:
    bool OnWindow(unsigned window) override {
        m_ids.push_back(window);
        return true;
    }
    const std::vector<unsigned>& All() const { return m_ids; }

private:
    std::vector<unsigned> m_ids;
};

std::shared_ptr<platform::SimulatedWindowServer> ServeWindows(int count) {
    platform::Scene scene;
    scene.Display(0, 0, DISPLAY_WIDTH, DISPLAY_HEIGHT);
    scene.Display(DISPLAY_WIDTH, 0, DISPLAY_WIDTH, DISPLAY_HEIGHT);
    for (int i = 0; i < count; ++i) {
        if (i % (count / APPS + 1) == 0)
            scene.App(FIRST_APP + i, "An application " + std::to_string(i));
        scene.Window(static_cast<unsigned>(i + 1))
            .At(static_cast<float>(i * 7 % DISPLAY_WIDTH), static_cast<float>(i * 5 % DISPLAY_HEIGHT), 800,
                600)
            .Titled("A document with a title of some length, number " + std::to_string(i));
    }
    return scene.Serve();
}

/// Lists the windows over and over; `tell` is called with each.
template <class Tell>
void List(benchmark::State& state, Tell tell) {
    const auto former = platform::ReplaceWindowServer(ServeWindows(static_cast<int>(state.range(0))));
    std::int64_t windows = 0;
    for ([[maybe_unused]] const auto turn : state) {
        Ids ids;
        TvlEnumWindows(&ids, SHARE_WINDOW_ENUM_NORMAL);
        for (const unsigned window : ids.All())
            tell(window);
        windows += static_cast<std::int64_t>(ids.All().size());
    }
    state.counters["each"] = benchmark::Counter(static_cast<double>(windows),
                                                benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
    platform::ReplaceWindowServer(former);
}

void ListWindows(benchmark::State& state) {
    List(state, [](unsigned) {});
}

void ListWindowsWithInfo(benchmark::State& state) {
    List(state, [](unsigned window) {
        ShareWindowInfo info{};
        info.structSize = sizeof info;
        benchmark::DoNotOptimize(ShareGetWindowInfo(window, &info));
    });
}

BENCHMARK(ListWindows)->Arg(10)->Arg(50)->Arg(200)->Unit(benchmark::kMicrosecond);
BENCHMARK(ListWindowsWithInfo)->Arg(10)->Arg(50)->Arg(200)->Unit(benchmark::kMicrosecond);

} // namespace
