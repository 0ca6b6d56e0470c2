// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics_images.h"

#include "platform/notices.h"
#include "platform/window_server.h"
#include "util/cm_clock.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <new>
#include <utility>
#include <vector>

namespace platform {

namespace {

/// Edges in points.
struct Edges {
    double left = 0;
    double top = 0;
    double right = 0;
    double bottom = 0;

    explicit Edges(const CGRect& rect)
        : left(rect.origin.x),
          top(rect.origin.y),
          right(left + rect.size.width),
          bottom(top + rect.size.height) {}

    double Width() const { return right - left; }
    double Height() const { return bottom - top; }
    bool Contains(const Edges& other) const {
        return left <= other.left && top <= other.top && right >= other.right && bottom >= other.bottom;
    }
    bool Touches(const Edges& other) const {
        return left < other.right && other.left < right && top < other.bottom && other.top < bottom;
    }
};

struct WindowLayer {
    CGImageRef image;
    Edges edges;
    float alpha = 1.0F;
    float scale = 1.0F;

    bool IsOpaque() const { return alpha >= 1.0F && !CGHasAlpha(image->layout); }
};

} // namespace

struct CGWindowImage {
    Edges edges;
    int width = 0;
    int height = 0;
    std::vector<WindowLayer> layers; // back to front, none of them wholly outside or hidden by a single other
};

namespace {

/// Nobody has a desktop of more pixels across.
constexpr int LONGEST_SIDE = 65535;

/// How often a fetch is begun whose windows were restacked under it.
constexpr int ATTEMPTS = 3;

bool IsFiniteArea(const CGRect& rect) {
    return std::isfinite(rect.origin.x) && std::isfinite(rect.origin.y) && std::isfinite(rect.size.width) &&
           std::isfinite(rect.size.height) && rect.size.width > 0 && rect.size.height > 0;
}

bool IsListed(CGWindowID window, std::span<const CGWindowID> windows) {
    return std::find(windows.begin(), windows.end(), window) != windows.end();
}

std::shared_ptr<const WindowPicture> TakePicture(WindowServer& server, const WindowPictureRequest& request) {
    for (int attempt = 0; attempt < ATTEMPTS; ++attempt) {
        WindowPictureResult result = server.TakeWindowPicture(request);
        if (result.outcome == PictureOutcome::Ok)
            return std::move(result.picture);
        if (result.outcome != PictureOutcome::Stale)
            return nullptr;
    }
    return nullptr;
}

/// What of a picture is seen. What wasn't asked for is left out even if a server gives it: no pixel of a
/// window may pass that the asker hasn't named.
std::vector<WindowLayer> SeenLayers(const WindowPicture& picture, const Edges& seen,
                                    std::span<const CGWindowID> windows) {
    std::vector<WindowLayer> layers;
    for (const PictureLayer& layer : picture.layers) {
        if (!IsFiniteArea(layer.frame) || !(layer.alpha > 0) || !IsListed(layer.window, windows))
            continue;
        WindowLayer one{CGImageCreateWithPicture(layer.picture), Edges(layer.frame), layer.alpha, 1.0F};
        if (one.image == nullptr || !one.edges.Touches(seen))
            continue;
        one.scale = layer.picture->scale;
        if (one.IsOpaque() && one.edges.Contains(seen))
            layers.clear();
        layers.push_back(std::move(one));
    }
    return layers;
}

int PixelsAcross(double points, float scale) {
    return std::max(CmTruncate(std::floor(points * scale + 0.5)), 1);
}

CGWindowImageRef MakeImage(const WindowPicture& picture, const CGRect& rect,
                           std::span<const CGWindowID> windows) {
    const Edges edges(rect);
    CGWindowImage image{edges, 0, 0, SeenLayers(picture, edges, windows)};
    float scale = image.layers.empty() ? 1.0F : 0.0F;
    for (const WindowLayer& layer : image.layers)
        scale = std::max(scale, layer.scale);
    image.width = PixelsAcross(edges.Width(), scale);
    image.height = PixelsAcross(edges.Height(), scale);
    if (image.width > LONGEST_SIDE || image.height > LONGEST_SIDE)
        return nullptr;
    return std::make_shared<const CGWindowImage>(std::move(image));
}

// ---- Drawing

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

/// Where a layer goes when all that is seen goes to `target`, which counts from the bottom.
CGRect PlaceOf(const Edges& layer, const Edges& seen, const CGRect& target) {
    const double x = target.origin.x;
    const double y = target.origin.y;
    const double width = target.size.width;
    const double height = target.size.height;
    const Span across{x + (layer.left - seen.left) / seen.Width() * width,
                      x + (layer.right - seen.left) / seen.Width() * width};
    const Span upwards{y + (seen.bottom - layer.bottom) / seen.Height() * height,
                       y + (seen.bottom - layer.top) / seen.Height() * height};
    return RectOf(WholePixels(across), WholePixels(upwards));
}

// ---- In one block

/// The part of a layer that an image of that size shows, not copied; null when it has to be drawn.
CGImageRef WrapPart(const WindowLayer& layer, const CGWindowImage& image) {
    const CGImage& whole = *layer.image;
    if (layer.alpha < 1.0F || !layer.edges.Contains(image.edges))
        return nullptr;
    const double perPointX = whole.width / layer.edges.Width();
    const double perPointY = whole.height / layer.edges.Height();
    const double left = (image.edges.left - layer.edges.left) * perPointX;
    const double top = (image.edges.top - layer.edges.top) * perPointY;
    const bool isUnscaled =
        image.edges.Width() * perPointX == image.width && image.edges.Height() * perPointY == image.height;
    if (!isUnscaled || left != std::floor(left) || top != std::floor(top))
        return nullptr;
    const auto x = static_cast<std::size_t>(left);
    const auto y = static_cast<std::size_t>(top);
    if (x + static_cast<std::size_t>(image.width) > static_cast<std::size_t>(whole.width) ||
        y + static_cast<std::size_t>(image.height) > static_cast<std::size_t>(whole.height))
        return nullptr;
    return CGImageCreate(image.width, image.height, whole.bytesPerRow, whole.layout,
                         whole.pixels + y * whole.bytesPerRow + x * CGBytesPerPixel(whole.layout),
                         layer.image);
}

CGImageRef DrawWhole(const CGWindowImage& image) {
    const auto rowBytes = static_cast<std::size_t>(image.width) * 4;
    const std::size_t size = rowBytes * static_cast<std::size_t>(image.height);
    const std::shared_ptr<std::uint8_t[]> pixels(new std::uint8_t[size]());
    const CGContextRef context =
        CGBitmapContextCreate(pixels.get(), size, image.width, image.height, 8, static_cast<int>(rowBytes),
                              kCGImageAlphaPremultipliedLast);
    CGContextSetInterpolationQuality(context.get(), kCGInterpolationHigh);
    const CGRect whole{{0, 0}, {static_cast<CGFloat>(image.width), static_cast<CGFloat>(image.height)}};
    if (context == nullptr || !CGContextDrawWindowImage(context.get(), whole, &image))
        return nullptr;
    return CGImageCreate(image.width, image.height, rowBytes, CGPixelLayout::RGBA, pixels.get(), pixels);
}

} // namespace

CGWindowImageRef CGWindowListTakeImage(const CGRect& rect, std::span<const CGWindowID> windows,
                                       unsigned options, bool keepsOut) noexcept {
    if (windows.empty() || !IsFiniteArea(rect))
        return nullptr;
    CGWindowImageRef image;
    CmCallGuarded("[CGWindowListTakeImage]>>exception: ", [&] {
        WindowPictureRequest request;
        request.keepsOut = keepsOut;
        request.windows.assign(windows.begin(), windows.end());
        request.rect = rect;
        request.options = options;
        request.deadline = CmSteadyNow() + DEFAULT_IMAGE_DEADLINE;
        if (const std::shared_ptr<const WindowPicture> picture = TakePicture(*WindowServerInUse(), request))
            image = MakeImage(*picture, rect, windows);
    });
    return image;
}

int CGWindowImageGetWidth(const CGWindowImage* image) noexcept {
    return image != nullptr ? image->width : 0;
}

int CGWindowImageGetHeight(const CGWindowImage* image) noexcept {
    return image != nullptr ? image->height : 0;
}

bool CGWindowImageIsOpaque(const CGWindowImage* image) noexcept {
    return image != nullptr && !image->layers.empty() && image->layers.front().IsOpaque() &&
           image->layers.front().edges.Contains(image->edges);
}

bool CGContextDrawWindowImage(CGContext* context, const CGRect& rect, const CGWindowImage* image) noexcept {
    if (context == nullptr || image == nullptr || !IsFiniteArea(rect))
        return true;
    CGContextClipToRect(context, rect);
    bool isWhole = true;
    for (const WindowLayer& layer : image->layers) {
        CGContextSetAlpha(context, layer.alpha);
        isWhole &= CGContextDrawImage(context, PlaceOf(layer.edges, image->edges, rect), layer.image.get());
    }
    CGContextSetAlpha(context, 1);
    CGContextResetClip(context);
    return isWhole;
}

CGImageRef CGWindowImageCreateImage(const CGWindowImage* image) noexcept {
    if (image == nullptr)
        return nullptr;
    try {
        if (image->layers.size() == 1) {
            if (CGImageRef part = WrapPart(image->layers.front(), *image))
                return part;
        }
        return DrawWhole(*image);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

CGImageRef CGWindowListCreateImageFromArray(const CGRect& rect, std::span<const CGWindowID> windows,
                                            unsigned options) noexcept {
    return CGWindowImageCreateImage(CGWindowListTakeImage(rect, windows, options, true).get());
}

} // namespace platform
