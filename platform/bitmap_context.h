// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"
#include "platform/core_types.h"

#include <cstddef>
#include <cstdint>
#include <memory>

namespace platform {

/// How the pixels of a bitmap context lie in memory, 8 bits a component. The values of the first two with
/// alpha are those of the frame formats with the same order.
enum CGBitmapInfo : unsigned {
    kCGImageAlphaNone = 0,               ///< Red, green, blue: 3 bytes.
    kCGImageAlphaPremultipliedLast = 1,  ///< Red, green, blue, alpha.
    kCGImageAlphaPremultipliedFirst = 2, ///< Alpha, red, green, blue.
    kCGImageAlphaNoneSkipLast = 5, ///< Red, green, blue and a byte without meaning; painting sets it to 255.
};

/// How an image is scaled when it is drawn.
enum CGInterpolationQuality : int {
    kCGInterpolationDefault = 0, ///< Between the nearest pixels, whatever the scale.
    /// Likewise up and, for opaque images, down to a half; further down, each pixel is the mean of all that
    /// it stands for.
    kCGInterpolationHigh = 3,
};

/// Paints on the caller's memory.
///
/// The first byte belongs to the top left pixel, but coordinates count from the bottom left corner, y growing
/// upwards, one unit a pixel. Nothing is smoothed at edges: a rectangle is rounded to whole pixels, and one
/// that has an area covers at least one. A negative width or height counts from the other side; without an
/// area, or with NaN in it, a rectangle paints nothing. Coordinates are held within 32 bits; what lies
/// outside the context is left out. What is painted is there when the call comes back.
///
/// Lifetime: the memory must stay until the context ends; the context neither keeps nor frees it.
/// Threads:  one at a time.
/// Errors:   null for a context counts as one that nothing can be painted on: operations do nothing, getters
///           give 0. Where memory runs out, nothing or a part is painted. Nothing is traced or thrown.
class CGContext;

struct CGContextRelease {
    void operator()(const CGContext* context) const noexcept;
};

using CGContextRef = std::unique_ptr<CGContext, CGContextRelease>;

/// `capacity` is what there is at `data`, in bytes. Null when the last pixel would lie behind it, for null
/// data, a size below 1, other than 8 bits a component, rows too short for their pixels, and an info that is
/// none of the named.
CGContextRef CGBitmapContextCreate(std::uint8_t* data, std::size_t capacity, int width, int height,
                                   int bitsPerComponent, int bytesPerRow, unsigned bitmapInfo) noexcept;

/// A copy of what is there now. Null when memory runs out.
CGImageRef CGBitmapContextCreateImage(const CGContext* context) noexcept;

int CGBitmapContextGetWidth(const CGContext* context) noexcept;
int CGBitmapContextGetHeight(const CGContext* context) noexcept;
int CGBitmapContextGetBytesPerRow(const CGContext* context) noexcept;
std::uint8_t* CGBitmapContextGetData(const CGContext* context) noexcept;

/// Components from 0 to 1, not premultiplied; what lies outside is held at the ends, NaN counts as 0. A new
/// context fills with opaque black.
void CGContextSetRGBFillColor(CGContext* context, CGFloat red, CGFloat green, CGFloat blue,
                              CGFloat alpha) noexcept;

/// A new context has kCGInterpolationDefault.
void CGContextSetInterpolationQuality(CGContext* context, CGInterpolationQuality quality) noexcept;

/// How much of an image shows, from 0 to 1, on top of its own alpha; NaN counts as 0. A new context draws
/// images with 1. Fills have the alpha of their colour.
void CGContextSetAlpha(CGContext* context, CGFloat alpha) noexcept;

/// From now on nothing is painted outside `rect`, nor outside what was left before. It is rounded as in
/// painting; without an area nothing is painted at all.
void CGContextClipToRect(CGContext* context, const CGRect& rect) noexcept;

/// The whole context can be painted on again.
void CGContextResetClip(CGContext* context) noexcept;

/// Source over; with an opaque colour, the pixels become that colour with alpha 255.
void CGContextFillRect(CGContext* context, const CGRect& rect) noexcept;
void CGContextFillRects(CGContext* context, const CGRect* rects, std::size_t count) noexcept;

/// Sets all bytes of the pixels to 0.
void CGContextClearRect(CGContext* context, const CGRect& rect) noexcept;

/// Draws the whole image into `rect`, source over. An image that shows this context's own memory is not
/// allowed. An infinite rectangle draws nothing. False when memory ran out and something may be missing.
bool CGContextDrawImage(CGContext* context, const CGRect& rect, const CGImage* image) noexcept;

} // namespace platform
