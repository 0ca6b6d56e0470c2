// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/list_rows.h"
#include "tools/text_table.h"

#include <string>
#include <vector>

/// What happens to a list from one look to the next, and how it is told. Threads: one at a time.

enum class ListChangeKind {
    Added,
    Removed,
    Changed
};

struct ListChange {
    ListChangeKind kind = ListChangeKind::Added;
    ListRow row; ///< As it was, of one that is removed.
};

/// Remembers a list, which begins empty.
class ListHistory {
public:
    /// What makes the list that was into `rows`: first what has gone, then all else in the order of `rows`.
    /// Another order alone is no change.
    std::vector<ListChange> Follow(ListRows rows);

private:
    ListRows m_rows;
};

/// Lines of a table whose first column tells what happened: "+" added, "-" removed, "~" changed. Columns
/// stay as wide as they were, and grow for what is wider.
class ListChangeTable {
public:
    explicit ListChangeTable(std::vector<std::string> headings);

    /// The headings stand above the first answer.
    std::string Text(const std::vector<ListChange>& changes);

private:
    std::vector<std::string> m_headings; // until they are told
    TextColumns m_columns;
};

/// An object a line, whose first member "change" is "added", "removed" or "changed".
std::string ListChangeJson(const std::vector<ListChange>& changes);
