// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <utility>
#include <vector>

/// A table of a Markdown page, with columns that a terminal shows in line as well. Cells are ASCII and hold
/// no bar.
class MarkdownTable {
public:
    explicit MarkdownTable(std::vector<std::string> headings) { AddRow(std::move(headings)); }

    /// As many cells as there are headings.
    void AddRow(std::vector<std::string> cells);

    /// A line for each row: headings, what divides them from the others, the others.
    std::string Text() const;

private:
    std::string Line(const std::vector<std::string>& cells) const;

    std::vector<std::size_t> m_widths;
    std::vector<std::vector<std::string>> m_rows;
};
