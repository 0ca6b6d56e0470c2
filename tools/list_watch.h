// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"
#include "tools/list_command.h"

/// Prints a list, and then what happens to it, until SIGINT or SIGTERM, which is the good end. A desktop that
/// goes takes everything along and may come back. Gives why it ended before: the reader of standard output
/// has gone, or nothing can be written there.
WriteResult WatchList(const ListKind& list, ListForm form);
