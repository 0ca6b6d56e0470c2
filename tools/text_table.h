// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <utility>
#include <vector>

/// Columns as wide as their longest cell, for terminals. Cells are UTF-8; what would disturb a terminal is
/// shown as a blank.
class TextTable {
public:
    explicit TextTable(std::vector<std::string> headings) { AddRow(std::move(headings)); }

    /// As many cells as there are headings.
    void AddRow(std::vector<std::string> cells);

    /// A line for each row, headings first.
    std::string Text() const;

private:
    std::vector<std::vector<std::string>> m_rows;
};
