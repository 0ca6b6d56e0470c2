// SPDX-License-Identifier: Apache-2.0
#include "platform/bitmap_context.h"

#include "platform/bitmap_context_clip.h"
#include "platform/image_scaler.h"
#include "platform/pixel_rows.h"
#include "util/cm_numeric.h"

#include <libyuv.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <new>
#include <optional>
#include <vector>

namespace platform {

/// The pixels of a context, in the order of its memory: row 0 at the top.
class CGContext {
public:
    std::uint8_t* Pixel(std::int64_t x, std::int64_t y) const {
        return data + static_cast<std::size_t>(y) * static_cast<std::size_t>(bytesPerRow) +
               static_cast<std::size_t>(x) * CGBytesPerPixel(layout);
    }

    std::uint8_t* data = nullptr;
    int width = 0;
    int height = 0;
    int bytesPerRow = 0;
    CGPixelLayout layout = CGPixelLayout::RGBA;
    /// Premultiplied, in the layout of the pixels; where they have no alpha, it stands in the fourth byte.
    std::array<std::uint8_t, 4> fill{0, 0, 0, 255};
    std::uint8_t fillAlpha = 255;
    std::uint8_t imageAlpha = 255;
    PixelBox clip; // within the context
    CGInterpolationQuality quality = kCGInterpolationDefault;
};

namespace {

struct Extent {
    std::int64_t from = 0;
    std::int64_t to = 0;
};

std::optional<CGPixelLayout> LayoutOf(unsigned bitmapInfo) {
    switch (bitmapInfo) {
        case kCGImageAlphaNone:
            return CGPixelLayout::RGB;
        case kCGImageAlphaPremultipliedLast:
            return CGPixelLayout::RGBA;
        case kCGImageAlphaPremultipliedFirst:
            return CGPixelLayout::ARGB;
        case kCGImageAlphaNoneSkipLast:
            return CGPixelLayout::RGBX;
        default:
            return std::nullopt;
    }
}

int Round(double value) {
    return CmTruncate(std::floor(value + 0.5));
}

/// The pixels that a length along one axis covers: none, or at least one.
Extent RoundExtent(double origin, double length) {
    const double from = std::min(origin, origin + length);
    const double to = std::max(origin, origin + length);
    if (!(from < to))
        return {};
    const Extent extent{Round(from), Round(to)};
    if (extent.from < extent.to)
        return extent;
    const std::int64_t only = CmTruncate(std::floor((from + to) / 2));
    return {only, only + 1};
}

PixelBox BoxOf(const CGContext& context, const CGRect& rect) {
    const Extent across = RoundExtent(rect.origin.x, rect.size.width);
    const Extent upwards = RoundExtent(rect.origin.y, rect.size.height);
    return {across.from, context.height - upwards.to, across.to, context.height - upwards.from};
}

PixelBox Clip(const CGContext& context, const PixelBox& box) {
    return CommonBox(box, context.clip);
}

bool IsFinite(const CGRect& rect) {
    return std::isfinite(rect.origin.x) && std::isfinite(rect.origin.y) && std::isfinite(rect.size.width) &&
           std::isfinite(rect.size.height);
}

// ---- Filling

std::uint8_t ToByte(double component) {
    return static_cast<std::uint8_t>(std::lround(component * 255));
}

double Unit(CGFloat component) {
    return component > 0 ? std::min<double>(component, 1) : 0;
}

/// Sets whole pixels to the same bytes.
void Cover(const CGContext& context, const PixelBox& box, const std::array<std::uint8_t, 4>& pixel) {
    std::uint8_t* const first = context.Pixel(box.left, box.top);
    const int width = static_cast<int>(box.Width());
    const int height = static_cast<int>(box.Height());
    if (context.layout != CGPixelLayout::RGB) {
        std::uint32_t value = 0;
        std::memcpy(&value, pixel.data(), pixel.size());
        libyuv::ARGBRect(first, context.bytesPerRow, 0, 0, width, height, value);
        return;
    }
    for (int x = 0; x < width; ++x)
        std::memcpy(first + static_cast<std::size_t>(x) * 3, pixel.data(), 3);
    for (std::int64_t y = box.top + 1; y < box.bottom; ++y)
        std::memcpy(context.Pixel(box.left, y), first, static_cast<std::size_t>(width) * 3);
}

void LayFillOver(const CGContext& context, const PixelBox& box) {
    std::array<std::uint8_t, PIXELS_PER_PIECE * 4> piece{};
    for (std::size_t i = 0; i < piece.size(); ++i)
        piece[i] = context.fill[i % 4];
    for (std::int64_t y = box.top; y < box.bottom; ++y) {
        for (std::int64_t x = box.left; x < box.right; x += PIXELS_PER_PIECE) {
            const auto count = std::min<std::int64_t>(box.right - x, PIXELS_PER_PIECE);
            BlendRow(piece.data(), context.layout, context.Pixel(x, y), static_cast<std::size_t>(count));
        }
    }
}

// ---- Drawing

/// An image on its way into a context.
struct Drawing {
    CGContext& context;
    ScaleSource source;
    CGPixelLayout layout; // of the source
    PixelBox box;         // where the whole image goes
    PixelBox clip;        // the part of it that is seen

