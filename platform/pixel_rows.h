// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"

#include <cstddef>
#include <cstdint>

/// Work on single rows of pixels, for the raster code of this folder. Rows need no alignment.
namespace platform {

/// Rows are worked on in pieces of so many pixels where a place for them is needed in between.
constexpr std::size_t PIXELS_PER_PIECE = 256;

/// Turns pixels into another layout. A target with a byte for alpha gets 255 there unless the source has
/// alpha and the target takes it; one without drops it. No target is X2R10G10B10. `target` may be `source`
/// when both layouts have 4 bytes and the source isn't X2R10G10B10.
void ConvertRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
                std::size_t count) noexcept;

/// Lays premultiplied pixels over others, both in the layout of the target, in whose X byte the source has
/// its alpha: each component becomes source + target * (255 - alpha) / 255, rounded to the nearest.
void BlendRow(const std::uint8_t* source, CGPixelLayout layout, std::uint8_t* target,
              std::size_t count) noexcept;

/// Lays pixels of another layout over a row; copies where the source has no alpha.
void DrawRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
             std::size_t count) noexcept;

/// Rows that lie `stride` bytes apart.
struct PixelRowsIn {
    const std::uint8_t* pixels;
    std::size_t stride;

    const std::uint8_t* Row(std::size_t y) const { return pixels + y * stride; }
};
struct PixelRowsOut {
    std::uint8_t* pixels;
    std::size_t stride;

    std::uint8_t* Row(std::size_t y) const { return pixels + y * stride; }
};

/// Lays rows of `count` pixels over others, each as DrawRow does. Large pictures that have no alpha are
/// written past the processor's cache, which is too small for them. No row of the target may be one of the
/// source's.
void DrawRows(CGPixelLayout from, const PixelRowsIn& source, CGPixelLayout to, const PixelRowsOut& target,
              std::size_t count, std::size_t rows) noexcept;

/// The same as DrawRow, with all of the source faded to `alpha`/255.
void DrawFadedRow(CGPixelLayout from, const std::uint8_t* source, std::uint8_t alpha, CGPixelLayout to,
                  std::uint8_t* target, std::size_t count) noexcept;

/// Whether the loops may use the wider registers that the processor has, as they do at first; the pixels are
/// the same either way. For tests. Any thread.
void AllowWideLoops(bool allowed) noexcept;

} // namespace platform
