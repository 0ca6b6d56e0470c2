// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <utility>
#include <vector>

/// Columns for terminals that only ever grow. Cells are UTF-8; what would disturb a terminal is shown as a
/// blank, and an empty cell as "-".
class TextColumns {
public:
    /// From now on the columns have room for these cells.
    void Widen(const std::vector<std::string>& cells);

    /// A line with its end. A cell that is wider than its column pushes the others to the right.
    std::string Line(std::vector<std::string> cells) const;

private:
    std::vector<std::size_t> m_widths;
};

/// Columns as wide as their longest cell.
class TextTable {
public:
    explicit TextTable(std::vector<std::string> headings) { AddRow(std::move(headings)); }

    /// As many cells as there are headings.
    void AddRow(std::vector<std::string> cells);

    /// A line for each row, headings first.
    std::string Text() const;

private:
    TextColumns m_columns;
    std::vector<std::vector<std::string>> m_rows;
};
