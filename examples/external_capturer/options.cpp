// SPDX-License-Identifier: Apache-2.0
#include "options.h"

#include <array>
#include <charconv>

const char* const usageText =
    "external_capturer - captures an X display and writes what it shows as PNG files\n"
    "\n"
    "  --display NAME      the display; else the one that DISPLAY names\n"
    "  --seconds N         end after N seconds\n"
    "  --frames N          end after N frames\n"
    "  --fps N             frames a second, 1 to 240 (5)\n"
    "  --out DIR           where the files go; those of the same name are replaced (frames)\n"
    "  --every N           write every Nth frame only (1)\n"
    "  --check-duplicates  hold back frames that equal the one before\n"
    "  --dump              have the library dump its frames, as the debug file says\n"
    "  --probe             capture nothing; say whether the display can be captured\n"
    "  --help              this text\n"
    "\n"
    "Ends by a limit, by Ctrl-C or by the command stop. Commands are read from standard\n"
    "input, a line each; help lists them. SCREENSHARE_TRACE=info shows what the library does.\n"
    "Exit code: 0, 1 when something fails, 2 for a command line that makes no sense.\n";

namespace {

struct NumberOption {
    const char* name;
    int Options::*value;
    int high;
};

struct TextOption {
    const char* name;
    std::string Options::*value;
};

struct Switch {
    const char* name;
    bool Options::*value;
};

constexpr std::array<NumberOption, 4> numberOptions{{{"--seconds", &Options::seconds, 1000000},
                                                     {"--frames", &Options::frames, 1000000},
                                                     {"--fps", &Options::fps, 240},
                                                     {"--every", &Options::every, 1000000}}};
constexpr std::array<TextOption, 2> textOptions{
    {{"--display", &Options::display}, {"--out", &Options::directory}}};
constexpr std::array<Switch, 4> switches{{{"--check-duplicates", &Options::checkDuplicates},
                                          {"--dump", &Options::dump},
                                          {"--probe", &Options::probe},
                                          {"--help", &Options::help}}};

template <class Table>
auto Find(const Table& table, const std::string& name) -> decltype(table.data()) {
    for (const auto& entry : table) {
        if (name == entry.name) {
            return &entry;
        }
    }
    return nullptr;
}

} // namespace

bool ParseNumber(const std::string& text, int low, int high, int& number) {
    int parsed = 0;
    const char* end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, parsed);
    if (error != std::errc() || rest != end || parsed < low || parsed > high) {
        return false;
    }
    number = parsed;
    return true;
}

bool ParseOptions(int argc, const char* const* argv, Options& options, std::string& problem) {
    for (int i = 1; i < argc; ++i) {
        const std::string name = argv[i];
        if (const Switch* found = Find(switches, name)) {
            options.*found->value = true;
            continue;
        }
        const NumberOption* number = Find(numberOptions, name);
        const TextOption* text = Find(textOptions, name);
        if (number == nullptr && text == nullptr) {
            problem = "unknown option " + name + ", try --help";
            return false;
        }
        const std::string value = i + 1 < argc ? argv[++i] : "";
        if (value.empty()) {
            problem = name + " needs a value";
            return false;
        }
        if (text != nullptr) {
            options.*text->value = value;
        } else if (!ParseNumber(value, 1, number->high, options.*number->value)) {
            problem = name + " needs a number from 1 to " + std::to_string(number->high) + ", not \"" +
                      value + "\"";
            return false;
        }
    }
    return true;
}
