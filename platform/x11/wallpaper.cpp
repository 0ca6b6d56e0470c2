// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/wallpaper.h"

#include "util/cm_clock.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>

namespace platform::x11 {

namespace {

bool LookTheSame(const Picture& one, const Picture& other) {
    if (one.width != other.width || one.height != other.height || one.format != other.format ||
        one.stride != other.stride)
        return false;
    return std::memcmp(one.pixels, other.pixels, one.stride * static_cast<std::size_t>(one.height)) == 0;
}

} // namespace

PicturePtr Wallpaper::Take(const FetchTools& tools, const ServerPixels& pixels, xcb_pixmap_t pixmap,
                           const CGRect& frame, std::size_t& fetched) {
    const std::chrono::nanoseconds now = CmSteadyNow();
    m_asked = now;
    if (m_picture != nullptr && m_pixmap == pixmap && m_root == frame.size && now - m_fetched < FRESH_TIME)
        return m_picture;
    PicturePtr picture = Fetch(tools, pixels, pixmap, frame, fetched);
    if (picture == nullptr || m_picture == nullptr || !LookTheSame(*picture, *m_picture))
        m_picture = std::move(picture);
    m_pixmap = pixmap;
    m_root = frame.size;
    m_fetched = now;
    return m_picture;
}

PicturePtr Wallpaper::Fetch(const FetchTools& tools, const ServerPixels& pixels, xcb_pixmap_t pixmap,
                            const CGRect& frame, std::size_t& fetched) {
    const auto geometry =
        tools.connection.Fetch<xcb_get_geometry_reply_t>(xcb_get_geometry(tools.connection.Get(), pixmap));
    if (geometry == nullptr || geometry->depth != tools.connection.Screen().root_depth)
        return nullptr;
    const int width = std::min<int>(geometry->width, CmTruncate(frame.size.width));
    const int height = std::min<int>(geometry->height, CmTruncate(frame.size.height));
    if (width < 1 || height < 1)
        return nullptr;
    const std::size_t stride = pixels.BytesPerRow(width);
    const std::size_t bytes = stride * static_cast<std::size_t>(height);
    const std::shared_ptr<SharedPixels> block = tools.pool.Take(bytes);
    if (block == nullptr)
        return nullptr;
    fetched = bytes;
    RowsRead rows =
        RowsRead::Ask(tools.connection, pixmap, 0, 0, width, height, *block, 0, pixels.BytesPerPixel());
    if (!rows.Finish(tools.connection))
        return nullptr;
    m_bytes = bytes;
    const PixelRect all{0, 0, width, height};
    const CGRect shown{frame.origin, {static_cast<float>(width), static_cast<float>(height)}};
    return PictureOf(pixels, block, width, all, PixelRegion(all), shown);
}

std::chrono::nanoseconds Wallpaper::FreshUntil() const {
    return m_picture != nullptr ? m_fetched + FRESH_TIME : std::chrono::nanoseconds{0};
}

std::optional<std::chrono::nanoseconds> Wallpaper::NextDue() const {
    if (m_picture == nullptr)
        return std::nullopt;
    return m_asked + FRESH_TIME;
}

void Wallpaper::DoDue(std::chrono::nanoseconds now) {
    if (m_picture != nullptr && now >= m_asked + FRESH_TIME)
        Drop();
}

} // namespace platform::x11
