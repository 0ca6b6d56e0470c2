// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/marker.h"

#include <algorithm>

namespace {

constexpr int HIGH = 0xC0;
constexpr int LOW = 0x40;
/// Less than this is what smoothed letters have.
constexpr int TINGE = 0x28;
/// Lossless but for scaling, and that leaves the middle of a plain area alone.
constexpr int NOTHING = 0x08;

bool IsNear(int value, int wanted) {
    return value > wanted - 0x18 && value < wanted + 0x18;
}

void CountShown(MarkerCount& count, int green, int blue) {
    if (green > 0xE0 && blue < NOTHING)
        ++count.menu;
    else if (IsNear(green, 0x60) && blue < NOTHING)
        ++count.terminal;
    else if (green < NOTHING && IsNear(blue, 0xC0))
        ++count.toolkit;
    else if (IsNear(green, 0xC0) && IsNear(blue, 0x60))
        ++count.browser;
}

int TingeOf(const std::uint8_t* pixel) {
    return std::min(pixel[0], pixel[2]) - pixel[1];
}

bool IsMagenta(const std::uint8_t* pixel) {
    return pixel[0] >= HIGH && pixel[2] >= HIGH && pixel[1] <= LOW;
}

const std::uint8_t* PixelAt(const MarkerPicture& picture, int x, int y) {
    return picture.pixels + static_cast<std::size_t>(y) * picture.stride + static_cast<std::size_t>(x) * 4 +
           static_cast<std::size_t>(picture.red);
}

/// What lies beyond the picture may be magenta, too.
bool HasMagentaAllAround(const MarkerPicture& picture, int x, int y) {
    for (int nearY = std::max(0, y - 1); nearY <= std::min(picture.height - 1, y + 1); ++nearY) {
        for (int nearX = std::max(0, x - 1); nearX <= std::min(picture.width - 1, x + 1); ++nearX) {
            if (TingeOf(PixelAt(picture, nearX, nearY)) < TINGE)
                return false;
        }
    }
    return true;
}

void CountMagenta(MarkerCount& count, const MarkerPicture& picture, int x, int y,
                  const std::function<bool(int, int)>& isShownInFront) {
    if (!IsMagenta(PixelAt(picture, x, y))) {
        ++count.mixed;
        return;
    }
    ++count.magenta;
    if (!HasMagentaAllAround(picture, x, y))
        return;
    ++count.inside;
    count.through += isShownInFront && isShownInFront(x, y) ? 1 : 0;
}

} // namespace

MarkerCount CountMarkers(const MarkerPicture& picture,
                         const std::function<bool(int x, int y)>& isShownInFront) {
    MarkerCount count;
    if (picture.pixels == nullptr)
        return count;
    for (int y = 0; y < picture.height; ++y) {
        const std::uint8_t* pixel = PixelAt(picture, 0, y);
        for (int x = 0; x < picture.width; ++x, pixel += 4) {
            if (TingeOf(pixel) >= TINGE)
                CountMagenta(count, picture, x, y, isShownInFront);
            else if (pixel[0] < NOTHING)
                CountShown(count, pixel[1], pixel[2]);
        }
    }
    count.all = static_cast<long>(picture.width) * picture.height;
    return count;
}

MarkerPicture MarkerPictureOf(const std::uint8_t* pixels, int width, int height, int lineBytes,
                              SHARE_FRAME_FORMAT format) {
    MarkerPicture picture;
    if (format != SHARE_FRAME_FORMAT_RGBA && format != SHARE_FRAME_FORMAT_ARGB)
        return picture;
    picture.pixels = pixels;
    picture.stride = static_cast<std::size_t>(lineBytes);
    picture.width = width;
    picture.height = height;
    picture.red = format == SHARE_FRAME_FORMAT_ARGB ? 1 : 0;
    return picture;
}
