// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame.h"

#include <screenshare/share_graphic_util.h>

#include <benchmark/benchmark.h>

#include <cstddef>
#include <memory>

/// What it costs to lay a cursor over a frame of 1920 by 1080. The goal for 64 by 64 is 60 microseconds.

namespace {

constexpr int WIDTH = 1920;
constexpr int HEIGHT = 1080;

struct ReleaseReference {
    void operator()(CShareFrame* frame) const { frame->Release(); }
};
using Held = std::unique_ptr<CShareFrame, ReleaseReference>;

Held NewFrame(int width, int height) {
    Held frame(new CShareFrame);
    frame->AddRef();
    frame->SetFrameSize(width, height);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    return frame;
}

/// A disc: opaque inside, transparent in the corners, and a smooth edge of two pixels in between.
Held NewCursor(int side) {
    Held cursor = NewFrame(side, side);
    const int radius = side / 2;
    for (int y = 0; y < side; ++y) {
        for (int x = 0; x < side; ++x) {
            const int dx = x - radius;
            const int dy = y - radius;
            const int inside = radius * radius - dx * dx - dy * dy;
            const int alpha = inside > 2 * side ? 255 : inside < 0 ? 0 : inside * 255 / (2 * side);
            unsigned char* const pixel = cursor->GetFrameLineData(y) + x * 4;
            for (int i = 0; i < 4; ++i)
                pixel[i] = static_cast<unsigned char>(alpha);
        }
    }
    return cursor;
}

int Side(const benchmark::State& state) {
    return static_cast<int>(state.range(0));
}

void BM_BlendFrame(benchmark::State& state) {
    const Held frame = NewFrame(WIDTH, HEIGHT);
    const Held cursor = NewCursor(Side(state));
    for ([[maybe_unused]] const auto turn : state)
        benchmark::DoNotOptimize(TvlGraphicUtil::TvlAlphaBlend(frame.get(), 700, 500, cursor.get()));
}
BENCHMARK(BM_BlendFrame)->Arg(32)->Arg(64)->Arg(128)->Unit(benchmark::kMicrosecond);

void BM_BlendRaw(benchmark::State& state) {
    const Held frame = NewFrame(WIDTH, HEIGHT);
    const int side = Side(state);
    const Held cursor = NewCursor(side);
    for ([[maybe_unused]] const auto turn : state)
        benchmark::DoNotOptimize(TvlGraphicUtil::TvlAlphaBlend(
            frame->GetFrameData(), {WIDTH, HEIGHT}, {700, 500, 700 + side, 500 + side}, WIDTH * 4, false,
            false, cursor->GetFrameData(), {side, side}, {0, 0, side, side}, static_cast<unsigned>(side) * 4,
            true, true));
}
BENCHMARK(BM_BlendRaw)->Arg(32)->Arg(64)->Arg(128)->Unit(benchmark::kMicrosecond);

} // namespace
