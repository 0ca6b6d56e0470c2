// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include <benchmark/benchmark.h>

#include <cstddef>
#include <vector>

/// What regions cost: each operation on regions of 1 to 1 000 rectangles, and the judgement of a whole window
/// stack.

namespace {

constexpr int kCellsInARow = 32;
constexpr int kCellSize = 40;
constexpr int kRectSize = 24;

/// Exactly `count` rectangles on a grid, none touching another.
TVLRegion Grid(int count, int shift) {
    TVLRegion region;
    for (int i = 0; i < count; ++i) {
        const int left = i % kCellsInARow * kCellSize + shift;
        const int top = i / kCellsInARow * kCellSize + shift;
        region.AddRect({left, top, left + kRectSize, top + kRectSize});
    }
    return region;
}

/// Lies across the middle of the grid.
TVLRect MiddleOfGrid(int count) {
    const int bottom = (count + kCellsInARow - 1) / kCellsInARow * kCellSize;
    return {kCellSize, bottom / 2 - kCellSize, kCellSize * kCellsInARow / 2, bottom / 2 + kCellSize};
}

int Count(const benchmark::State& state) {
    return static_cast<int>(state.range(0));
}

/// Each turn starts from a fresh copy, the cost of which is that of CopyRgn below.
template <class Change>
void MeasureChange(benchmark::State& state, Change change) {
    const TVLRegion start = Grid(Count(state), 0);
    TVLRegion region;
    for ([[maybe_unused]] const auto turn : state) {
        region.CopyRgn(start);
        benchmark::DoNotOptimize(change(region));
    }
}

void BM_CopyRgn(benchmark::State& state) {
    MeasureChange(state, [](TVLRegion&) { return true; });
}

void BM_AddRect(benchmark::State& state) {
    const TVLRect rect = MiddleOfGrid(Count(state));
    MeasureChange(state, [&](TVLRegion& region) { return region.AddRect(rect); });
}

void BM_ExcludeRect(benchmark::State& state) {
    const TVLRect rect = MiddleOfGrid(Count(state));
    MeasureChange(state, [&](TVLRegion& region) { return region.ExcludeRect(rect); });
}

template <RegionCombinOpt option>
void BM_CombineRgn(benchmark::State& state) {
    const TVLRegion other = Grid(Count(state), kRectSize / 2);
    MeasureChange(state, [&](TVLRegion& region) { return region.CombineRgn(other, option); });
}

void BM_ProjectRgn(benchmark::State& state) {
    MeasureChange(state, [](TVLRegion& region) { return region.ProjectRgn({7, 11, 0, 0}, 0.5F); });
}

void BM_Equality(benchmark::State& state) {
    const TVLRegion left = Grid(Count(state), 0);
    const TVLRegion right = Grid(Count(state), 0);
    for ([[maybe_unused]] const auto turn : state)
        benchmark::DoNotOptimize(left == right);
}

void BM_GetRects(benchmark::State& state) {
    const TVLRegion region = Grid(Count(state), 0);
    std::vector<TVLRect> rects;
    for ([[maybe_unused]] const auto turn : state) {
        rects.clear();
        benchmark::DoNotOptimize(region.GetRects(rects));
    }
}

void BM_GetRgnBox(benchmark::State& state) {
    const TVLRegion region = Grid(Count(state), 0);
    TVLRect box{};
    for ([[maybe_unused]] const auto turn : state)
        benchmark::DoNotOptimize(region.GetRgnBox(box));
}

void BM_ToString(benchmark::State& state) {
    const TVLRegion region = Grid(Count(state), 0);
    for ([[maybe_unused]] const auto turn : state)
        benchmark::DoNotOptimize(region.ToString());
}

BENCHMARK(BM_CopyRgn)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_AddRect)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_ExcludeRect)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_CombineRgn<REGION_COMBINE_AND>)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_CombineRgn<REGION_COMBINE_COPY>)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_CombineRgn<REGION_COMBINE_DIFF>)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_CombineRgn<REGION_COMBINE_OR>)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_CombineRgn<REGION_COMBINE_XOR>)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_ProjectRgn)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_Equality)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_GetRects)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_GetRgnBox)->RangeMultiplier(10)->Range(1, 1000);
BENCHMARK(BM_ToString)->RangeMultiplier(10)->Range(1, 1000);

} // namespace
