// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/drawn_pointer.h"

#include "platform/cg_image.h"
#include "platform/pixel_rows.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cstddef>
#include <cstring>

namespace platform::x11 {

namespace {

/// One over another: `above` of 8 bits is premultiplied, `below` has 10 bits.
std::uint32_t Over(std::uint32_t above, std::uint32_t alpha, std::uint32_t below) {
    const std::uint32_t wide = above << 2 | above >> 6;
    return std::min(wide + (below * (255 - alpha) + 127) / 255, std::uint32_t{1023});
}

void DrawDeepRow(const std::uint8_t* bgra, std::uint8_t* target, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i, bgra += 4, target += 4) {
        std::uint32_t word = 0;
        std::memcpy(&word, target, sizeof word);
        const std::uint32_t red = Over(bgra[2], bgra[3], word >> 20 & 0x3FF);
        const std::uint32_t green = Over(bgra[1], bgra[3], word >> 10 & 0x3FF);
        const std::uint32_t blue = Over(bgra[0], bgra[3], word & 0x3FF);
        word = (word & 0xC0000000U) | red << 20 | green << 10 | blue;
        std::memcpy(target, &word, sizeof word);
    }
}

} // namespace

DrawnPointer PointerIn(const PixelRect& place, const std::optional<CGPoint>& pointer,
                       const std::shared_ptr<const CursorImage>& cursor) {
    if (!pointer || cursor == nullptr)
        return {};
    const Picture& image = *cursor->representations.front();
    const int left = CmTruncate(pointer->x - cursor->hotSpot.x) - place.left;
    const int top = CmTruncate(pointer->y - cursor->hotSpot.y) - place.top;
    const PixelRect rect{left, top, left + image.width, top + image.height};
    const bool outside = rect.right <= 0 || rect.bottom <= 0 || rect.left >= place.right - place.left ||
                         rect.top >= place.bottom - place.top;
    return outside ? DrawnPointer() : DrawnPointer{cursor, rect};
}

void DrawPointer(const DrawnPointer& pointer, const Picture& picture, std::uint8_t* pixels) {
    if (pointer.cursor == nullptr)
        return;
    const Picture& image = *pointer.cursor->representations.front();
    const int left = std::max(pointer.rect.left, 0);
    const int right = std::min(pointer.rect.right, picture.width);
    const int bottom = std::min(pointer.rect.bottom, picture.height);
    if (left >= right)
        return;
    const auto count = static_cast<std::size_t>(right - left);
    for (int y = std::max(pointer.rect.top, 0); y < bottom; ++y) {
        const std::uint8_t* const source = image.pixels +
                                           static_cast<std::size_t>(y - pointer.rect.top) * image.stride +
                                           static_cast<std::size_t>(left - pointer.rect.left) * 4;
        std::uint8_t* const target =
            pixels + static_cast<std::size_t>(y) * picture.stride + static_cast<std::size_t>(left) * 4;
        if (picture.format == PixelFormat::X2R10G10B10)
            DrawDeepRow(source, target, count);
        else
            DrawRow(CGPixelLayout::BGRA, source,
                    picture.format == PixelFormat::RGBX ? CGPixelLayout::RGBX : CGPixelLayout::BGRX, target,
                    count);
    }
}

} // namespace platform::x11
