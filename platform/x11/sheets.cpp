// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/sheets.h"

#include <algorithm>
#include <utility>

namespace platform::x11 {

Sheets::Sheets(SharedPixelsPool& pool, int width, int height) : m_pool(pool), m_whole{0, 0, width, height} {}

void Sheets::AddStale(const PixelRegion& region) {
    for (Sheet& sheet : m_sheets)
        sheet.behind.Add(region);
}

Sheets::Sheet* Sheets::Choose() {
    const auto isOurs = [](const Sheet& sheet) { return IsOnlyShare(sheet.share); };
    const auto newest = std::find_if(m_sheets.begin(), m_sheets.end(),
                                     [this](const Sheet& sheet) { return &sheet == m_newest; });
    if (newest != m_sheets.end() && isOurs(*newest))
        return &*newest;
    const auto other = std::find_if(m_sheets.begin(), m_sheets.end(), isOurs);
    if (other != m_sheets.end())
        return &*other;
    if (m_sheets.size() == MOST)
        m_sheets.remove_if([this](const Sheet& sheet) { return &sheet != m_newest; });
    const std::shared_ptr<SharedPixels> pixels =
        m_pool.Take(static_cast<std::size_t>(m_whole.right) * 4 * static_cast<std::size_t>(m_whole.bottom));
    if (pixels == nullptr)
        return nullptr;
    m_sheets.push_back({pixels, pixels.get(), PixelRegion(m_whole)});
    return &m_sheets.back();
}

void Sheets::SetNewest(Sheet* sheet) {
    sheet->behind.Clear();
    m_newest = sheet;
}

void Sheets::DropOthers() {
    m_sheets.remove_if([this](const Sheet& sheet) { return &sheet != m_newest; });
}

} // namespace platform::x11
