// SPDX-License-Identifier: Apache-2.0
#include "tools/manual.h"

#include <algorithm>
#include <cctype>

namespace {

std::string Bold(std::string_view text) {
    return "\\fB" + RoffText(text) + "\\fR";
}

/// A paragraph with a head that stands out to the left.
std::string TaggedParagraph(const std::string& head, const std::string& text) {
    return ".TP\n" + head + "\n" + RoffText(text) + "\n";
}

std::string ManualHeading(std::string heading) {
    std::transform(heading.begin(), heading.end(), heading.begin(),
                   [](char c) { return static_cast<char>(std::toupper(static_cast<unsigned char>(c))); });
    return ".SH " + heading + "\n";
}

/// Names as they are typed, values as they are chosen.
std::string OptionTag(const DescribedOption& option) {
    std::string tag;
    for (const std::string& name : option.names)
        tag += (tag.empty() ? "" : ", ") + Bold(name);
    if (!option.value.empty())
        tag += " \\fI" + RoffText(option.value) + "\\fR";
    return tag + (option.takesMany ? " ..." : "");
}

std::string Capitalised(std::string text) {
    if (!text.empty())
        text.front() = static_cast<char>(std::toupper(static_cast<unsigned char>(text.front())));
    return text;
}

std::string OptionParagraphs(const std::vector<DescribedOption>& options) {
    std::string page;
    for (const DescribedOption& option : options)
        page += TaggedParagraph(OptionTag(option), OptionText(option) + ".");
    return page;
}

std::string TextParagraphs(const std::vector<std::string>& paragraphs) {
    std::string page;
    for (const std::string& paragraph : paragraphs)
        page += ".PP\n" + RoffText(paragraph) + "\n";
    return page;
}

std::string ExampleParagraphs(const std::vector<CommandExample>& examples) {
    std::string page;
    for (const CommandExample& example : examples)
        page += ".PP\n" + RoffText(Capitalised(example.meaning)) + ":\n.PP\n.RS\n.nf\n" +
                RoffText(example.line) + "\n.fi\n.RE\n";
    return page;
}

std::string ExitParagraphs(const std::vector<ExitMeaning>& meanings) {
    std::string page;
    for (const ExitMeaning& meaning : meanings)
        page += TaggedParagraph(Bold(std::to_string(meaning.code)), meaning.text);
    return page;
}

std::string NamedParagraphs(const std::vector<NamedText>& texts) {
    std::string page;
    for (const NamedText& each : texts)
        page += TaggedParagraph(Bold(each.name), each.text);
    return page;
}

/// Help is told of once for all of them.
std::vector<DescribedOption> OwnOptionsOf(const DescribedCommand& command) {
    std::vector<DescribedOption> options = command.options;
    const auto isHelp = [](const DescribedOption& option) { return option.names.back() == "--help"; };
    options.erase(std::remove_if(options.begin(), options.end(), isHelp), options.end());
    return options;
}

std::string Synopsis(const DescribedCommand& command) {
    std::string page;
    for (const DescribedCommand& each : command.commands) {
        page += each.commands.empty()
                    ? Bold(each.path) + RoffText(UsageOf(each).substr(each.path.size())) + "\n.br\n"
                    : Synopsis(each);
    }
    return page;
}

/// Commands below one take the same options; those are told once.
std::string CommandSection(const DescribedCommand& command) {
    std::string page = ".SS " + RoffText(UsageOf(command)) + "\n" + RoffText(command.summary) + ".\n";
    page += OptionParagraphs(command.arguments);
    for (const DescribedCommand& each : command.commands)
        page += TaggedParagraph(Bold(each.path), each.summary + ".");
    const DescribedCommand& last = command.commands.empty() ? command : command.commands.back();
    page += OptionParagraphs(OwnOptionsOf(last));
    page += TextParagraphs(command.text.paragraphs);
    page += ".PP\nExamples:\n" + ExampleParagraphs(command.text.examples);
    page += ".PP\nExit code:\n" + ExitParagraphs(command.text.exitMeanings);
    return page;
}

} // namespace

std::string RoffText(std::string_view text) {
    std::string roff;
    bool isLineBegin = true;
    for (const char c : text) {
        if (isLineBegin && (c == '.' || c == '\''))
            roff += "\\&";
        isLineBegin = c == '\n';
        switch (c) {
            case '\\':
                roff += "\\e";
                break;
            case '-':
                roff += "\\-";
                break;
            case '\'':
                roff += "\\(aq";
                break;
            case '"':
                roff += "\\(dq";
                break;
            case '~':
                roff += "\\(ti";
                break;
            case '^':
                roff += "\\(ha";
                break;
            default:
                roff += c;
        }
    }
    return roff;
}

std::string ManualPage(const DescribedCommand& program) {
    const CommandText& text = program.text;
    std::string page = ".TH SCREENSHARE 1 \"\" \"" + RoffText(program.version) + "\" \"User Commands\"\n";
    page += ManualHeading("name") + RoffText(program.path) + " \\- " + RoffText(program.summary) + "\n";
    page += ManualHeading("synopsis") + Synopsis(program);
    page +=
        ManualHeading("description") + RoffText(program.summary) + ".\n" + TextParagraphs(text.paragraphs);
    page += ManualHeading("options") + OptionParagraphs(program.options);
    page += ManualHeading("commands");
    for (const DescribedCommand& command : program.commands)
        page += CommandSection(command);
    page += ManualHeading("exit status") + ExitParagraphs(text.exitMeanings);
    page += ManualHeading("environment") + NamedParagraphs(ProgramVariables());
    page += ManualHeading("files") + NamedParagraphs(ProgramFiles());
    page += ManualHeading("examples") + ExampleParagraphs(text.examples);
    return page;
}
