// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/command_description.h"

#include <CLI/CLI.hpp>

/// A command, or the whole program, as plain data, with the texts that go with it. What is in no group is
/// left out.
DescribedCommand DescribeCommand(const CLI::App& command);

/// Flags are there or not: a value behind one is misuse. To be called when the commands are complete.
void RefuseValuesOfFlags(CLI::App& command);

/// What is wrong with a command line that could not be parsed, in one line for people, with the command that
/// it is about.
std::string MisuseText(const CLI::App& program, const CLI::ParseError& error);
