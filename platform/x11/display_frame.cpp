// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_frame.h"

#include <algorithm>
#include <cstddef>
#include <utility>

namespace platform::x11 {

namespace {

/// Rows between two bands that are fetched with them: cheaper than a request of their own.
constexpr int SMALLEST_GAP = 16;

} // namespace

DisplayFrame::DisplayFrame(X11Connection& connection, SharedPixelsPool& pool, const PixelRect& place,
                           const CGRect& bounds)
    : m_connection(connection),
      m_pool(pool),
      m_place(place),
      m_bounds(bounds),
      m_width(place.right - place.left),
      m_height(place.bottom - place.top),
      m_server(ServerPixelsOf(*xcb_get_setup(connection.Get()), connection.Screen(),
                              connection.Screen().root_depth, connection.Screen().root_visual)),
      m_sheets(pool, m_width, m_height) {}

PixelRegion DisplayFrame::PartOf(const PixelRegion& ofRoot) const {
    PixelRegion part = ofRoot;
    part.Intersect(m_place);
    part.Translate(-m_place.left, -m_place.top);
    return part;
}

std::vector<DisplayFrame::Band> DisplayFrame::BandsOf(const PixelRegion& region) {
    std::vector<Band> bands;
    for (const PixelRect& rect : region.Rects()) {
        if (!bands.empty() && rect.top <= bands.back().bottom + SMALLEST_GAP)
            bands.back().bottom = std::max(bands.back().bottom, rect.bottom);
        else
            bands.push_back({rect.top, rect.bottom});
    }
    return bands;
}

bool DisplayFrame::Ask() {
    m_fetch = Fetch();
    Fetch fetch;
    fetch.target = m_server ? m_sheets.Choose() : nullptr;
    if (fetch.target == nullptr)
        return false;
    const std::size_t rowBytes = m_server->BytesPerRow(m_width);
    SharedPixels* into = fetch.target->pixels;
    if (m_server->packing != ServerPixels::Packing::Whole) {
        fetch.packed = m_pool.Take(rowBytes * static_cast<std::size_t>(m_height));
        into = fetch.packed.get();
    }
    if (into == nullptr)
        return false;
    fetch.bands = BandsOf(fetch.target->behind);
    for (const Band& band : fetch.bands) {
        fetch.reads.push_back(RowsRead::Ask(m_connection, m_connection.Root(), m_place.left,
                                            m_place.top + band.top, m_width, m_place.top + band.bottom, *into,
                                            static_cast<std::size_t>(band.top) * rowBytes,
                                            m_server->BytesPerPixel()));
    }
    m_fetch = std::move(fetch);
    return true;
}

bool DisplayFrame::Finish() {
    Fetch fetch = std::move(m_fetch);
    m_fetch = Fetch();
    bool whole = fetch.target != nullptr;
    for (RowsRead& read : fetch.reads)
        whole = read.Finish(m_connection) && whole;
    if (!whole)
        return false;
    if (fetch.packed != nullptr) {
        PixelRegion fetched;
        for (const Band& band : fetch.bands)
            fetched.Add(PixelRect{0, band.top, m_width, band.bottom});
        DrawServerPixels(*m_server, fetch.packed->Bytes(), m_server->BytesPerRow(m_width), fetched,
                         m_server->format, fetch.target->Bytes(), static_cast<std::size_t>(m_width) * 4,
                         Whole());
    }
    m_sheets.SetNewest(fetch.target);
    return true;
}

void DisplayFrame::Stamp(std::chrono::nanoseconds time, const ShownStacks& stacks) {
    m_time = time;
    m_stacks = stacks;
}

Picture DisplayFrame::Show() const {
    Picture picture;
    picture.width = m_width;
    picture.height = m_height;
    picture.stride = static_cast<std::size_t>(m_width) * 4;
    // The byte beside the colours says nothing in a picture of a screen.
    picture.format = WithoutAlpha(m_server->format);
    picture.pixels = m_sheets.Newest()->Bytes();
    // Where the root ends before the display does, less of it is shown.
    picture.rect = {m_bounds.origin, {static_cast<float>(m_width), static_cast<float>(m_height)}};
    picture.time = m_time;
    picture.generationBefore = m_stacks.before;
    picture.generationAfter = m_stacks.after;
    picture.memory = m_sheets.Newest()->share;
    return picture;
}

void DisplayFrame::Drop(std::chrono::nanoseconds before) {
    if (m_time < before)
        m_sheets.DropOthers();
}

} // namespace platform::x11
