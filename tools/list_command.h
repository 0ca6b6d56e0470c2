// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"
#include "tools/list_rows.h"

#include <string>

/// A list is told as a table for people, or as JSON for programs.
enum class ListForm {
    Table,
    Json
};

/// The answer of `screenshare list`; JSON is one array of objects.
std::string ListText(const ListKind& list, ListForm form);

/// Prints it. A desktop that went away meanwhile is told instead, since nothing of a list is true then.
WriteResult PrintList(const ListKind& list, ListForm form);
