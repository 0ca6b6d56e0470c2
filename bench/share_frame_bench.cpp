// SPDX-License-Identifier: Apache-2.0
// What a picture of 1920 by 1080 costs on its way through frames. The plain block copy is the yardstick.
#include "src/share_frame.h"

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

namespace {

constexpr int WIDTH = 1920;
constexpr int HEIGHT = 1080;
constexpr int PICTURE = WIDTH * HEIGHT * 4;

struct ReleaseReference {
    void operator()(CShareFrame* frame) const { frame->Release(); }
};
using Held = std::unique_ptr<CShareFrame, ReleaseReference>;

Held NewFrame() {
    Held frame(new CShareFrame);
    frame->AddRef();
    frame->SetFrameSize(WIDTH, HEIGHT);
    frame->SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    return frame;
}

std::vector<unsigned char> NewPicture() {
    return std::vector<unsigned char>(PICTURE, 0x5A);
}

void CountBytes(benchmark::State& state, std::int64_t bytes) {
    state.SetBytesProcessed(state.iterations() * bytes);
}

void PlainCopy(benchmark::State& state) {
    const auto source = NewPicture();
    auto target = NewPicture();
    while (state.KeepRunning()) {
        std::memcpy(target.data(), source.data(), PICTURE);
        benchmark::DoNotOptimize(target.data());
        benchmark::ClobberMemory();
    }
    CountBytes(state, PICTURE);
}
BENCHMARK(PlainCopy);

void WriteFrameData(benchmark::State& state) {
    const auto picture = NewPicture();
    const auto frame = NewFrame();
    while (state.KeepRunning())
        benchmark::DoNotOptimize(frame->WriteFrameData(picture.data(), PICTURE));
    CountBytes(state, PICTURE);
}
BENCHMARK(WriteFrameData);

void WriteFrameAreaData(benchmark::State& state) {
    const auto side = static_cast<int>(state.range(0));
    const auto picture = NewPicture();
    const auto frame = NewFrame();
    TVLRect rect{8, 8, 8 + side, 8 + side};
    while (state.KeepRunning())
        benchmark::DoNotOptimize(frame->WriteFrameAreaData(rect, picture.data(), PICTURE));
    CountBytes(state, std::int64_t{side} * side * 4);
}
BENCHMARK(WriteFrameAreaData)->Arg(32)->Arg(1024);

void CopyIShareFrame(benchmark::State& state) {
    const auto source = NewFrame();
    const auto target = NewFrame();
    while (state.KeepRunning())
        benchmark::DoNotOptimize(target->CopyIShareFrame(source.get()));
    CountBytes(state, PICTURE);
}
BENCHMARK(CopyIShareFrame);

void SwapOrCopy(benchmark::State& state) {
    const auto first = NewFrame();
    const auto second = NewFrame();
    while (state.KeepRunning())
        benchmark::DoNotOptimize(first->SwapOrCopy(second.get()));
}
BENCHMARK(SwapOrCopy);

void FirstPicture(benchmark::State& state) {
    while (state.KeepRunning())
        benchmark::DoNotOptimize(NewFrame());
}
BENCHMARK(FirstPicture);

} // namespace
