// SPDX-License-Identifier: Apache-2.0
#include "tools/text_table.h"

#include <algorithm>

namespace {

constexpr std::size_t GAP = 2;

std::size_t WidthOf(const std::string& text) {
    return static_cast<std::size_t>(std::count_if(
        text.begin(), text.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; }));
}

bool DisturbsTerminals(char c) {
    return static_cast<unsigned char>(c) < 0x20 || c == 0x7F;
}

/// As it is to be seen.
std::string Shown(std::string cell) {
    std::replace_if(cell.begin(), cell.end(), DisturbsTerminals, ' ');
    return cell.empty() ? "-" : cell;
}

} // namespace

void TextColumns::Widen(const std::vector<std::string>& cells) {
    m_widths.resize(std::max(m_widths.size(), cells.size()));
    for (std::size_t i = 0; i < cells.size(); ++i)
        m_widths[i] = std::max(m_widths[i], WidthOf(Shown(cells[i])));
}

std::string TextColumns::Line(std::vector<std::string> cells) const {
    std::string line;
    for (std::size_t i = 0; i < cells.size(); ++i) {
        const std::string cell = Shown(std::move(cells[i]));
        line += cell;
        if (i + 1 == cells.size())
            break;
        const std::size_t width = WidthOf(cell);
        const std::size_t columnWidth = i < m_widths.size() ? m_widths[i] : 0;
        line += std::string(std::max(columnWidth, width) - width + GAP, ' ');
    }
    return line + "\n";
}

void TextTable::AddRow(std::vector<std::string> cells) {
    m_columns.Widen(cells);
    m_rows.push_back(std::move(cells));
}

std::string TextTable::Text() const {
    std::string text;
    for (const std::vector<std::string>& row : m_rows)
        text += m_columns.Line(row);
    return text;
}
