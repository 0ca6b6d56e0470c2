// SPDX-License-Identifier: Apache-2.0
#include "tools/completion.h"

#include <string_view>

namespace {

/// What stays the same whatever the commands are. Names of the desktop come from the very program that is
/// being completed, as numbers, which need no quoting.
constexpr const char* BEGINNING = R"(# bash completion for screenshare

_screenshare_ids() { # PROGRAM KIND [PLATFORM]
    "$1" list "$2" ${3:+--platform "$3"} 2>/dev/null | awk '$1 ~ /^[0-9]+$/ { print $1 }'
}

# Sets command, the words of it that are there already, and platform, the value of that option.
_screenshare_look_back() {
    local word before=
    for word in "${COMP_WORDS[@]:1:COMP_CWORD-1}"; do
        [[ $word == = ]] && continue
        if [[ $before == --platform ]]; then
            platform=$word
            before=
            continue
        fi
        before=$word
        case "$command $word" in
)";

constexpr const char* MIDDLE = R"(                command+=" $word"
                ;;
        esac
    done
}

_screenshare_complete_words() { # WORDS
    mapfile -t COMPREPLY < <(compgen -W "$1" -- "$current")
}

_screenshare_complete_files() { # -f or -d
    compopt -o filenames 2>/dev/null
    mapfile -t COMPREPLY < <(compgen "$1" -- "$current")
}

_screenshare() {
    local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD - 1]}
    local command=screenshare platform=
    # --option=value are three words here.
    if [[ $current == = ]]; then
        current=
    elif [[ $previous == = ]]; then
        previous=${COMP_WORDS[COMP_CWORD - 2]}
    fi
    COMPREPLY=()
    _screenshare_look_back
    case "$command $previous" in
)";

constexpr const char* BETWEEN_VALUES_AND_WORDS = R"(    esac
    case "$command" in
)";

constexpr const char* END = R"(    esac
}

complete -F _screenshare screenshare
)";

bool Has(std::string_view text, std::string_view part) {
    return text.find(part) != std::string_view::npos;
}

std::string WordsAction(const std::string& words) {
    return "_screenshare_complete_words \"" + words + "\"";
}

std::string IdsAction(const std::string& kind, const std::string& others = "") {
    return WordsAction(others + "$(_screenshare_ids \"$1\" " + kind + " \"$platform\")");
}

/// How a value is completed; empty where nothing is known of it.
std::string ActionOf(const DescribedOption& option) {
    if (!option.choices.empty()) {
        std::string words;
        for (const std::string& choice : option.choices)
            words += (words.empty() ? "" : " ") + choice;
        return WordsAction(words);
    }
    const std::string& name = option.names.back();
    const std::string& value = option.value.empty() ? name : option.value;
    if (value == "DIR")
        return "_screenshare_complete_files -d";
    if (Has(value, "FILE"))
        return "_screenshare_complete_files -f";
    if (Has(value, "PID"))
        return IdsAction("apps");
    if (value == "ID|TITLE" || (value == "ID" && Has(name, "window")))
        return IdsAction("windows");
    return value == "ID" && Has(name, "monitor") ? IdsAction("monitors", "main ") : "";
}

std::string CaseOf(const std::string& pattern, const std::string& actions) {
    return "        " + pattern + ")\n            " + actions + "\n            ;;\n";
}

/// The words that name a command, each after those before it.
std::string AllPaths(const DescribedCommand& command) {
    std::string paths;
    for (const DescribedCommand& each : command.commands) {
        paths += (paths.empty() ? "'" : " | '") + each.path + "'";
        if (const std::string below = AllPaths(each); !below.empty())
            paths += " | " + below;
    }
    return paths;
}

/// Those of the program are the same behind each command.
std::string ValueCases(const DescribedCommand& command) {
    const std::string before =
        command.commonOptions.empty() ? "'" + command.path + "'*' " : "'" + command.path + " ";
    std::string cases;
    for (const DescribedOption& option : command.options) {
        if (option.value.empty())
            continue;
        const std::string action = ActionOf(option);
        // A value of which nothing is known has nothing to offer, and no option stands in its place either.
        for (const std::string& name : option.names)
            cases += CaseOf(before + name + "'",
                            (action.empty() ? "" : action + "\n            ") + std::string("return"));
    }
    return cases;
}

std::string ValueCasesOfAll(const DescribedCommand& command) {
    std::string cases = ValueCases(command);
    for (const DescribedCommand& each : command.commands)
        cases += ValueCasesOfAll(each);
    return cases;
}

std::string CommandWords(const DescribedCommand& command) {
    std::string words;
    for (const DescribedCommand& each : command.commands)
        words += (words.empty() ? "" : " ") + each.Name();
    return words;
}

std::string OptionWords(const DescribedCommand& command) {
    std::string words;
    for (const std::vector<DescribedOption>* options : {&command.options, &command.commonOptions}) {
        for (const DescribedOption& option : *options)
            words += (words.empty() ? "" : " ") + option.names.back();
    }
    return words;
}

/// What stands in the place of a word that doesn't begin as an option does; empty when only options are left.
std::string ActionBesideOptions(const DescribedCommand& command) {
    if (!command.commands.empty())
        return WordsAction(CommandWords(command));
    return command.arguments.empty() ? "" : ActionOf(command.arguments.front());
}

std::string WordCases(const DescribedCommand& command) {
    std::string actions = WordsAction(OptionWords(command));
    if (const std::string other = ActionBesideOptions(command); !other.empty())
        actions = "if [[ $current == -* ]]; then\n                " + actions +
                  "\n            else\n                " + other + "\n            fi";
    std::string cases = CaseOf("'" + command.path + "'", actions);
    for (const DescribedCommand& each : command.commands)
        cases += WordCases(each);
    return cases;
}

} // namespace

std::string BashCompletion(const DescribedCommand& program) {
    return BEGINNING + ("            " + AllPaths(program) + ")\n") + MIDDLE + ValueCasesOfAll(program) +
           BETWEEN_VALUES_AND_WORDS + WordCases(program) + END;
}
