// SPDX-License-Identifier: Apache-2.0
// Fills and scaled draws on memory of ours, each against a yardstick that does the same to the same bytes
// without a context around it. Both run in turns; `ratio` is the quicker half of ours over the quicker half
// of the yardstick.
#include "platform/bitmap_context.h"

#include <benchmark/benchmark.h>

#include <libyuv.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <ctime>
#include <memory>
#include <numeric>
#include <utility>
#include <vector>

namespace {

using namespace platform;
using Bytes = std::vector<std::uint8_t>;

constexpr int WIDTH = 1920;
constexpr int HEIGHT = 1080;

Bytes Noise(int width, int height) {
    Bytes bytes(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4);
    std::uint32_t state = 1;
    for (std::uint8_t& byte : bytes) {
        state = state * 1664525 + 1013904223;
        byte = static_cast<std::uint8_t>(state >> 24);
    }
    return bytes;
}

/// Noise whose last byte of each pixel, which may be its alpha, is 255.
Bytes OpaqueNoise(int width, int height) {
    Bytes bytes = Noise(width, height);
    for (std::size_t i = 3; i < bytes.size(); i += 4)
        bytes[i] = 255;
    return bytes;
}

class Picture {
public:
    Picture(int width, int height, CGPixelLayout layout)
        : Picture(width, height, layout, Noise(width, height)) {}
    Picture(int width, int height, CGPixelLayout layout, Bytes pixels)
        : m_pixels(std::make_shared<Bytes>(std::move(pixels))),
          m_image(CGImageCreate(width, height, static_cast<std::size_t>(width) * 4, layout, m_pixels->data(),
                                m_pixels)) {}

    const CGImage* Image() const { return m_image.get(); }
    const std::uint8_t* Pixels() const { return m_pixels->data(); }

private:
    std::shared_ptr<Bytes> m_pixels;
    CGImageRef m_image;
};

class Canvas {
public:
    Canvas(int width, int height, unsigned bitmapInfo)
        : m_pixels(static_cast<std::size_t>(width) * static_cast<std::size_t>(height) * 4),
          m_context(CGBitmapContextCreate(m_pixels.data(), m_pixels.size(), width, height, 8, width * 4,
                                          bitmapInfo)) {
        CGContextSetInterpolationQuality(m_context.get(), kCGInterpolationHigh);
    }

    CGContext* Context() const { return m_context.get(); }
    Bytes& Pixels() { return m_pixels; }

private:
    Bytes m_pixels;
    CGContextRef m_context;
};

CGRect Whole(int width, int height) {
    return {{0, 0}, {static_cast<float>(width), static_cast<float>(height)}};
}

/// Of this thread's own time, so that a busy machine takes nothing from the comparison.
double SecondsWorked() {
    timespec time{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
}

template <class Work>
double Seconds(Work& work) {
    const double start = SecondsWorked();
    work();
    benchmark::ClobberMemory();
    return SecondsWorked() - start;
}

double QuickerHalf(std::vector<double>& times) {
    std::sort(times.begin(), times.end());
    times.resize((times.size() + 1) / 2);
    return std::accumulate(times.begin(), times.end(), 0.0);
}

template <class Work, class Yardstick>
void Compare(benchmark::State& state, Work work, Yardstick yardstick) {
    std::vector<double> ours;
    std::vector<double> theirs;
    while (state.KeepRunning()) {
        theirs.push_back(Seconds(yardstick));
        ours.push_back(Seconds(work));
        state.SetIterationTime(ours.back());
    }
    state.counters["ratio"] = QuickerHalf(ours) / QuickerHalf(theirs);
}

/// Goal: a ratio of at most 1.3.
void FillAgainstMemset(benchmark::State& state) {
    Canvas canvas(WIDTH, HEIGHT, kCGImageAlphaNoneSkipLast);
    CGContextSetRGBFillColor(canvas.Context(), 0, 0.62F, 0.62F, 1);
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextFillRect(canvas.Context(), Whole(WIDTH, HEIGHT)); },
        [&] { std::memset(other.data(), 0x9e, other.size()); });
}
BENCHMARK(FillAgainstMemset)->UseManualTime()->Unit(benchmark::kMicrosecond);

