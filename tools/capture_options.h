// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/share_request.h"

#include <screenshare/share_types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

enum class CaptureForm {
    Nothing, ///< Frames are only counted.
    Png,
    Y4m,
    Raw,
};

/// What `screenshare capture` is told.
struct CaptureOptions {
    ShareRequest request{};
    unsigned fps = 30;
    TVLSize maxSize{}; ///< 0 by 0 for no limit.
    SCREEN_CAPTURER_TYPE mode = SCREEN_CAPTURER_TYPE_DEFAULT;
    bool showsPointer = true;
    std::int64_t seconds = 0; ///< 0 for no limit; likewise of frames.
    std::int64_t frames = 0;
    CaptureForm form = CaptureForm::Nothing;
    std::string target{};   ///< A folder for PNG, else a file, or "-".
    bool tellsJson = false; ///< The statistics in the end.
};

/// "1280x720"; nothing for what isn't of that form, or has a side below 1 or above 32767.
std::optional<TVLSize> ParseSize(const std::string& text);

/// The ways of capturing by the names that the command line has for them.
std::vector<std::string> CaptureModeNames();
std::optional<SCREEN_CAPTURER_TYPE> CaptureModeOf(const std::string& name);
std::string CaptureModeName(SCREEN_CAPTURER_TYPE mode);
