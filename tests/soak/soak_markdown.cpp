// SPDX-License-Identifier: Apache-2.0
#include "tests/soak/soak_markdown.h"

#include <algorithm>

void MarkdownTable::AddRow(std::vector<std::string> cells) {
    m_widths.resize(std::max(m_widths.size(), cells.size()));
    for (std::size_t i = 0; i < cells.size(); ++i)
        m_widths[i] = std::max(m_widths[i], cells[i].size());
    m_rows.push_back(std::move(cells));
}

std::string MarkdownTable::Text() const {
    std::string text = Line(m_rows.front());
    for (const std::size_t width : m_widths)
        text += "|" + std::string(width + 2, '-');
    text += "|\n";
    for (auto row = m_rows.begin() + 1; row != m_rows.end(); ++row)
        text += Line(*row);
    return text;
}

std::string MarkdownTable::Line(const std::vector<std::string>& cells) const {
    std::string line;
    for (std::size_t i = 0; i < cells.size(); ++i)
        line += "| " + cells[i] + std::string(m_widths[i] - cells[i].size() + 1, ' ');
    return line + "|\n";
}
