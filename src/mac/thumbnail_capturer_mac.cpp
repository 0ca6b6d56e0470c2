// SPDX-License-Identifier: Apache-2.0
#include "src/mac/thumbnail_capturer_mac.h"

#include "platform/bitmap_context.h"
#include "platform/core_graphics_images.h"
#include "platform/window_services.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cstddef>
#include <limits>

namespace {

constexpr float IMAGE_PIXEL_BYTES = 4.0F;

/// How a thumbnail lies in memory.
struct Layout {
    explicit Layout(const platform::CGSize& points)
        : width(CmTruncate(points.width)),
          height(CmTruncate(points.height)),
          bytesPerRow(CmTruncate(points.width * IMAGE_PIXEL_BYTES)) {}

    int width;
    int height;
    int bytesPerRow; // not that of whole pixels where the width is fractional
};

std::size_t BytesOf(double bytes) {
    constexpr double MOST = std::numeric_limits<unsigned>::max();
    return bytes > 0 ? static_cast<std::size_t>(std::min(bytes, MOST)) : 0;
}

/// Enough for the area in points and for every row.
std::size_t BytesNeeded(const platform::CGSize& points, const Layout& layout) {
    const double rows = static_cast<double>(layout.bytesPerRow) * layout.height;
    return std::max(BytesOf(points.width * points.height * IMAGE_PIXEL_BYTES), BytesOf(rows));
}

} // namespace

bool CThumbnailCapturerMac::captureWindowImage(unsigned window, ImageData& image) {
    platform::CGRect rect;
    platform::CGSGetScreenRectForWindow(platform::CGSDefaultConnection(), window, &rect);
    const platform::CGWindowID list[] = {window};
    const platform::CGWindowImageRef picture =
        platform::CGWindowListTakeImage(rect, list, platform::kCGWindowImageDefault, true);
    if (picture == nullptr)
        return false;

    const Layout layout(rect.size);
    const std::size_t needed = BytesNeeded(rect.size, layout);
    if (m_buffer.size() < needed)
        m_buffer.resize(needed);
    const platform::CGContextRef context =
        platform::CGBitmapContextCreate(m_buffer.data(), m_buffer.size(), layout.width, layout.height, 8,
                                        layout.bytesPerRow, platform::kCGImageAlphaNoneSkipLast);
    if (context == nullptr)
        return false;
    // The memory still shows the window before. A window that can be seen through must not show that, nor
    // what is left of it between rows.
    if (!platform::CGWindowImageIsOpaque(picture.get()) || layout.bytesPerRow != layout.width * 4)
        std::fill_n(m_buffer.begin(), needed, static_cast<unsigned char>(0));
    const platform::CGRect place{{0, 0}, rect.size};
    platform::CGContextSetInterpolationQuality(context.get(), platform::kCGInterpolationHigh);
    if (!platform::CGContextDrawWindowImage(context.get(), place, picture.get()))
        return false;

    // Counted without the fraction of the width, whatever the rows have.
    image = {SHARE_FRAME_FORMAT_RGBA, layout.width, layout.height, layout.width * 4, m_buffer.data()};
    return true;
}
