// SPDX-License-Identifier: Apache-2.0
#include "tools/command_description.h"

#include <cstddef>

std::string OptionHead(const DescribedOption& option) {
    std::string head;
    for (const std::string& name : option.names)
        head += (head.empty() ? "" : ", ") + name;
    if (!option.value.empty())
        head += " " + option.value;
    return head + (option.takesMany ? " ..." : "");
}

std::string OptionText(const DescribedOption& option) {
    std::string text = option.text;
    for (std::size_t i = 0; i < option.choices.size(); ++i) {
        const bool isLast = i + 1 == option.choices.size();
        text += (i == 0 ? ": " : (isLast ? " or " : ", ")) + option.choices[i];
    }
    return text;
}

std::string UsageOf(const DescribedCommand& command) {
    std::string usage = command.path;
    if (!command.options.empty())
        usage += " [OPTION]...";
    for (const DescribedOption& argument : command.arguments)
        usage += argument.isRequired ? " " + OptionHead(argument) : " [" + OptionHead(argument) + "]";
    if (!command.commands.empty())
        usage += " COMMAND";
    return usage;
}
