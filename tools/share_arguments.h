// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_options.h"

#include <CLI/CLI.hpp>

/// The options of a command about shares. What is read goes into the request or the options, which stay
/// longer than the command.

struct ShareArguments {
    CLI::Option* monitor;
    CLI::Option* apps;
    CLI::Option* windows;
};

/// What to share, and what to keep out.
ShareArguments AddShareArguments(CLI::App& command, ShareRequest& request);

/// That, and how to capture it, for how long, and where frames go.
void AddCaptureArguments(CLI::App& command, CaptureOptions& options);
