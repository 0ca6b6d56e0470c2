// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/exit_code.h"

#include <string>
#include <string_view>
#include <vector>

/// What people get to read about the program and its commands. The command line itself knows the options;
/// help, manual page and completion are made of both.

struct CommandExample {
    std::string line;
    std::string meaning; ///< What the line is good for.
};

struct CommandText {
    std::string name;
    std::string summary;                 ///< One line, no full stop.
    std::vector<std::string> paragraphs; ///< Broken where the reader's terminal ends.
    std::vector<CommandExample> examples;
    std::vector<ExitMeaning> exitMeanings; ///< Each that it can end with.
};

/// Something that has a name outside the program: a variable, a file.
struct NamedText {
    std::string name;
    std::string text;
};

/// Of the program as a whole.
const CommandText& ProgramText();
/// Of a command of the program. A name that has no text gives an empty one.
const CommandText& TextOfCommand(std::string_view name);

const std::vector<NamedText>& ProgramVariables();
const std::vector<NamedText>& ProgramFiles();
