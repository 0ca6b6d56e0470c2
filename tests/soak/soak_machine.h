// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

/// What stands beside figures, so that others can tell what to compare them with.

/// "2 cores, 24 GiB, virtual machine, Debian GNU/Linux 12 (bookworm)".
std::string MachineKind();

/// "2026-11-22", where the user is.
std::string Today();
