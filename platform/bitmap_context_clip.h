// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/core_types.h"

#include <cstdint>

/// Which pixels of a bitmap context are painted on, for who draws parts of pictures.
namespace platform {

/// Whole pixels from the top left corner; right and bottom exclusive. Wide enough for any two ends of 32
/// bits.
struct PixelBox {
    std::int64_t left = 0;
    std::int64_t top = 0;
    std::int64_t right = 0;
    std::int64_t bottom = 0;

    std::int64_t Width() const { return right - left; }
    std::int64_t Height() const { return bottom - top; }
    bool IsEmpty() const { return left >= right || top >= bottom; }
    bool Contains(const PixelBox& other) const {
        return left <= other.left && top <= other.top && right >= other.right && bottom >= other.bottom;
    }

    bool operator==(const PixelBox&) const = default;
};

PixelBox CommonBox(const PixelBox& one, const PixelBox& other) noexcept;

/// The pixels that painting `rect` covers, inside the context and outside. Empty for null.
PixelBox CGContextBoxOf(const CGContext* context, const CGRect& rect) noexcept;

/// Where the context can be painted on now. Empty for null.
PixelBox CGContextGetClip(const CGContext* context) noexcept;

/// From now on it can be painted on there and nowhere else, whatever was left before.
void CGContextSetClip(CGContext* context, const PixelBox& clip) noexcept;

} // namespace platform
