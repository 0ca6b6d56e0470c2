// SPDX-License-Identifier: Apache-2.0
#include "tools/text_table.h"

#include <algorithm>
#include <cstddef>

namespace {

std::size_t WidthOf(const std::string& text) {
    return static_cast<std::size_t>(std::count_if(
        text.begin(), text.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; }));
}

bool DisturbsTerminals(char c) {
    return static_cast<unsigned char>(c) < 0x20 || c == 0x7F;
}

} // namespace

void TextTable::AddRow(std::vector<std::string> cells) {
    for (std::string& cell : cells) {
        std::replace_if(cell.begin(), cell.end(), DisturbsTerminals, ' ');
        if (cell.empty())
            cell = "-";
    }
    m_rows.push_back(std::move(cells));
}

std::string TextTable::Text() const {
    std::vector<std::size_t> widths(m_rows.front().size());
    for (const std::vector<std::string>& row : m_rows) {
        for (std::size_t i = 0; i < row.size(); ++i)
            widths[i] = std::max(widths[i], WidthOf(row[i]));
    }
    std::string text;
    for (const std::vector<std::string>& row : m_rows) {
        for (std::size_t i = 0; i + 1 < row.size(); ++i)
            text += row[i] + std::string(widths[i] - WidthOf(row[i]) + 2, ' ');
        text += row.back() + "\n";
    }
    return text;
}
