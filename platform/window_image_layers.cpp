// SPDX-License-Identifier: Apache-2.0
#include "platform/window_image_layers.h"

#include "platform/pixel_region.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <new>
#include <vector>

namespace platform {

namespace {

struct Span {
    double from = 0;
    double to = 0;
};

/// Whole pixels, so that two windows which meet still meet when they are scaled; at least one.
Span WholePixels(const Span& span) {
    const Span whole{std::floor(span.from + 0.5), std::floor(span.to + 0.5)};
    if (whole.from < whole.to)
        return whole;
    const double only = std::floor((span.from + span.to) / 2);
    return {only, only + 1};
}

CGRect RectOf(const Span& across, const Span& upwards) {
    return {{static_cast<CGFloat>(across.from), static_cast<CGFloat>(upwards.from)},
            {static_cast<CGFloat>(across.to - across.from), static_cast<CGFloat>(upwards.to - upwards.from)}};
}

bool CoversClip(const CGContext* context, const CGRect& rect, const CGWindowImage& image,
                const WindowLayer& layer) {
    return layer.IsOpaque() &&
           CGContextBoxOf(context, PlaceOfLayer(layer, image, rect)).Contains(CGContextGetClip(context));
}

/// The front layer that leaves nothing of what is behind it in the clip, with which drawing can begin; the
/// one at the back without such.
std::size_t FirstSeenLayer(const CGContext* context, const CGRect& rect, const CGWindowImage& image) {
    for (std::size_t i = image.layers.size(); i > 1; --i) {
        if (CoversClip(context, rect, image, image.layers[i - 1]))
            return i - 1;
    }
    return 0;
}

/// Below so many pixels it isn't worth finding out what is seen of each window.
constexpr std::int64_t FEW_PIXELS = 65536;
/// A window of which more rectangles are seen is drawn whole.
constexpr std::size_t MOST_SEEN_RECTS = 32;

/// Where a layer is drawn.
using SeenRects = std::vector<PixelRect>;

bool IsScaled(const PixelBox& box, const CGImage& image) {
    return box.Width() != image.width || box.Height() != image.height;
}

PixelRect ToRect(const PixelBox& box) {
    if (box.IsEmpty())
        return {};
    return {static_cast<int>(box.left), static_cast<int>(box.top), static_cast<int>(box.right),
            static_cast<int>(box.bottom)};
}

/// What is seen of each layer from that one on, where no opaque one in front hides it. Layers that are scaled
/// are drawn in the whole clip, if at all: in parts they would come out otherwise. And they hide nothing, as
/// they may fail to be drawn.
std::vector<SeenRects> FindSeen(const CGContext* context, const CGRect& rect, const CGWindowImage& image,
                                std::size_t first) {
    const PixelBox clip = CGContextGetClip(context);
    std::vector<SeenRects> seen(image.layers.size());
    PixelRegion open(ToRect(clip));
    for (std::size_t i = image.layers.size(); i > first; --i) {
        const WindowLayer& layer = image.layers[i - 1];
        const PixelBox box = CGContextBoxOf(context, PlaceOfLayer(layer, image, rect));
        const PixelRect place = ToRect(CommonBox(box, clip));
        PixelRegion part(place);
        part.Intersect(open);
        if (part.IsEmpty())
            continue;
        const bool isScaled = IsScaled(box, *layer.image);
        seen[i - 1] = part.Rects();
        if (isScaled || seen[i - 1].size() > MOST_SEEN_RECTS)
            seen[i - 1].assign(1, ToRect(clip));
        if (!isScaled && layer.IsOpaque())
            open.Subtract(place);
    }
    return seen;
}

/// Nothing where that isn't worth while, or there is no memory for it: all are drawn whole then.
std::vector<SeenRects> FindSeenIfWorthwhile(const CGContext* context, const CGRect& rect,
                                            const CGWindowImage& image, std::size_t first) noexcept {
    const PixelBox clip = CGContextGetClip(context);
    if (image.layers.size() - first < 2 || clip.IsEmpty() || clip.Width() * clip.Height() < FEW_PIXELS)
        return {};
    try {
        return FindSeen(context, rect, image, first);
    } catch (const std::bad_alloc&) {
        return {};
    }
}

bool DrawLayer(CGContext* context, const CGRect& place, const WindowLayer& layer, const SeenRects& seen) {
    bool isWhole = true;
    for (const PixelRect& each : seen) {
        CGContextSetClip(context, {each.left, each.top, each.right, each.bottom});
        isWhole &= CGContextDrawImage(context, place, layer.image.get());
    }
    return isWhole;
}

} // namespace

bool IsFiniteArea(const CGRect& rect) {
    return std::isfinite(rect.origin.x) && std::isfinite(rect.origin.y) && std::isfinite(rect.size.width) &&
           std::isfinite(rect.size.height) && rect.size.width > 0 && rect.size.height > 0;
}

CGRect PlaceOfLayer(const WindowLayer& layer, const CGWindowImage& image, const CGRect& target) {
    const PointEdges& seen = image.edges;
    const PointEdges& edges = layer.edges;
    const double x = target.origin.x;
    const double y = target.origin.y;
    const double width = target.size.width;
    const double height = target.size.height;
    const Span across{x + (edges.left - seen.left) / seen.Width() * width,
                      x + (edges.right - seen.left) / seen.Width() * width};
    const Span upwards{y + (seen.bottom - edges.bottom) / seen.Height() * height,
                       y + (seen.bottom - edges.top) / seen.Height() * height};
    return RectOf(WholePixels(across), WholePixels(upwards));
}

bool CGContextIsCovered(const CGContext* context, const CGRect& rect, const CGWindowImage* image) noexcept {
    if (context == nullptr || image == nullptr || image->layers.empty() || !IsFiniteArea(rect))
        return false;
    return CGContextBoxOf(context, rect).Contains(CGContextGetClip(context)) &&
           CoversClip(context, rect, *image, image->layers[FirstSeenLayer(context, rect, *image)]);
}

bool CGContextDrawWindowImage(CGContext* context, const CGRect& rect, const CGWindowImage* image) noexcept {
    if (context == nullptr || image == nullptr || !IsFiniteArea(rect))
        return true;
    const PixelBox clip = CGContextGetClip(context);
    CGContextClipToRect(context, rect);
    const PixelBox inner = CGContextGetClip(context);
    const std::size_t first = FirstSeenLayer(context, rect, *image);
    const std::vector<SeenRects> seen = FindSeenIfWorthwhile(context, rect, *image, first);
    bool isWhole = true;
    for (std::size_t i = first; i < image->layers.size(); ++i) {
        const WindowLayer& layer = image->layers[i];
        const CGRect place = PlaceOfLayer(layer, *image, rect);
        CGContextSetAlpha(context, layer.alpha);
        if (seen.empty())
            isWhole &= CGContextDrawImage(context, place, layer.image.get());
        else
            isWhole &= DrawLayer(context, place, layer, seen[i]);
        CGContextSetClip(context, inner);
    }
    CGContextSetAlpha(context, 1);
    CGContextSetClip(context, clip);
    return isWhole;
}

} // namespace platform
