// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_options.h"
#include "tools/exit_code.h"

/// `screenshare capture`: shares what is asked for until a limit, Ctrl-C, SIGTERM or the end of a pipe.
/// Frames go where the options say, everything for people to standard error. Threads: called before there is
/// any other thread, with the library in use. Errors: the code; what went wrong is told.
ExitCode RunCapture(CaptureOptions options);
