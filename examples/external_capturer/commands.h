// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_engine.h>

#include <string>

/// Does what a line of standard input asks of the engine and prints what came of it.
/// False when the run is to end. A line that is no command gets a line of help.
bool RunCommand(IShareCaptureEngine& engine, const std::string& line);

/// Prints the engine's statistics as a table.
void PrintStatistics(IShareCaptureEngine& engine);
