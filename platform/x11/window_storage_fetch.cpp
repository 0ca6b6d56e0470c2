// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_storage_fetch.h"

#include <xcb/damage.h>

#include <algorithm>
#include <cstring>
#include <utility>

namespace platform::x11 {

StorageFetch::StorageFetch(const FetchTools& tools, std::shared_ptr<WindowStorage> storage,
                           const ServerPixels& pixels)
    : m_tools(tools),
      m_storage(std::move(storage)),
      m_pixels(pixels) {}

void StorageFetch::Ask() {
    WindowStorage& storage = *m_storage;
    const PixelRegion& unproven = storage.Proof().Unproven();
    m_result = storage.TakePixels();
    // Where it has turned out what is the window's own, it isn't known when that was painted.
    const bool isKnown =
        m_result.IsOf(storage.Width(), storage.Height(), m_pixels) && m_result.unproven == unproven;
    if (!isKnown) {
        m_result = {nullptr, storage.Width(), storage.Height(), m_pixels, unproven};
        storage.CountChanges(0);
        AskForAll();
        return;
    }
    storage.CountChanges(m_tools.parts);
    m_damage = m_tools.connection.Ask<xcb_xfixes_fetch_region_reply_t>(
        xcb_xfixes_fetch_region(m_tools.connection.Get(), m_tools.parts));
    m_awaitsDamage = true;
}

void StorageFetch::AskForAll() {
    m_result.block = m_tools.pool.Take(m_result.Stride() * static_cast<std::size_t>(m_result.height));
    if (m_result.block == nullptr) {
        m_failed = true;
        return;
    }
    m_bottom = m_result.height;
    AskForBand(0, m_result.height);
}

void StorageFetch::AskForBand(int top, int bottom) {
    const auto row = static_cast<std::size_t>(top);
    m_rows = RowsRead::Ask(m_tools.connection, m_storage->Pixmap(), 0, top, m_result.width, bottom,
                           *m_result.block, row * m_result.Stride(), m_pixels.BytesPerPixel());
    m_awaitsRows = true;
    m_bytesAskedFor = m_result.Stride() * static_cast<std::size_t>(bottom - top);
}

void StorageFetch::AskForRows() {
    if (!std::exchange(m_awaitsDamage, false))
        return;
    const auto damage = m_tools.connection.Await(m_damage);
    if (damage == nullptr) {
        m_failed = true;
        return;
    }
    const int top = damage->extents.y + m_storage->Border();
    m_top = std::clamp(top, 0, m_result.height);
    m_bottom = std::clamp(top + damage->extents.height, 0, m_result.height);
    if (m_top >= m_bottom)
        return;
    if (!IsOnlyShare(m_result.block)) {
        m_before = m_result;
        m_result.block = m_tools.pool.Take(m_before.block->Size());
    }
    if (m_result.block == nullptr)
        m_failed = true;
    else
        AskForBand(m_top, m_bottom);
}

bool StorageFetch::Fail() {
    m_storage->ForgetPixmap();
    return false;
}

bool StorageFetch::Finish() {
    if (m_failed)
        return Fail();
    if (!m_awaitsRows) {
        m_storage->GivePixels(std::move(m_result), PixelRegion());
        return true;
    }
    const std::size_t stride = m_result.Stride();
    const std::size_t bandBegin = stride * static_cast<std::size_t>(m_top);
    const std::size_t bandEnd = stride * static_cast<std::size_t>(m_bottom);
    std::uint8_t* const bytes = m_result.block->Bytes();
    const std::uint8_t* const before = m_before.block != nullptr ? m_before.block->Bytes() : nullptr;
    if (before != nullptr) { // while the server is at the band
        std::memcpy(bytes, before, bandBegin);
        std::memcpy(bytes + bandEnd, before + bandEnd,
                    stride * static_cast<std::size_t>(m_result.height) - bandEnd);
    }
    if (!m_rows.Finish(m_tools.connection))
        return Fail();
    // A window that was moved says that it has changed all over, and hasn't.
    const bool isSame =
        before != nullptr && std::memcmp(bytes + bandBegin, before + bandBegin, bandEnd - bandBegin) == 0;
    // What was painted meanwhile may be in the whole band already.
    const PixelRect band{0, m_top, m_result.width, m_bottom};
    m_storage->GivePixels(isSame ? std::move(m_before) : std::move(m_result),
                          isSame ? PixelRegion() : PixelRegion(band));
    return true;
}

} // namespace platform::x11
