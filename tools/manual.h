// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/command_description.h"

#include <string>
#include <string_view>

/// The manual page of a program with all its commands, for man.
std::string ManualPage(const DescribedCommand& program);

/// Text as it stands, with nothing in it that man would take for an instruction.
std::string RoffText(std::string_view text);
