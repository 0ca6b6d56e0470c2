// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/command_description.h"

#include <cstddef>
#include <string>
#include <string_view>

/// What --help prints, for a terminal of 80 columns.
std::string HelpText(const DescribedCommand& command);

/// Words with line breaks so that no line is longer than `width`, unless a word is. Each line but the first
/// begins with so many blanks.
std::string WrapWords(std::string_view text, std::size_t width, std::size_t indent);
