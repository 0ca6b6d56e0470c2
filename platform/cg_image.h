// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

namespace platform {

struct Picture;
enum class PixelFormat;

/// Bytes of a pixel in memory order, byte 0 first; in the last one, the bits of a little-endian 32-bit word,
/// high ones first. X carries nothing. Where there is alpha, the colours are premultiplied with it.
enum class CGPixelLayout {
    RGB,
    RGBX,
    RGBA,
    ARGB,
    BGRX,
    BGRA,
    X2R10G10B10,
};

/// A picture that nobody writes to any more, the top row first.
///
/// Made by the operations below and by CGBitmapContextCreateImage, which answer for the fields: sizes above
/// 0, rows at least as long as the pixels in them, memory that holds all rows.
/// Lifetime: shared; `memory` keeps the pixels and is let go of with the last reference.
/// Threads:  any.
struct CGImage {
    int width = 0; ///< Pixels.
    int height = 0;
    std::size_t bytesPerRow = 0; ///< From one row to the next; behind the last row there may be nothing.
    CGPixelLayout layout = CGPixelLayout::RGBA;
    const std::uint8_t* pixels = nullptr;
    std::shared_ptr<const void> memory;
};

using CGImageRef = std::shared_ptr<const CGImage>;

/// The bytes of an image.
using CGDataProvider = CGImage;
using CGDataProviderRef = CGImageRef;

/// Wraps pixels that `memory` keeps, without copying them. Null for a size below 1, rows too short for their
/// pixels, no pixels, and when memory runs out.
CGImageRef CGImageCreate(int width, int height, std::size_t bytesPerRow, CGPixelLayout layout,
                         const std::uint8_t* pixels, std::shared_ptr<const void> memory) noexcept;

/// The pixels of a window server's picture, not copied and pinned as long as the image lives. Null for null.
CGImageRef CGImageCreateWithPicture(std::shared_ptr<const Picture> picture) noexcept;

/// Pixels; 0 for null.
int CGImageGetWidth(const CGImage* image) noexcept;
int CGImageGetHeight(const CGImage* image) noexcept;
/// Bytes; 0 for null.
std::size_t CGImageGetBytesPerRow(const CGImage* image) noexcept;

CGDataProviderRef CGImageGetDataProvider(const CGImageRef& image) noexcept;

/// The pixels as they lie in memory, row after row without gaps. Empty for null and when memory runs out.
std::vector<std::uint8_t> CGDataProviderCopyData(const CGDataProviderRef& provider) noexcept;

/// Bytes.
/// How the pixels of a window server's picture lie.
CGPixelLayout CGPixelLayoutOf(PixelFormat format) noexcept;
std::size_t CGBytesPerPixel(CGPixelLayout layout) noexcept;
bool CGHasAlpha(CGPixelLayout layout) noexcept;
/// A pixel is of 4 bytes, and each of them is a component or nothing.
bool CGHasFourBytes(CGPixelLayout layout) noexcept;

} // namespace platform
