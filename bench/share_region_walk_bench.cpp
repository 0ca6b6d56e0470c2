// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include <benchmark/benchmark.h>

#include <cstddef>
#include <ctime>
#include <random>
#include <vector>

/// What the regions of a window walk cost: the stack is gone through from back to front, and each window
/// changes up to four regions. The goal is at most 25 microseconds a window in a stack of 1 000.

namespace {

/// Two displays side by side.
constexpr TVLRect kDesktop{0, 0, 5120, 1440};

struct WindowSizes {
    int smallest;
    int largest;
};
constexpr WindowSizes kWindows{200, 1200};
/// Tool tips and palettes: they hide little of each other, so the regions grow with every one of them.
constexpr WindowSizes kSmallWindows{40, 160};

int Pick(std::mt19937& random, int lowest, int highest) {
    return lowest + static_cast<int>(random() % static_cast<unsigned>(highest - lowest + 1));
}

std::vector<TVLRect> ScatteredWindows(int count, const WindowSizes& sizes) {
    std::mt19937 random(1);
    std::vector<TVLRect> windows;
    for (int i = 0; i < count; ++i) {
        const int width = Pick(random, sizes.smallest, sizes.largest);
        const int height = Pick(random, sizes.smallest, sizes.largest) * 2 / 3;
        const int left = Pick(random, kDesktop.left - width / 2, kDesktop.right - width / 2);
        const int top = Pick(random, kDesktop.top, kDesktop.bottom - height / 2);
        windows.push_back({left, top, left + width, top + height});
    }
    return windows;
}

/// The regions of one walk.
class Walk {
public:
    void Reset() {
        for (TVLRegion* region : {&m_overlap, &m_visible, &m_sharedWindow, &m_applications})
            region->SetRectRgn(0, 0, 0, 0);
    }
    void Keep(const TVLRect& window) {
        m_visible.AddRect(window);
        m_sharedWindow.AddRect(window);
        m_overlap.ExcludeRect(window);
        m_applications.AddRect(window);
    }
    void Hide(const TVLRect& window) {
        TVLRegion hidden;
        hidden.AddRect(window);
        hidden.CombineRgn(m_visible, REGION_COMBINE_AND);
        if (hidden.IsEmpty())
            return;
        m_overlap.CombineRgn(hidden, REGION_COMBINE_OR);
        m_visible.CombineRgn(hidden, REGION_COMBINE_DIFF);
    }
    void ClipTo(const TVLRegion& display) {
        for (TVLRegion* region : {&m_visible, &m_sharedWindow, &m_overlap})
            region->CombineRgn(display, REGION_COMBINE_AND);
    }
    std::size_t CountRects() const {
        std::vector<TVLRect> rects;
        for (const TVLRegion* region : {&m_overlap, &m_visible, &m_sharedWindow, &m_applications})
            region->GetRects(rects);
        return rects.size();
    }

private:
    TVLRegion m_overlap;
    TVLRegion m_visible;
    TVLRegion m_sharedWindow;
    TVLRegion m_applications;
};

/// Every `keptOf`-th window is kept.
void BM_Walk(benchmark::State& state, const WindowSizes& sizes, std::size_t keptOf) {
    const std::vector<TVLRect> windows = ScatteredWindows(static_cast<int>(state.range(0)), sizes);
    TVLRegion display;
    display.AddRect(kDesktop);
    Walk walk;
    // Processor time, as in the column of the table: others may be at work on the machine.
    const std::clock_t begin = std::clock();
    for ([[maybe_unused]] const auto turn : state) {
        walk.Reset();
        for (std::size_t i = 0; i < windows.size(); ++i)
            i % keptOf == 0 ? walk.Keep(windows[i]) : walk.Hide(windows[i]);
        walk.ClipTo(display);
    }
    const double us = static_cast<double>(std::clock() - begin) * 1e6 / CLOCKS_PER_SEC;
    state.counters["rects"] = static_cast<double>(walk.CountRects());
    state.counters["us_per_window"] =
        us / static_cast<double>(state.iterations()) / static_cast<double>(windows.size());
}

void OfEachSize(benchmark::internal::Benchmark* walk) {
    walk->RangeMultiplier(10)->Range(10, 1000)->Unit(benchmark::kMicrosecond);
}

BENCHMARK_CAPTURE(BM_Walk, windows_all_kept, kWindows, 1)->Apply(OfEachSize);
BENCHMARK_CAPTURE(BM_Walk, windows_half_kept, kWindows, 2)->Apply(OfEachSize);
BENCHMARK_CAPTURE(BM_Walk, small_windows_all_kept, kSmallWindows, 1)->Apply(OfEachSize);
BENCHMARK_CAPTURE(BM_Walk, small_windows_half_kept, kSmallWindows, 2)->Apply(OfEachSize);

} // namespace
