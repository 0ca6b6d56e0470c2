// SPDX-License-Identifier: Apache-2.0
#include "tools/command_tree.h"

#include "platform/utf8.h"

#include <algorithm>
#include <utility>

namespace {

const CLI::App& ProgramOf(const CLI::App& command) {
    const CLI::App* app = &command;
    while (app->get_parent() != nullptr)
        app = app->get_parent();
    return *app;
}

std::string PathOf(const CLI::App& command) {
    const CLI::App* const parent = command.get_parent();
    return (parent != nullptr ? PathOf(*parent) + " " : "") + command.get_name();
}

/// Commands of a command have the text of the one that the program has.
const CommandText& TextOf(const CLI::App& command) {
    const CLI::App* app = &command;
    if (app->get_parent() == nullptr)
        return ProgramText();
    while (app->get_parent()->get_parent() != nullptr)
        app = app->get_parent();
    return TextOfCommand(app->get_name());
}

std::vector<const CLI::App*> ShownCommandsOf(const CLI::App& command) {
    return command.get_subcommands([](const CLI::App* each) { return !each->get_group().empty(); });
}

/// A type's name may be followed by what its check says of itself: "MODE:{default,queued}".
std::pair<std::string, std::string> NameAndCheckOf(const CLI::Option& option) {
    const std::string type = option.get_type_name();
    const std::size_t colon = type.find(':');
    if (colon == std::string::npos)
        return {type, ""};
    return {type.substr(0, colon), type.substr(colon + 1)};
}

std::vector<std::string> ChoicesIn(const std::string& check) {
    if (check.size() < 2 || check.front() != '{' || check.back() != '}')
        return {};
    return CLI::detail::split(check.substr(1, check.size() - 2), ',');
}

DescribedOption Describe(const CLI::Option& option) {
    DescribedOption described;
    if (option.get_positional()) {
        described.names = {option.get_name(true)};
    } else {
        for (const std::string& name : option.get_snames())
            described.names.push_back("-" + name);
        for (const std::string& name : option.get_lnames())
            described.names.push_back("--" + name);
    }
    const bool takesValue = option.nonpositional() && option.get_type_size() != 0;
    auto [value, check] = NameAndCheckOf(option);
    if (takesValue)
        described.value = std::move(value);
    described.takesMany = takesValue && option.get_items_expected_max() > 1;
    described.isRequired = option.get_required();
    described.text = option.get_description();
    described.choices = ChoicesIn(check);
    return described;
}

std::vector<DescribedOption> OptionsOf(const CLI::App& command, bool arePositional) {
    std::vector<DescribedOption> options;
    for (const CLI::Option* const option : command.get_options()) {
        if (!option->get_group().empty() && option->get_positional() == arePositional)
            options.push_back(Describe(*option));
    }
    return options;
}

/// Those of the program that a command takes as well: all that don't end it.
std::vector<DescribedOption> CommonOptionsOf(const CLI::App& command) {
    if (command.get_parent() == nullptr)
        return {};
    std::vector<DescribedOption> options = OptionsOf(ProgramOf(command), false);
    const auto isFlag = [](const DescribedOption& option) { return option.value.empty(); };
    options.erase(std::remove_if(options.begin(), options.end(), isFlag), options.end());
    return options;
}

/// The one that the command line has got to.
const CLI::App& DeepestCommand(const CLI::App& program) {
    const CLI::App* command = &program;
    while (true) {
        const std::vector<const CLI::App*> parsed =
            command->get_subcommands([](const CLI::App* each) { return each->parsed(); });
        if (parsed.empty())
            return *command;
        command = parsed.front();
    }
}

std::string ShownNames(const CLI::App& command) {
    std::string names;
    for (const CLI::App* const each : ShownCommandsOf(command))
        names += (names.empty() ? "" : ", ") + each->get_name();
    return names;
}

bool IsOption(const std::string& argument) {
    return !argument.empty() && argument.front() == '-';
}

/// Options before a command may well be the command's own, so that only another word is to blame.
std::string MissingCommandText(const std::vector<std::string>& unexpected, const std::string& names) {
    const auto word = std::find_if_not(unexpected.begin(), unexpected.end(), IsOption);
    const std::string problem =
        word == unexpected.end() ? "a command is missing" : "there is no command '" + *word + "'";
    return problem + "; there are: " + names;
}

std::string UnexpectedText(const std::string& argument) {
    return IsOption(argument) ? "there is no option " + argument
                              : "'" + argument + "' is one argument too many";
}

/// "--y4m: 1 required FILE|- missing", "json was given a disallowed flag override"
std::string MismatchText(const std::string& text) {
    if (text.find("disallowed flag override") != std::string::npos)
        return "--" + text.substr(0, text.find_first_of(" =")) + " takes no value";
    const std::string begin = ": 1 required ";
    const std::string end = " missing";
    const std::size_t place = text.find(begin);
    if (place == std::string::npos || text.size() < place + begin.size() + end.size())
        return text;
    const std::string value = text.substr(place + begin.size());
    return text.substr(0, place) + " needs a value: " + value.substr(0, value.find_first_of(": "));
}

std::string ProblemText(const CLI::App& program, const CLI::App& command, const CLI::ParseError& error) {
    const std::vector<std::string> unexpected = program.remaining(true);
    if (dynamic_cast<const CLI::RequiredError*>(&error) != nullptr && !command.get_subcommands({}).empty())
        return MissingCommandText(unexpected, ShownNames(command));
    if (dynamic_cast<const CLI::ExtrasError*>(&error) != nullptr && !unexpected.empty())
        return UnexpectedText(unexpected.front());
    if (dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr)
        return MismatchText(error.what());
    return error.what();
}

} // namespace

DescribedCommand DescribeCommand(const CLI::App& command) {
    DescribedCommand described;
    described.path = PathOf(command);
    described.summary = command.get_description();
    described.text = TextOf(command);
    described.arguments = OptionsOf(command, true);
    described.options = OptionsOf(command, false);
    described.commonOptions = CommonOptionsOf(command);
    described.version = command.version();
    for (const CLI::App* const each : ShownCommandsOf(command))
        described.commands.push_back(DescribeCommand(*each));
    return described;
}

void RefuseValuesOfFlags(CLI::App& command) {
    for (CLI::Option* const option : command.get_options({})) {
        if (option->get_items_expected_max() == 0)
            option->disable_flag_override();
    }
    for (CLI::App* const each : command.get_subcommands([](const CLI::App*) { return true; }))
        RefuseValuesOfFlags(*each);
}

std::string MisuseText(const CLI::App& program, const CLI::ParseError& error) {
    const CLI::App& command = DeepestCommand(program);
    const std::string path = PathOf(command);
    const std::size_t blank = path.find(' ');
    const std::string about = blank == std::string::npos ? "" : path.substr(blank + 1) + ": ";
    const std::string problem = ProblemText(program, command, error);
    return platform::WithoutControls(platform::MendedUtf8(about + problem + "; see " + path + " --help"));
}
