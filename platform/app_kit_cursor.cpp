// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"

#include "platform/notices.h"
#include "platform/one_per_process.h"
#include "platform/window_server.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <memory>
#include <mutex>
#include <utility>

namespace platform {

namespace {

/// Where the components of a pixel lie in its four bytes.
struct ByteOrder {
    std::size_t red;
    std::size_t blue;
    bool hasAlpha;
};

std::optional<ByteOrder> OrderOf(PixelFormat format) {
    switch (format) {
        case PixelFormat::RGBA:
            return ByteOrder{0, 2, true};
        case PixelFormat::RGBX:
            return ByteOrder{0, 2, false};
        case PixelFormat::BGRA:
            return ByteOrder{2, 0, true};
        case PixelFormat::BGRX:
            return ByteOrder{2, 0, false};
        case PixelFormat::X2R10G10B10:
            break;
    }
    return std::nullopt;
}

/// Bytes in the one order that everybody who reads a cursor's raw bytes expects. Null for a picture that
/// can't be a cursor.
CGImageRef CopyAsRGBA(const Picture& picture) {
    const std::optional<ByteOrder> order = OrderOf(picture.format);
    if (!order || picture.width < 1 || picture.height < 1 || picture.pixels == nullptr)
        return nullptr;
    const auto width = static_cast<std::size_t>(picture.width);
    const auto height = static_cast<std::size_t>(picture.height);
    const auto bytes = std::make_shared<std::vector<std::uint8_t>>(width * height * 4);
    std::uint8_t* to = bytes->data();
    for (std::size_t y = 0; y < height; ++y) {
        const std::uint8_t* from = picture.pixels + y * picture.stride;
        for (std::size_t x = 0; x < width; ++x, from += 4, to += 4) {
            to[0] = from[order->red];
            to[1] = from[1];
            to[2] = from[order->blue];
            to[3] = order->hasAlpha ? from[3] : 255;
        }
    }
    return CGImageCreate(picture.width, picture.height, width * 4, CGPixelLayout::RGBA, bytes->data(), bytes);
}

/// Null for a cursor without a picture that can be shown.
std::shared_ptr<const NSImage> ToImage(const CursorImage& cursor) {
    std::vector<NSImageRep> representations;
    CGSize size;
    for (const PicturePtr& picture : cursor.representations) {
        CGImageRef image = picture != nullptr ? CopyAsRGBA(*picture) : nullptr;
        if (image == nullptr)
            continue;
        representations.emplace_back(std::move(image));
        if (representations.size() == 1) {
            const float scale = picture->scale > 0 ? picture->scale : 1.0F;
            size = {representations[0].size().width / scale, representations[0].size().height / scale};
        }
    }
    if (representations.empty())
        return nullptr;
    return std::make_shared<const NSImage>(size, std::move(representations));
}

/// The image of the cursor seen last: the pointer is asked for at each frame, and changes rarely.
struct LastCursor {
    std::mutex mutex;
    std::weak_ptr<const CursorImage> cursor; // guarded by mutex
    std::shared_ptr<const NSImage> image;    // guarded by mutex
};

// While the library is loaded, so that no fork falls into the making.
[[maybe_unused]] const LastCursor& g_lastCursor = OnePerProcess<LastCursor>::Get();

std::shared_ptr<const NSImage> ImageOf(const std::shared_ptr<const CursorImage>& cursor) {
    LastCursor& last = OnePerProcess<LastCursor>::Get();
    const std::lock_guard<std::mutex> lock(last.mutex);
    if (last.cursor.lock() != cursor) {
        last.image = ToImage(*cursor);
        last.cursor = cursor;
    }
    return last.image;
}

} // namespace

NSImageRep::NSImageRep(CGImageRef image)
    : m_image(std::move(image)),
      m_size{static_cast<CGFloat>(m_image->width), static_cast<CGFloat>(m_image->height)} {}

NSImage::NSImage(CGSize size, std::vector<NSImageRep> representations)
    : m_size(size),
      m_representations(std::move(representations)) {}

const CGImageRef& NSImage::CGImageForProposedRect() const {
    const auto farness = [this](const NSImageRep& each) {
        return std::abs(each.size().width - m_size.width);
    };
    return std::min_element(
               m_representations.begin(), m_representations.end(),
               [&](const NSImageRep& one, const NSImageRep& other) { return farness(one) < farness(other); })
        ->CGImageForProposedRect();
}

std::optional<NSCursor> NSCursor::currentSystemCursor() noexcept {
    std::optional<NSCursor> current;
    CmCallGuarded("[NSCursor::currentSystemCursor]>>exception: ", [&] {
        const std::shared_ptr<const CursorImage> cursor = WindowServerInUse()->GetCursor();
        if (cursor == nullptr)
            return;
        if (std::shared_ptr<const NSImage> image = ImageOf(cursor))
            current = NSCursor(std::move(image), cursor->hotSpot);
    });
    return current;
}

} // namespace platform
