// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics_images.h"

#include "platform/notices.h"
#include "platform/window_image_layers.h"
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

/// Nobody has a desktop of more pixels across.
constexpr int LONGEST_SIDE = 65535;

/// How often a fetch is begun whose windows were restacked under it.
constexpr int ATTEMPTS = 3;

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
std::vector<WindowLayer> SeenLayers(const WindowPicture& picture, const PointEdges& seen,
                                    std::span<const CGWindowID> windows) {
    std::vector<WindowLayer> layers;
    for (const PictureLayer& layer : picture.layers) {
        if (!IsFiniteArea(layer.frame) || !(layer.alpha > 0) || !IsListed(layer.window, windows))
            continue;
        WindowLayer one{layer.window, layer.picture, CGImageCreateWithPicture(layer.picture),
                        PointEdges(layer.frame), layer.alpha};
        if (one.image == nullptr || !one.edges.Touches(seen))
            continue;
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
    const PointEdges edges(rect);
    CGWindowImage image{edges, 0, 0, SeenLayers(picture, edges, windows), picture.pointer, picture.moment};
    float scale = image.layers.empty() ? 1.0F : 0.0F;
    for (const WindowLayer& layer : image.layers)
        scale = std::max(scale, layer.picture->scale);
    image.width = PixelsAcross(edges.Width(), scale);
    image.height = PixelsAcross(edges.Height(), scale);
    if (image.width > LONGEST_SIDE || image.height > LONGEST_SIDE)
        return nullptr;
    return std::make_shared<const CGWindowImage>(std::move(image));
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

std::optional<CGPoint> CGWindowImageGetPointer(const CGWindowImage* image) noexcept {
    return image != nullptr ? image->pointer : std::nullopt;
}

std::uint64_t CGWindowImageGetMoment(const CGWindowImage* image) noexcept {
    return image != nullptr ? image->moment : 0;
}

std::uint64_t CGWindowServerGetMoment() noexcept {
    return WindowServerInUse()->GetMoment();
}

bool CGWindowImageIsOpaque(const CGWindowImage* image) noexcept {
    return image != nullptr && !image->layers.empty() && image->layers.front().IsOpaque() &&
           image->layers.front().edges.Contains(image->edges);
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