void ScaleByLibyuv(const Picture& picture, int fromWidth, int fromHeight, Bytes& target, int width,
                   int height) {
    libyuv::ARGBScale(picture.Pixels(), fromWidth * 4, fromWidth, fromHeight, target.data(), width * 4, width,
                      height, libyuv::kFilterBox);
}

/// Goal: a ratio of at most 1.2. The first argument is the layout of the source, the second that of the
/// target.
void DrawDownAgainstLibyuv(benchmark::State& state) {
    const Picture picture(2880, 1800, static_cast<CGPixelLayout>(state.range(0)));
    Canvas canvas(1920, 1200, static_cast<unsigned>(state.range(1)));
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextDrawImage(canvas.Context(), Whole(1920, 1200), picture.Image()); },
        [&] { ScaleByLibyuv(picture, 2880, 1800, other, 1920, 1200); });
}
BENCHMARK(DrawDownAgainstLibyuv)
    ->Args({static_cast<int>(CGPixelLayout::RGBX), kCGImageAlphaNoneSkipLast})
    ->Args({static_cast<int>(CGPixelLayout::BGRX), kCGImageAlphaNoneSkipLast})
    ->Args({static_cast<int>(CGPixelLayout::BGRX), kCGImageAlphaPremultipliedFirst})
    ->UseManualTime()
    ->Unit(benchmark::kMicrosecond);

/// To a third, where libyuv's own call takes one pixel of nine and ours takes them all; no goal.
void DrawToAThirdAgainstLibyuv(benchmark::State& state) {
    const Picture picture(3840, 2160, CGPixelLayout::BGRX);
    Canvas canvas(1280, 720, kCGImageAlphaNoneSkipLast);
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextDrawImage(canvas.Context(), Whole(1280, 720), picture.Image()); },
        [&] { ScaleByLibyuv(picture, 3840, 2160, other, 1280, 720); });
}
BENCHMARK(DrawToAThirdAgainstLibyuv)->UseManualTime()->Unit(benchmark::kMicrosecond);

/// No goal.
void DrawUpAgainstLibyuv(benchmark::State& state) {
    const Picture picture(1280, 720, CGPixelLayout::BGRX);
    Canvas canvas(WIDTH, HEIGHT, kCGImageAlphaNoneSkipLast);
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextDrawImage(canvas.Context(), Whole(WIDTH, HEIGHT), picture.Image()); },
        [&] { ScaleByLibyuv(picture, 1280, 720, other, WIDTH, HEIGHT); });
}
BENCHMARK(DrawUpAgainstLibyuv)->UseManualTime()->Unit(benchmark::kMicrosecond);

/// A picture in its own size against a plain copy of it; no goal.
void DrawUnscaledAgainstMemcpy(benchmark::State& state) {
    const Picture picture(WIDTH, HEIGHT, static_cast<CGPixelLayout>(state.range(0)));
    Canvas canvas(WIDTH, HEIGHT, kCGImageAlphaNoneSkipLast);
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextDrawImage(canvas.Context(), Whole(WIDTH, HEIGHT), picture.Image()); },
        [&] { std::memcpy(other.data(), picture.Pixels(), other.size()); });
}
BENCHMARK(DrawUnscaledAgainstMemcpy)
    ->Arg(static_cast<int>(CGPixelLayout::BGRX))
    ->Arg(static_cast<int>(CGPixelLayout::RGBX))
    ->Arg(static_cast<int>(CGPixelLayout::BGRA))
    ->UseManualTime()
    ->Unit(benchmark::kMicrosecond);

/// The same of a window that could be translucent and is not; no goal.
void DrawOpaqueAlphaAgainstMemcpy(benchmark::State& state) {
    const Picture picture(WIDTH, HEIGHT, CGPixelLayout::BGRA, OpaqueNoise(WIDTH, HEIGHT));
    Canvas canvas(WIDTH, HEIGHT, kCGImageAlphaNoneSkipLast);
    Bytes other(canvas.Pixels().size());
    Compare(
        state, [&] { CGContextDrawImage(canvas.Context(), Whole(WIDTH, HEIGHT), picture.Image()); },
        [&] { std::memcpy(other.data(), picture.Pixels(), other.size()); });
}
BENCHMARK(DrawOpaqueAlphaAgainstMemcpy)->UseManualTime()->Unit(benchmark::kMicrosecond);

} // namespace
