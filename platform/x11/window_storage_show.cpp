// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"
#include "platform/x11/window_storage.h"
#include "util/cm_clock.h"

#include <cstddef>
#include <cstring>
#include <utility>

/// Pictures of what has been fetched of a storage.
namespace platform::x11 {

namespace {

/// Of two copies of the same size.
bool HoldTheSame(const Picture& one, const Picture& other) {
    const std::size_t bytes = one.stride * static_cast<std::size_t>(one.height);
    return one.format == other.format && std::memcmp(one.pixels, other.pixels, bytes) == 0;
}

} // namespace

std::shared_ptr<Picture> PictureOf(const ServerPixels& pixels, const std::shared_ptr<SharedPixels>& block,
                                   int width, const PixelRect& visible, const PixelRegion& shown,
                                   const CGRect& rect) {
    const bool isWhole = shown == PixelRegion(visible);
    const std::size_t sourceStride = pixels.BytesPerRow(width);
    auto picture = std::make_shared<Picture>();
    picture->width = visible.right - visible.left;
    picture->height = visible.bottom - visible.top;
    picture->format = isWhole ? pixels.format : WithAlpha(pixels.format);
    picture->rect = rect;
    picture->time = CmSteadyNow();
    picture->serial = NextPictureSerial();
    if (isWhole && pixels.packing == ServerPixels::Packing::Whole) {
        picture->stride = sourceStride;
        picture->pixels = block->Bytes() + static_cast<std::size_t>(visible.top) * sourceStride +
                          static_cast<std::size_t>(visible.left) * 4;
        picture->memory = block;
        return picture;
    }
    picture->stride = static_cast<std::size_t>(picture->width) * 4;
    const std::size_t bytes = picture->stride * static_cast<std::size_t>(picture->height);
    const auto copy = std::make_shared<std::uint8_t[]>(bytes); // transparent
    DrawServerPixels(pixels, block->Bytes(), sourceStride, shown, picture->format, copy.get(),
                     picture->stride, visible);
    picture->pixels = copy.get();
    picture->memory = copy;
    return picture;
}

WindowStorage::Look WindowStorage::LookOf(const PixelRect& visible,
                                          const std::optional<PixelRegion>& shape) const {
    Look look{visible, std::nullopt};
    if (!shape && m_pixels.unproven.IsEmpty())
        return look;
    PixelRegion shown(visible);
    if (shape)
        shown.Intersect(*shape);
    shown.Subtract(m_pixels.unproven);
    if (!(shown == PixelRegion(visible)))
        look.shown = std::move(shown);
    return look;
}

PicturePtr WindowStorage::Show(const PixelRect& visible, const std::optional<PixelRegion>& shape,
                               const CGRect& rect) {
    Look look = LookOf(visible, shape);
    if (m_pixels.block == nullptr || (look.shown && look.shown->IsEmpty()))
        return nullptr;
    const bool looksAlike = look == m_look;
    if (m_picture != nullptr && m_unshown.IsEmpty() && looksAlike)
        return m_picture;
    std::shared_ptr<Picture> picture = PictureOf(m_pixels.pixels, m_pixels.block, m_pixels.width, visible,
                                                 look.shown ? *look.shown : PixelRegion(visible), rect);
    const bool isCopied = picture->memory != m_pixels.block;
    if (!isCopied || !m_isPictureCopied || m_picture == nullptr || !looksAlike ||
        !HoldTheSame(*m_picture, *picture)) {
        if (looksAlike)
            TellSteps(*picture);
        m_picture = std::move(picture);
    }
    m_isPictureCopied = isCopied;
    m_unshown.Clear();
    m_look = std::move(look);
    return m_picture;
}

/// How a picture of the same look came out of the last one.
void WindowStorage::TellSteps(Picture& picture) {
    const Picture& before = m_picture != nullptr ? *m_picture : m_former;
    if (before.format != picture.format || before.serial == 0)
        return;
    if (m_picture != nullptr || !m_unshown.IsEmpty()) {
        picture.steps = StepsAfter(before, UnshownIn(m_look.visible));
        return;
    }
    // It is that one again: nobody has held it, and nothing was written over it.
    picture.serial = m_former.serial;
    picture.steps = m_former.steps;
}

/// In pixels of a picture of `visible`.
PixelRegion WindowStorage::UnshownIn(const PixelRect& visible) const {
    PixelRegion unshown = m_unshown;
    unshown.Intersect(visible);
    unshown.Translate(-visible.left, -visible.top);
    return unshown;
}

} // namespace platform::x11
