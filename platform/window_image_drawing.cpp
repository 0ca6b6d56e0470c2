// SPDX-License-Identifier: Apache-2.0
#include "platform/window_image_drawing.h"

#include "platform/picture_changes.h"
#include "platform/window_image_layers.h"

#include <cmath>
#include <cstddef>
#include <optional>

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
    bool isWhole = true;
    for (std::size_t i = FirstSeenLayer(context, rect, *image); i < image->layers.size(); ++i) {
        const WindowLayer& layer = image->layers[i];
        CGContextSetAlpha(context, layer.alpha);
        isWhole &= CGContextDrawImage(context, PlaceOfLayer(layer, *image, rect), layer.image.get());
    }
    CGContextSetAlpha(context, 1);
    CGContextSetClip(context, clip);
    return isWhole;
}

bool WindowImageDrawing::Layer::IsAtSamePlaceAs(const Layer& other) const {
    return window == other.window && width == other.width && height == other.height &&
           layout == other.layout && place == other.place && alpha == other.alpha;
}

bool WindowImageDrawing::Describe(const CGContext* context, const CGRect& rect, const CGWindowImage* image) {
    Clear();
    if (context == nullptr || image == nullptr || !IsFiniteArea(rect))
        return false;
    const PixelBox whole{0, 0, CGBitmapContextGetWidth(context), CGBitmapContextGetHeight(context)};
    m_clip = CommonBox(CGContextBoxOf(context, rect), whole);
    m_layers.reserve(image->layers.size());
    for (const WindowLayer& layer : image->layers) {
        const Picture& picture = *layer.picture;
        if (picture.serial == 0) {
            Clear();
            return false;
        }
        m_layers.push_back({layer.window, picture.serial, picture.width, picture.height, layer.image->layout,
                            CGContextBoxOf(context, PlaceOfLayer(layer, *image, rect)), layer.alpha});
    }
    return true;
}

/// What is seen of a box, which may reach far beyond the context.
PixelRect WindowImageDrawing::Seen(const PixelBox& box) const {
    const PixelBox seen = CommonBox(box, m_clip);
    if (seen.IsEmpty())
        return {};
    return {static_cast<int>(seen.left), static_cast<int>(seen.top), static_cast<int>(seen.right),
            static_cast<int>(seen.bottom)};
}

bool WindowImageDrawing::AddChanges(const WindowImageDrawing& earlier, const CGWindowImage* image,
                                    PixelRegion& changes) const {
    if (image == nullptr || image->layers.size() != m_layers.size() ||
        earlier.m_layers.size() != m_layers.size() || earlier.m_clip != m_clip)
        return false;
    for (std::size_t i = 0; i < m_layers.size(); ++i) {
        const std::uint64_t before = earlier.m_layers[i].serial;
        if (!m_layers[i].IsAtSamePlaceAs(earlier.m_layers[i]))
            return false;
        if (m_layers[i].serial != before && !AddChangesOf(i, *image->layers[i].picture, before, changes))
            return false;
    }
    return true;
}

/// Those that no window in front hides.
bool WindowImageDrawing::AddChangesOf(std::size_t index, const Picture& picture, std::uint64_t earlier,
                                      PixelRegion& changes) const {
    const Layer& layer = m_layers[index];
    const std::optional<PixelRegion> changed = ChangesSince(picture, earlier);
    if (!changed || layer.IsScaled())
        return false;
    PixelRegion seen;
    for (const PixelRect& rect : changed->Rects()) {
        const std::int64_t x = layer.place.left;
        const std::int64_t y = layer.place.top;
        const PixelBox moved{x + rect.left, y + rect.top, x + rect.right, y + rect.bottom};
        seen.Add(Seen(CommonBox(moved, layer.place)));
    }
    for (std::size_t i = index + 1; i < m_layers.size() && !seen.IsEmpty(); ++i) {
        if (m_layers[i].IsOpaque())
            seen.Subtract(Seen(m_layers[i].place));
    }
    changes.Add(seen);
    return true;
}

bool WindowImageDrawing::CanDrawPart(const PixelRegion& part) const {
    for (const Layer& layer : m_layers) {
        if (!layer.IsScaled())
            continue;
        PixelRegion touched(Seen(layer.place));
        touched.Intersect(part);
        if (!touched.IsEmpty())
            return false;
    }
    return true;
}

} // namespace platform
