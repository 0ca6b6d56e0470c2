// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/desktop_lists.h"
#include "tools/json_text.h"

#include <string>
#include <vector>

/// What `screenshare list` tells of one thing, in both forms.
struct ListRow {
    unsigned id = 0; ///< No two rows of a list have the same.
    std::vector<std::string> cells;
    JsonObjectText json;

    bool operator==(const ListRow&) const = default;
};

using ListRows = std::vector<ListRow>;

ListRows MonitorRows(const std::vector<ListedMonitor>& monitors);
ListRows WindowRows(const std::vector<platform::CGWindowDescription>& windows);
ListRows ApplicationRows(const std::vector<ListedApplication>& applications);

/// One of the lists that there are.
struct ListKind {
    std::vector<std::string> headings; ///< Of the cells.
    ListRows (*look)();                ///< What there is now.
};

const ListKind& ListOfMonitors();
const ListKind& ListOfWindows();
const ListKind& ListOfApplications();
