// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

/// The answers of `screenshare list`: a table for people, or one JSON array of objects.
enum class ListForm {
    Table,
    Json
};

std::string MonitorListText(ListForm form);
std::string WindowListText(ListForm form);
