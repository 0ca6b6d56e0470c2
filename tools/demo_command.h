// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/demo_subject.h"

/// `screenshare demo`: captures the desktop in force, or a built-in scene where there is none, in all ways
/// there are, and writes demo.png and demo.svg. Tells on standard output what to look at. SIGINT and SIGTERM
/// are a good end, too; nothing is written then. Gives what went wrong.
WriteResult RunDemo(const DemoOptions& options);
