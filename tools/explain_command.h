// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/share_request.h"

#include <string>

/// `screenshare explain`: draws what a share would show into an SVG file, which is replaced.
/// Gives what went wrong, for people; empty when the file is written.
std::string ExplainInto(const std::string& file, ShareRequest request);
