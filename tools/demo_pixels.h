// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"
#include "tools/desktop_lists.h"

#include <cstdint>
#include <vector>

/// What the demo finds in pictures.

struct PixelTally {
    std::int64_t pixels = 0;
    std::int64_t secret = 0; ///< Those that have a colour of the built-in scene's secret window.
    bool isPlain = true;     ///< All of one colour.
};

/// All zeros for null.
PixelTally TallyPixels(const platform::CGImage* image);

/// The monitors as a person sees them, each where it stands. Null when they can't be seen; waits for a second
/// at most for each.
platform::CGImageRef ScreenPicture(const std::vector<ListedMonitor>& monitors);
