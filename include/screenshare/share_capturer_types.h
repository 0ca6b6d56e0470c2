// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

/// What CreateShareCapture builds.
enum SHARE_CAPTURER_TYPE : int {
    SHARE_CAPTURER_TYPE_DESKTOP = 1,
    SHARE_CAPTURER_TYPE_APP = 2,
    SHARE_CAPTURER_TYPE_WINDOW = 3,
    SHARE_CAPTURER_TYPE_DUMMY = 4,
};

/// What CreateSharePointing builds.
enum SHARE_POINTING_TYPE : int {
    SHARE_POINTING_TYPE_MOUSE = 1,
};

/// What ShareConfig sets.
enum SHARE_CONFIG : int {
    SHARE_CONFIG_FLAG = 1, ///< A 32-bit word of SHARE_CONFIG_FLAGS.
};

class ShareCapturerContext;
