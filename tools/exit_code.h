// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

/// What the program ends with; scripts lean on these numbers.
enum ExitCode : int {
    EXIT_CODE_DONE = 0,
    EXIT_CODE_FAILED = 1,
    EXIT_CODE_MISUSED = 2,     ///< The command line makes no sense.
    EXIT_CODE_READER_GONE = 4, ///< Whoever read the output has closed the pipe.
    EXIT_CODE_NOT_WRITTEN = 5, ///< Output could not be written, such as to a full disk.
};

/// What a code means, for people.
struct ExitMeaning {
    ExitCode code = EXIT_CODE_DONE;
    std::string text;

    bool operator==(const ExitMeaning&) const = default;
};

/// All of them, for the program as a whole; by their numbers.
const std::vector<ExitMeaning>& ExitMeanings();

/// The same for a command, where some mean something more precise.
std::vector<ExitMeaning> ExitMeaningsWith(const std::vector<ExitMeaning>& ownMeanings);
