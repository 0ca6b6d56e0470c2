// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"

#include <string>

/// Prints an answer that is there as a whole; waits for a reader that is slow. SIGPIPE has to be ignored.
WriteResult PrintAnswer(const std::string& text);
/// The same for who is to end: once `stop` is raised, a reader that takes nothing for a second is given up.
WriteResult PrintAnswer(const std::string& text, const StopNotice& stop);
