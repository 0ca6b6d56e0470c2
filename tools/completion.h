// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/command_description.h"

#include <string>

/// A script that bash sources, and completes a program's command lines from then on: commands, options,
/// values that are known, files and folders, and what the desktop has just now.
std::string BashCompletion(const DescribedCommand& program);
