// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/window_server.h"

#include <xcb/xcb.h>

#include <cstddef>
#include <cstdint>
#include <optional>

namespace platform::x11 {

/// How pixels of a depth and visual lie in what the server sends.
struct ServerPixels {
    enum class Packing {
        Whole, ///< Four bytes, as in `format`.
        R5G6B5,
        X1R5G5B5,
    };

    Packing packing = Packing::Whole;
    PixelFormat format = PixelFormat::BGRX; ///< In which they are given out.

    std::size_t BytesPerPixel() const { return packing == Packing::Whole ? 4 : 2; }
    /// Rows end at a multiple of 4 bytes.
    std::size_t BytesPerRow(int width) const {
        return (static_cast<std::size_t>(width) * BytesPerPixel() + 3) & ~std::size_t{3};
    }
    bool operator==(const ServerPixels&) const = default;
};

/// Nothing for what can't be given out: palettes, greys, depths other than 15, 16, 24, 30 and 32, orders that
/// nobody uses. Visual 0 means the one that is usual for the depth.
std::optional<ServerPixels> ServerPixelsOf(const xcb_setup_t& setup, const xcb_screen_t& screen,
                                           std::uint8_t depth, xcb_visualid_t visual);

/// The same with a byte for alpha, and without.
PixelFormat WithAlpha(PixelFormat format);
PixelFormat WithoutAlpha(PixelFormat format);

/// Writes the pixels of `part` in `format` to `target`, whose first row is `origin`'s, and leaves the others
/// alone. `format` is `from.format`, or that with alpha.
void DrawServerPixels(const ServerPixels& from, const std::uint8_t* source, std::size_t sourceStride,
                      const PixelRegion& part, PixelFormat format, std::uint8_t* target,
                      std::size_t targetStride, const PixelRect& origin);

} // namespace platform::x11
