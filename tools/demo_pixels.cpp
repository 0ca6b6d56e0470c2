// SPDX-License-Identifier: Apache-2.0
#include "tools/demo_pixels.h"

#include "platform/bitmap_context.h"
#include "platform/simulated/scene.h"
#include "platform/window_server.h"
#include "util/cm_clock.h"

#include <poll.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstddef>
#include <cstring>
#include <memory>
#include <utility>

namespace {

constexpr std::chrono::seconds SCREEN_PATIENCE{1};
constexpr int SCREEN_PAUSE_MS = 20;

/// Of what lies beside monitors of different sizes.
constexpr float NO_MONITOR_GREY = 0.82F;

/// Red, green, blue and a byte without meaning, row after row.
struct DemoBitmap {
    DemoBitmap(int columns, int rows)
        : width(columns),
          height(rows),
          pixels(static_cast<std::size_t>(columns) * static_cast<std::size_t>(rows) * 4),
          context(platform::CGBitmapContextCreate(pixels.data(), pixels.size(), columns, rows, 8, columns * 4,
                                                  platform::kCGImageAlphaNoneSkipLast)) {}

    /// `rect` counts from the top.
    bool Draw(const platform::CGRect& rect, const platform::CGImage& image) {
        const float bottom = static_cast<float>(height) - rect.origin.y - rect.size.height;
        return platform::CGContextDrawImage(context.get(), {{rect.origin.x, bottom}, rect.size}, &image);
    }

    void Fill(float grey) {
        platform::CGContextSetRGBFillColor(context.get(), grey, grey, grey, 1);
        platform::CGContextFillRect(context.get(),
                                    {{0, 0}, {static_cast<float>(width), static_cast<float>(height)}});
    }

    const int width;
    const int height;
    std::vector<std::uint8_t> pixels;
    const platform::CGContextRef context;
};

platform::CGRect Union(const platform::CGRect& one, const platform::CGRect& other) {
    const float left = std::min(one.origin.x, other.origin.x);
    const float top = std::min(one.origin.y, other.origin.y);
    const float right = std::max(one.origin.x + one.size.width, other.origin.x + other.size.width);
    const float bottom = std::max(one.origin.y + one.size.height, other.origin.y + other.size.height);
    return {{left, top}, {right - left, bottom - top}};
}

std::unique_ptr<platform::DisplayStream> OpenScreen(platform::WindowServer& server, unsigned monitor) {
    for (const bool withPointer : {true, false}) {
        platform::DisplayStreamRequest request;
        request.display = monitor;
        request.withPointer = withPointer;
        if (platform::DisplayStreamResult result = server.OpenDisplayStream(request);
            result.stream != nullptr)
            return std::move(result.stream);
    }
    return nullptr;
}

platform::CGImageRef MonitorPicture(unsigned monitor) {
    const std::shared_ptr<platform::WindowServer> server = platform::CurrentWindowServer();
    const std::unique_ptr<platform::DisplayStream> stream = OpenScreen(*server, monitor);
    if (stream == nullptr)
        return nullptr;
    const auto end = CmSteadyNow() + SCREEN_PATIENCE;
    while (CmSteadyNow() < end) {
        const platform::DisplayPictureResult result = stream->TakeNewest(end);
        if (result.picture != nullptr)
            return platform::CGImageCreateWithPicture(result.picture);
        const bool mayCome = result.outcome == platform::PictureOutcome::Nothing ||
                             result.outcome == platform::PictureOutcome::Stale;
        if (!mayCome)
            return nullptr;
        poll(nullptr, 0, SCREEN_PAUSE_MS);
    }
    return nullptr;
}

} // namespace

PixelTally TallyPixels(const platform::CGImage* image) {
    PixelTally tally;
    if (image == nullptr)
        return tally;
    DemoBitmap bitmap(image->width, image->height);
    bitmap.Draw({{0, 0}, {static_cast<float>(image->width), static_cast<float>(image->height)}}, *image);
    const std::vector<std::uint8_t>& bytes = bitmap.pixels;
    for (std::size_t at = 0; at < bytes.size(); at += 4) {
        ++tally.pixels;
        tally.secret += platform::LooksSecret(bytes[at], bytes[at + 1], bytes[at + 2]) ? 1 : 0;
        tally.isPlain = tally.isPlain && std::memcmp(&bytes[at], bytes.data(), 3) == 0;
    }
    return tally;
}

platform::CGImageRef ScreenPicture(const std::vector<ListedMonitor>& monitors) {
    if (monitors.empty())
        return nullptr;
    if (monitors.size() == 1)
        return MonitorPicture(monitors.front().id);
    platform::CGRect whole = monitors.front().bounds;
    for (const ListedMonitor& monitor : monitors)
        whole = Union(whole, monitor.bounds);
    DemoBitmap bitmap(static_cast<int>(std::ceil(whole.size.width)),
                      static_cast<int>(std::ceil(whole.size.height)));
    bitmap.Fill(NO_MONITOR_GREY);
    for (const ListedMonitor& monitor : monitors) {
        const platform::CGImageRef picture = MonitorPicture(monitor.id);
        const platform::CGPoint corner{monitor.bounds.origin.x - whole.origin.x,
                                       monitor.bounds.origin.y - whole.origin.y};
        if (picture == nullptr || !bitmap.Draw({corner, monitor.bounds.size}, *picture))
            return nullptr;
    }
    return platform::CGBitmapContextCreateImage(bitmap.context.get());
}