    ScaleFilter Filter() const {
        return context.quality == kCGInterpolationHigh ? ScaleFilter::Box : ScaleFilter::Bilinear;
    }
    std::uint8_t* Target(std::int64_t y) const { return context.Pixel(clip.left, y); }
    std::size_t Count() const { return static_cast<std::size_t>(clip.Width()); }
    /// All that is seen, not faded; `first` is the first pixel of it.
    void DrawRowsOf(const std::uint8_t* first) const {
        DrawRows(layout, {first, source.stride}, context.layout,
                 {Target(clip.top), static_cast<std::size_t>(context.bytesPerRow)}, Count(),
                 static_cast<std::size_t>(clip.Height()));
    }
    void DrawRowTo(std::int64_t y, const std::uint8_t* row) const {
        DrawFadedRow(layout, row, context.imageAlpha, context.layout, Target(y), Count());
    }
};

void DrawUnscaled(const Drawing& drawing) {
    const std::size_t left =
        static_cast<std::size_t>(drawing.clip.left - drawing.box.left) * CGBytesPerPixel(drawing.layout);
    const auto above = static_cast<std::size_t>(drawing.clip.top - drawing.box.top);
    const std::uint8_t* const first = drawing.source.pixels + above * drawing.source.stride + left;
    if (drawing.context.imageAlpha == 255) {
        drawing.DrawRowsOf(first);
        return;
    }
    for (std::int64_t y = drawing.clip.top; y < drawing.clip.bottom; ++y)
        drawing.DrawRowTo(y, first + static_cast<std::size_t>(y - drawing.clip.top) * drawing.source.stride);
}

/// Scales into the context itself and mends the order of the bytes there, a band at a time, while it is still
/// at hand. False when that is not possible, and nothing is drawn. Whether it is doesn't depend on the rows
/// that are seen, so that those of a part come out as in the whole.
bool DrawScaledInPlace(const Drawing& drawing) {
    constexpr int ROWS_PER_BAND = 16;
    const CGContext& context = drawing.context;
    const ScaleSource& source = drawing.source;
    const PixelBox& box = drawing.box;
    const PixelBox& clip = drawing.clip;
    if (CGHasAlpha(drawing.layout) || context.imageAlpha != 255 || context.layout == CGPixelLayout::RGB ||
        clip.left != box.left || clip.right != box.right || box.top < 0 ||
        !CanScaleDownRows(source, box.Width(), box.Height()))
        return false;
    const int width = static_cast<int>(box.Width());
    const int height = static_cast<int>(box.Height());
    for (std::int64_t y = clip.top; y < clip.bottom; y += ROWS_PER_BAND) {
        const std::int64_t end = std::min(y + ROWS_PER_BAND, clip.bottom);
        if (!ScaleDownRows(source, drawing.Target(box.top), static_cast<std::size_t>(context.bytesPerRow),
                           width, height, static_cast<int>(y - box.top), static_cast<int>(end - y),
                           drawing.Filter()))
            return false;
        for (std::int64_t row = y; row < end; ++row)
            ConvertRow(drawing.layout, drawing.Target(row), context.layout, drawing.Target(row),
                       drawing.Count());
    }
    return true;
}

void DrawScaled(const Drawing& drawing) {
    if (DrawScaledInPlace(drawing))
        return;
    const PixelBox& box = drawing.box;
    const PixelBox& clip = drawing.clip;
    RowScaler scaler(drawing.source, {box.Width(), clip.left - box.left, static_cast<int>(clip.Width())},
                     {box.Height(), clip.top - box.top, static_cast<int>(clip.Height())}, drawing.Filter());
    for (int y = 0; y < static_cast<int>(clip.Height()); ++y)
        drawing.DrawRowTo(clip.top + y, scaler.Row(y));
}

/// Only pixels of 4 component bytes can be scaled, so others are turned into such first.
void DrawScaledConverted(Drawing drawing) {
    if (CGHasFourBytes(drawing.layout)) {
        DrawScaled(drawing);
        return;
    }
    const auto width = static_cast<std::size_t>(drawing.source.width);
    const auto height = static_cast<std::size_t>(drawing.source.height);
    std::vector<std::uint8_t> converted(width * height * 4);
    for (std::size_t y = 0; y < height; ++y)
        ConvertRow(drawing.layout, drawing.source.pixels + y * drawing.source.stride, CGPixelLayout::RGBX,
                   converted.data() + y * width * 4, width);
    drawing.source.pixels = converted.data();
    drawing.source.stride = width * 4;
    drawing.layout = CGPixelLayout::RGBX;
    DrawScaled(drawing);
}

} // namespace

void CGContextRelease::operator()(const CGContext* context) const noexcept {
    delete context;
}

CGContextRef CGBitmapContextCreate(std::uint8_t* data, std::size_t capacity, int width, int height,
                                   int bitsPerComponent, int bytesPerRow, unsigned bitmapInfo) noexcept {
    const std::optional<CGPixelLayout> layout = LayoutOf(bitmapInfo);
    if (data == nullptr || width < 1 || height < 1 || bitsPerComponent != 8 || bytesPerRow < 1 || !layout)
        return nullptr;
    const std::size_t rowBytes = static_cast<std::size_t>(width) * CGBytesPerPixel(*layout);
    const std::size_t rowDistance = static_cast<std::size_t>(bytesPerRow);
    if (rowDistance < rowBytes || capacity < rowDistance * (static_cast<std::size_t>(height) - 1) + rowBytes)
        return nullptr;
    CGContextRef context(new (std::nothrow) CGContext);
    if (context == nullptr)
        return nullptr;
    context->data = data;
    context->width = width;
    context->height = height;
    context->bytesPerRow = bytesPerRow;
    context->layout = *layout;
    CGContextResetClip(context.get());
    CGContextSetRGBFillColor(context.get(), 0, 0, 0, 1);
    return context;
}

CGImageRef CGBitmapContextCreateImage(const CGContext* context) noexcept {
    if (context == nullptr)
        return nullptr;
    try {
        const std::size_t rowBytes =
            static_cast<std::size_t>(context->width) * CGBytesPerPixel(context->layout);
        const auto height = static_cast<std::size_t>(context->height);
        const std::shared_ptr<std::uint8_t[]> pixels(new std::uint8_t[rowBytes * height]);
        for (std::size_t y = 0; y < height; ++y)
            std::memcpy(pixels.get() + y * rowBytes, context->Pixel(0, static_cast<std::int64_t>(y)),
                        rowBytes);
        return CGImageCreate(context->width, context->height, rowBytes, context->layout, pixels.get(),
                             pixels);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

int CGBitmapContextGetWidth(const CGContext* context) noexcept {
    return context != nullptr ? context->width : 0;
}

int CGBitmapContextGetHeight(const CGContext* context) noexcept {
    return context != nullptr ? context->height : 0;
}

int CGBitmapContextGetBytesPerRow(const CGContext* context) noexcept {
    return context != nullptr ? context->bytesPerRow : 0;
}

std::uint8_t* CGBitmapContextGetData(const CGContext* context) noexcept {
    return context != nullptr ? context->data : nullptr;
}

void CGContextSetRGBFillColor(CGContext* context, CGFloat red, CGFloat green, CGFloat blue,
                              CGFloat alpha) noexcept {
    if (context == nullptr)
        return;
    const double opacity = Unit(alpha);
    const std::array<std::uint8_t, 4> rgba{ToByte(Unit(red) * opacity), ToByte(Unit(green) * opacity),
                                           ToByte(Unit(blue) * opacity), ToByte(opacity)};
    context->fillAlpha = rgba[3];
    context->fill = rgba;
    if (context->layout == CGPixelLayout::ARGB)
        context->fill = {rgba[3], rgba[0], rgba[1], rgba[2]};
}

void CGContextSetInterpolationQuality(CGContext* context, CGInterpolationQuality quality) noexcept {
    if (context != nullptr)
        context->quality = quality;
}

void CGContextSetAlpha(CGContext* context, CGFloat alpha) noexcept {
    if (context != nullptr)
        context->imageAlpha = ToByte(Unit(alpha));
}

void CGContextClipToRect(CGContext* context, const CGRect& rect) noexcept {
    if (context != nullptr)
        context->clip = Clip(*context, BoxOf(*context, rect));
}

void CGContextResetClip(CGContext* context) noexcept {
    if (context != nullptr)
        context->clip = {0, 0, context->width, context->height};
}

PixelBox CommonBox(const PixelBox& one, const PixelBox& other) noexcept {
    return {std::max(one.left, other.left), std::max(one.top, other.top), std::min(one.right, other.right),
            std::min(one.bottom, other.bottom)};
}

PixelBox CGContextBoxOf(const CGContext* context, const CGRect& rect) noexcept {
    return context != nullptr ? BoxOf(*context, rect) : PixelBox{};
}

PixelBox CGContextGetClip(const CGContext* context) noexcept {
    return context != nullptr ? context->clip : PixelBox{};
}

void CGContextSetClip(CGContext* context, const PixelBox& clip) noexcept {
    if (context != nullptr)
        context->clip = CommonBox(clip, {0, 0, context->width, context->height});
}

void CGContextFillRect(CGContext* context, const CGRect& rect) noexcept {
    if (context == nullptr)
        return;
    const PixelBox box = Clip(*context, BoxOf(*context, rect));
    if (box.IsEmpty())
        return;
    if (context->fillAlpha == 255)
        Cover(*context, box, context->fill);
    else
        LayFillOver(*context, box);
}

void CGContextFillRects(CGContext* context, const CGRect* rects, std::size_t count) noexcept {
    for (std::size_t i = 0; i < count && rects != nullptr; ++i)
        CGContextFillRect(context, rects[i]);
}

void CGContextClearRect(CGContext* context, const CGRect& rect) noexcept {
    if (context == nullptr)
        return;
    const PixelBox box = Clip(*context, BoxOf(*context, rect));
    if (!box.IsEmpty())
        Cover(*context, box, {0, 0, 0, 0});
}

bool CGContextDrawImage(CGContext* context, const CGRect& rect, const CGImage* image) noexcept {
    if (context == nullptr || image == nullptr || !IsFinite(rect) || context->imageAlpha == 0)
        return true;
    const PixelBox box = BoxOf(*context, rect);
    const PixelBox clip = Clip(*context, box);
    if (clip.IsEmpty())
        return true;
    const Drawing drawing{
        *context, {image->pixels, image->bytesPerRow, image->width, image->height}, image->layout, box, clip};
    try {
        if (box.Width() == image->width && box.Height() == image->height)
            DrawUnscaled(drawing);
        else
            DrawScaledConverted(drawing);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

} // namespace platform
