// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/simulated/simulated_content.h"
#include "platform/window_server.h"

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

/// Pixel work of the simulated desktop. It shares none with the library above, which is tested by it.
namespace platform {

/// 0xAARRGGBB, premultiplied, rows without gaps.
struct SimulatedPixels {
    int width = 0;
    int height = 0;
    std::vector<std::uint32_t> argb;

    std::uint32_t* Row(int y) { return argb.data() + Offset(y); }
    const std::uint32_t* Row(int y) const { return argb.data() + Offset(y); }

    bool operator==(const SimulatedPixels&) const = default;

private:
    std::size_t Offset(int y) const { return static_cast<std::size_t>(y) * static_cast<std::size_t>(width); }
};

using SimulatedPixelsPtr = std::shared_ptr<const SimulatedPixels>;

/// Transparent. Throws std::length_error beyond 64 million pixels: nobody has such a window.
SimulatedPixels NewPixels(int width, int height);

/// Whole pixels that so many points take up, rounded; 0 for nothing and less.
int PixelsAcross(float points, float scale);

void PaintContent(const SimulatedContent& content, std::uint64_t frame, const PixelRect& where,
                  SimulatedPixels& target);

/// Lays all of `source`, stretched to `where` and faded by `alpha` (0 to 255), over `target`, clipped to it.
void LayOver(const SimulatedPixels& source, const PixelRect& where, std::uint32_t alpha,
             SimulatedPixels& target);

/// What has become different, in bands of rows; everything when the sizes differ.
std::vector<PixelRect> DifferentRects(const SimulatedPixels& before, const SimulatedPixels& after);

/// How a picture of those pixels looks to whoever gets it. X layouts drop the alpha.
struct SimulatedPictureShape {
    PixelFormat format = PixelFormat::BGRA;
    std::size_t rowGap = 0; ///< Bytes behind each row.
    CGRect rect;
    float scale = 1.0F;
};
Picture MakePicture(const SimulatedPixels& pixels, const SimulatedPictureShape& shape,
                    std::chrono::nanoseconds time);

} // namespace platform
