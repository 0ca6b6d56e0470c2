// SPDX-License-Identifier: Apache-2.0
#include "tools/help_text.h"

#include <algorithm>
#include <vector>

namespace {

constexpr std::size_t TERMINAL_WIDTH = 80;
constexpr std::size_t ENTRY_MARGIN = 2;
/// Where the second column begins. A head that doesn't fit has a line of its own.
constexpr std::size_t SECOND_COLUMN = 26;

std::string HelpEntry(const std::string& head, const std::string& text, std::size_t column = SECOND_COLUMN) {
    std::string entry = std::string(ENTRY_MARGIN, ' ') + head;
    const bool fits = entry.size() + ENTRY_MARGIN <= column;
    entry += fits ? std::string(column - entry.size(), ' ') : "\n" + std::string(column, ' ');
    return entry + WrapWords(text, TERMINAL_WIDTH - column, column) + "\n";
}

std::string HelpSection(const std::string& heading, const std::string& body) {
    return body.empty() ? "" : "\n" + heading + ":\n" + body;
}

std::string OptionEntries(const std::vector<DescribedOption>& options) {
    std::string text;
    for (const DescribedOption& option : options)
        text += HelpEntry(OptionHead(option), OptionText(option));
    return text;
}

std::string CommandEntries(const std::vector<DescribedCommand>& commands) {
    std::string text;
    for (const DescribedCommand& command : commands)
        text += HelpEntry(command.Name(), command.summary);
    return text;
}

std::string ExampleEntries(const std::vector<CommandExample>& examples) {
    constexpr std::size_t MEANING_MARGIN = 6;
    std::string text;
    for (const CommandExample& example : examples)
        text += std::string(ENTRY_MARGIN, ' ') + example.line + "\n" + std::string(MEANING_MARGIN, ' ') +
                WrapWords(example.meaning, TERMINAL_WIDTH - MEANING_MARGIN, MEANING_MARGIN) + "\n";
    return text;
}

std::string ExitEntries(const std::vector<ExitMeaning>& meanings) {
    constexpr std::size_t MEANING_COLUMN = 5;
    std::string text;
    for (const ExitMeaning& meaning : meanings)
        text += HelpEntry(std::to_string(meaning.code), meaning.text, MEANING_COLUMN);
    return text;
}

std::string VariableEntries() {
    std::string text;
    for (const NamedText& variable : ProgramVariables())
        text += HelpEntry(variable.name, variable.text);
    return text;
}

std::string Paragraphs(const std::vector<std::string>& paragraphs) {
    std::string text;
    for (const std::string& paragraph : paragraphs)
        text += "\n" + WrapWords(paragraph, TERMINAL_WIDTH, 0) + "\n";
    return text;
}

} // namespace

std::string WrapWords(std::string_view text, std::size_t width, std::size_t indent) {
    std::string wrapped;
    std::size_t column = 0;
    while (!text.empty()) {
        const std::size_t end = std::min(text.find(' '), text.size());
        const std::string_view word = text.substr(0, end);
        if (column > 0 && column + 1 + word.size() > width) {
            wrapped += "\n" + std::string(indent, ' ');
            column = 0;
        } else if (column > 0) {
            wrapped += ' ';
            ++column;
        }
        wrapped += word;
        column += word.size();
        text.remove_prefix(std::min(end + 1, text.size()));
    }
    return wrapped;
}

std::string HelpText(const DescribedCommand& command) {
    const bool isProgram = command.commonOptions.empty();
    return WrapWords(command.summary + ".", TERMINAL_WIDTH, 0) + "\n\nUsage: " + UsageOf(command) + "\n" +
           HelpSection("Commands", CommandEntries(command.commands)) +
           HelpSection("Arguments", OptionEntries(command.arguments)) +
           HelpSection("Options", OptionEntries(command.options)) +
           HelpSection("Options of every command", OptionEntries(command.commonOptions)) +
           Paragraphs(command.text.paragraphs) +
           HelpSection("Examples", ExampleEntries(command.text.examples)) +
           HelpSection("Exit code", ExitEntries(command.text.exitMeanings)) +
           HelpSection("Environment", isProgram ? VariableEntries() : "");
}
