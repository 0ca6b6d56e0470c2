// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/capture_output.h"

#include <string>

/// What `screenshare thumbnails` is asked for.
struct ThumbnailOptions {
    bool apps = true;
    bool windows = true;
    std::string folder;
    bool tellsJson = false;
};

/// Writes the thumbnails that a picker would show, and tells on standard error how many there were. SIGINT
/// and SIGTERM are a good end, too. Gives what went wrong.
WriteResult RunThumbnails(const ThumbnailOptions& options);
