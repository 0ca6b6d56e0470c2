// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

/// What the command line asks for.
struct Options {
    std::string display; ///< Empty: the one that DISPLAY names.
    std::string directory = "frames";
    int seconds = 0; ///< 0: without end.
    int frames = 0;  ///< 0: without end.
    int fps = 5;
    int every = 1;
    bool checkDuplicates = false;
    bool probe = false;
    bool dump = false;
    bool help = false;
};

extern const char* const usageText;

/// False for a command line that makes no sense; `problem` then says why.
bool ParseOptions(int argc, const char* const* argv, Options& options, std::string& problem);

/// Reads a whole decimal number; false when `text` is anything else or lies outside the limits.
bool ParseNumber(const std::string& text, int low, int high, int& number);
