// SPDX-License-Identifier: Apache-2.0
#include "platform/av_foundation_painter.h"

#include "platform/bitmap_context.h"
#include "platform/cg_image.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace platform {

namespace {

int Nearest(double value) {
    return CmTruncate(std::floor(value + 0.5));
}

bool HasArea(const CGRect& rect) {
    return rect.size.width > 0 && rect.size.height > 0;
}

/// The part of a picture that a rectangle of its display covers.
PixelRect PartOf(const Picture& picture, const CGRect& crop) {
    if (!HasArea(crop))
        return {0, 0, picture.width, picture.height};
    const double scale = picture.scale;
    const double left = crop.origin.x;
    const double top = crop.origin.y;
    return {std::clamp(Nearest(left * scale), 0, picture.width),
            std::clamp(Nearest(top * scale), 0, picture.height),
            std::clamp(Nearest((left + crop.size.width) * scale), 0, picture.width),
            std::clamp(Nearest((top + crop.size.height) * scale), 0, picture.height)};
}

int Scaled(int size, double scale) {
    return std::max(Nearest(size * scale), 1);
}

/// The representation that needs the least scaling.
const Picture* BestRepresentation(const CursorImage& cursor, float scale) {
    const Picture* best = nullptr;
    for (const PicturePtr& each : cursor.representations) {
        if (each == nullptr || !(each->scale > 0))
            continue;
        if (best == nullptr || std::abs(each->scale - scale) < std::abs(best->scale - scale))
            best = each.get();
    }
    return best;
}

bool IsOn(const CGRect& place, const SampleGeometry& geometry) {
    return place.origin.x < static_cast<CGFloat>(geometry.width) && place.origin.x + place.size.width > 0 &&
           place.origin.y < static_cast<CGFloat>(geometry.height) && place.origin.y + place.size.height > 0;
}

/// Where the cursor's picture goes when its hot spot is at `position`.
CGRect PlaceOfPointer(const CGPoint& position, const CursorImage& cursor, const Picture& image,
                      const Picture& display, const SampleGeometry& geometry) {
    const double perPoint = display.scale * geometry.scale;
    const double width = image.width / static_cast<double>(image.scale) * perPoint;
    const double height = image.height / static_cast<double>(image.scale) * perPoint;
    const double left = (position.x - cursor.hotSpot.x - display.rect.origin.x) * perPoint -
                        geometry.part.left * geometry.scale;
    const double top = (position.y - cursor.hotSpot.y - display.rect.origin.y) * perPoint -
                       geometry.part.top * geometry.scale;
    return {{static_cast<CGFloat>(left), static_cast<CGFloat>(geometry.height - top - height)},
            {static_cast<CGFloat>(width), static_cast<CGFloat>(height)}};
}

CGImageRef PartAsImage(const std::shared_ptr<const Picture>& picture, const PixelRect& part) {
    const CGImageRef whole = CGImageCreateWithPicture(picture);
    if (whole == nullptr)
        return nullptr;
    const std::size_t offset = static_cast<std::size_t>(part.top) * whole->bytesPerRow +
                               static_cast<std::size_t>(part.left) * CGBytesPerPixel(whole->layout);
    return CGImageCreate(part.right - part.left, part.bottom - part.top, whole->bytesPerRow, whole->layout,
                         whole->pixels + offset, whole);
}

unsigned BitmapInfoOf(std::uint32_t format) {
    return format == kCVPixelFormatType_32ARGB ? kCGImageAlphaPremultipliedFirst
                                               : kCGImageAlphaPremultipliedLast;
}

} // namespace

std::optional<SampleGeometry> GeometryOfSample(const Picture& picture, const CGRect& crop, CGFloat scale) {
    SampleGeometry geometry;
    geometry.part = PartOf(picture, crop);
    const int width = geometry.part.right - geometry.part.left;
    const int height = geometry.part.bottom - geometry.part.top;
    if (width < 1 || height < 1)
        return std::nullopt;
    geometry.scale = scale;
    geometry.width = Scaled(width, geometry.scale);
    geometry.height = Scaled(height, geometry.scale);
    return geometry;
}

bool ShowsChange(const Picture& picture, const PixelRect& part) {
    return std::any_of(picture.changed.begin(), picture.changed.end(), [&part](const PixelRect& each) {
        return each.left < part.right && part.left < each.right && each.top < part.bottom &&
               part.top < each.bottom;
    });
}

std::optional<PointerOnSample> FindPointer(WindowServer& server, const Picture& picture,
                                           const SampleGeometry& geometry) {
    PointerOnSample pointer;
    CGPoint position;
    pointer.cursor = server.GetCursor();
    if (pointer.cursor == nullptr || !server.GetPointerPosition(position))
        return std::nullopt;
    pointer.picture = BestRepresentation(*pointer.cursor, picture.scale);
    if (pointer.picture == nullptr)
        return std::nullopt;
    pointer.place = PlaceOfPointer(position, *pointer.cursor, *pointer.picture, picture, geometry);
    if (!IsOn(pointer.place, geometry))
        return std::nullopt;
    return pointer;
}

bool PaintSample(const std::shared_ptr<const Picture>& picture, const SampleGeometry& geometry,
                 const std::optional<PointerOnSample>& pointer, std::uint32_t format, std::uint8_t* target) {
    const int rowBytes = geometry.width * 4;
    const std::size_t size = static_cast<std::size_t>(rowBytes) * static_cast<std::size_t>(geometry.height);
    const CGContextRef context = CGBitmapContextCreate(target, size, geometry.width, geometry.height, 8,
                                                       rowBytes, BitmapInfoOf(format));
    const CGImageRef image = PartAsImage(picture, geometry.part);
    if (context == nullptr || image == nullptr)
        return false;
    const CGRect all{{0, 0}, {static_cast<CGFloat>(geometry.width), static_cast<CGFloat>(geometry.height)}};
    CGContextSetInterpolationQuality(context.get(), kCGInterpolationHigh);
    // The memory was used before, and what isn't opaque would be laid over that.
    if (CGHasAlpha(image->layout))
        CGContextClearRect(context.get(), all);
    if (!CGContextDrawImage(context.get(), all, image.get()))
        return false;
    if (!pointer)
        return true;
    const CGImageRef cursor = CGImageCreateWithPicture(PicturePtr(pointer->cursor, pointer->picture));
    return cursor != nullptr && CGContextDrawImage(context.get(), pointer->place, cursor.get());
}

bool SampleBufferPool::HasBlock() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_inUse < BLOCKS;
}

SampleBufferPool::Block SampleBufferPool::Withdraw(std::size_t size) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (size != m_size)
        m_idle.clear();
    m_size = size;
    if (m_idle.empty())
        return nullptr;
    Block block = std::move(m_idle.back());
    m_idle.pop_back();
    return block;
}

std::shared_ptr<std::uint8_t> SampleBufferPool::Take(std::size_t size) {
    if (!HasBlock())
        return nullptr;
    Block block = Withdraw(size);
    if (block == nullptr)
        block = Block(new std::uint8_t[size]());
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        ++m_inUse;
    }
    // Also called when there is no memory for the share.
    return {block.release(),
            [pool = shared_from_this(), size](std::uint8_t* pixels) { pool->GiveBack(Block(pixels), size); }};
}

void SampleBufferPool::GiveBack(Block block, std::size_t size) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    --m_inUse;
    // There is room: all of them together are no more than were reserved for.
    if (size == m_size && m_idle.size() < static_cast<std::size_t>(BLOCKS))
        m_idle.push_back(std::move(block));
}

} // namespace platform
