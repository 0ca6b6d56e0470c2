// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"
#include "tools/capture_signals.h"
#include "tools/share_request.h"

#include <screenshare/share_types.h>

#include <string>

/// What one way of capturing makes of a share.
struct DemoShot {
    SCREEN_CAPTURER_TYPE mode = SCREEN_CAPTURER_TYPE_DEFAULT;
    platform::CGImageRef picture; ///< The last of a second or so; null when none came in time.
    double framesPerSecond = 0;
    std::string remark; ///< For people; empty when there is nothing to be said.
};

/// Captures until the picture has settled, for two seconds at most, and five seconds at most before there is
/// one; less when the notice is raised or the desktop has gone. The request is a completed one.
DemoShot TakeShot(const ShareRequest& request, SCREEN_CAPTURER_TYPE mode, const StopNotice& stop);
