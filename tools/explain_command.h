// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"
#include "tools/share_request.h"

#include <string>

enum class ExplainForm {
    Picture, ///< SVG
    Json,
};

/// `screenshare explain`: tells what a share would show, in a file, which is replaced; "-" and an empty name
/// are standard output. Gives what went wrong.
WriteResult ExplainInto(const std::string& file, ExplainForm form, ShareRequest request);
