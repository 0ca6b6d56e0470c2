// SPDX-License-Identifier: Apache-2.0
#include "tools/list_changes.h"

#include <algorithm>
#include <utility>

namespace {

const ListRow* FindRow(const ListRows& rows, unsigned id) {
    const auto found =
        std::find_if(rows.begin(), rows.end(), [id](const ListRow& row) { return row.id == id; });
    return found != rows.end() ? &*found : nullptr;
}

const char* MarkOf(ListChangeKind kind) {
    switch (kind) {
        case ListChangeKind::Added:
            return "+";
        case ListChangeKind::Removed:
            return "-";
        case ListChangeKind::Changed:
            break;
    }
    return "~";
}

const char* WordOf(ListChangeKind kind) {
    switch (kind) {
        case ListChangeKind::Added:
            return "added";
        case ListChangeKind::Removed:
            return "removed";
        case ListChangeKind::Changed:
            break;
    }
    return "changed";
}

std::vector<std::string> WithMark(const char* mark, std::vector<std::string> cells) {
    cells.insert(cells.begin(), mark);
    return cells;
}

} // namespace

std::vector<ListChange> ListHistory::Follow(ListRows rows) {
    std::vector<ListChange> changes;
    for (const ListRow& former : m_rows) {
        if (FindRow(rows, former.id) == nullptr)
            changes.push_back({ListChangeKind::Removed, former});
    }
    for (const ListRow& row : rows) {
        const ListRow* const former = FindRow(m_rows, row.id);
        if (former == nullptr)
            changes.push_back({ListChangeKind::Added, row});
        else if (*former != row)
            changes.push_back({ListChangeKind::Changed, row});
    }
    m_rows = std::move(rows);
    return changes;
}

ListChangeTable::ListChangeTable(std::vector<std::string> headings)
    : m_headings(WithMark(" ", std::move(headings))) {
    m_columns.Widen(m_headings);
}

std::string ListChangeTable::Text(const std::vector<ListChange>& changes) {
    for (const ListChange& change : changes)
        m_columns.Widen(WithMark(MarkOf(change.kind), change.row.cells));
    std::string text;
    if (!m_headings.empty())
        text = m_columns.Line(std::exchange(m_headings, {}));
    for (const ListChange& change : changes)
        text += m_columns.Line(WithMark(MarkOf(change.kind), change.row.cells));
    return text;
}

std::string ListChangeJson(const std::vector<ListChange>& changes) {
    std::string text;
    for (const ListChange& change : changes) {
        JsonObjectText object;
        object.String("change", WordOf(change.kind)).MembersOf(change.row.json);
        text += object.Text() + "\n";
    }
    return text;
}
