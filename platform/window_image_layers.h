// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context_clip.h"
#include "platform/core_graphics_images.h"
#include "platform/window_server.h"

#include <optional>
#include <vector>

/// The insides of an image of windows, for what draws it and tells drawings apart.
namespace platform {

/// The edges of a rectangle.
struct PointEdges {
    double left = 0;
    double top = 0;
    double right = 0;
    double bottom = 0;

    explicit PointEdges(const CGRect& rect)
        : left(rect.origin.x),
          top(rect.origin.y),
          right(left + rect.size.width),
          bottom(top + rect.size.height) {}

    double Width() const { return right - left; }
    double Height() const { return bottom - top; }
    bool Contains(const PointEdges& other) const {
        return left <= other.left && top <= other.top && right >= other.right && bottom >= other.bottom;
    }
    bool Touches(const PointEdges& other) const {
        return left < other.right && other.left < right && top < other.bottom && other.top < bottom;
    }
};

struct WindowLayer {
    CGWindowID window = 0;
    PicturePtr picture;
    CGImageRef image; // of the picture
    PointEdges edges;
    float alpha = 1.0F;

    bool IsOpaque() const { return alpha >= 1.0F && !CGHasAlpha(image->layout); }
};

struct CGWindowImage {
    PointEdges edges;
    int width = 0;
    int height = 0;
    std::vector<WindowLayer> layers; // back to front, none of them wholly outside or hidden by a single other
    std::optional<CGPoint> pointer;
    std::uint64_t moment = 0;
};

/// Where a layer goes when all of the image goes to `target`: whole pixels of a bitmap context.
CGRect PlaceOfLayer(const WindowLayer& layer, const CGWindowImage& image, const CGRect& target);

/// Whether an image can be drawn into that rectangle at all.
bool IsFiniteArea(const CGRect& rect);

} // namespace platform
