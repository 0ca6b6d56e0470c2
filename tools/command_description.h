// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/command_texts.h"

#include <string>
#include <vector>

/// The command line as plain data: what it takes, and what people get to read about that. Made once from
/// what really reads the command line, and the source of help, manual page and completion.

struct DescribedOption {
    std::vector<std::string> names; ///< "-h", "--help"; of an argument one without dashes.
    std::string value;              ///< "ID"; empty for a flag.
    bool takesMany = false;
    bool isRequired = false;
    std::string text;
    std::vector<std::string> choices{}; ///< The only values that there are; empty for any.
};

struct DescribedCommand {
    std::string path; ///< "screenshare list apps"
    std::string summary;
    CommandText text; ///< Commands below a command share its text.
    std::vector<DescribedOption> arguments;
    std::vector<DescribedOption> options;
    std::vector<DescribedOption> commonOptions; ///< The program's own, for each command.
    std::vector<DescribedCommand> commands;
    std::string version{}; ///< "screenshare 1.2.3"; of a program.

    /// "list" of "screenshare list"
    std::string Name() const { return path.substr(path.rfind(' ') + 1); }
};

/// "--monitor ID", "-h, --help", "--app PID|NAME ..."
std::string OptionHead(const DescribedOption& option);
/// Its text with the choices that there are.
std::string OptionText(const DescribedOption& option);
/// "screenshare list COMMAND", "screenshare explain [OPTION]... FILE.svg"
std::string UsageOf(const DescribedCommand& command);
