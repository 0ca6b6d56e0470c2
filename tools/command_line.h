// SPDX-License-Identifier: Apache-2.0
#pragma once

/// The whole program: reads the command line and does what it says. Gives the exit code; complaints are a
/// line on standard error. Threads: called on the main thread, before there is any other.
int RunCommandLine(int argc, char** argv);
