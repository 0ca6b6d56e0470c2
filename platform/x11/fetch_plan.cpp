// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/fetch_plan.h"

#include <algorithm>

namespace platform::x11 {

namespace {

std::size_t AreaOf(const PixelRect& rect) {
    return static_cast<std::size_t>(rect.right - rect.left) *
           static_cast<std::size_t>(rect.bottom - rect.top);
}

PixelRect Around(const PixelRect& one, const PixelRect& other) {
    return {std::min(one.left, other.left), std::min(one.top, other.top), std::max(one.right, other.right),
            std::max(one.bottom, other.bottom)};
}

/// Neighbours become one where that adds no more than `waste` pixels.
std::vector<PixelRect> Merged(const std::vector<PixelRect>& rects, std::size_t waste) {
    std::vector<PixelRect> merged;
    for (const PixelRect& rect : rects) {
        if (!merged.empty()) {
            const PixelRect both = Around(merged.back(), rect);
            if (AreaOf(both) <= AreaOf(merged.back()) + AreaOf(rect) + waste) {
                merged.back() = both;
                continue;
            }
        }
        merged.push_back(rect);
    }
    return merged;
}

} // namespace

std::vector<PixelRect> FewerRects(const std::vector<PixelRect>& rects, std::size_t most) {
    std::size_t waste = PIXELS_WORTH_A_READ;
    std::vector<PixelRect> fewer = Merged(rects, waste);
    while (fewer.size() > most) {
        waste *= 4;
        fewer = Merged(fewer, waste);
    }
    return fewer;
}

} // namespace platform::x11
