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

/// What CreateShareSourceEnumerator lists.
enum SHARE_SOURCE_ENUMERATOR_TYPE : int {
    SHARE_SOURCE_ENUMERATOR_TYPE_APP = 1,     ///< Running applications.
    SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR = 2, ///< Monitors.
};

/// What CreateSharePointing builds.
enum SHARE_POINTING_TYPE : int {
    SHARE_POINTING_TYPE_MOUSE = 1,
};

/// What ShareConfig sets.
enum SHARE_CONFIG : int {
    SHARE_CONFIG_FLAG = 1, ///< A 32-bit word of SHARE_CONFIG_FLAGS.
};

/// Which windows TvlEnumWindows walks over.
enum SHARE_WINDOW_ENUM_MODE : unsigned {
    SHARE_WINDOW_ENUM_NORMAL = 0,    ///< On screen, without the desktop's own windows and the dock.
    SHARE_WINDOW_ENUM_ON_SCREEN = 1, ///< The same with the dock.
    SHARE_WINDOW_ENUM_ALL = 2, ///< Those that are off the screen, too; any higher number means the same.
};

/// Hears of each window of a walk, on the thread that asked for it.
class ITvlEnumWindowsCallback {
public:
    /// False ends the walk.
    virtual bool OnWindow(unsigned window) = 0;

protected:
    ~ITvlEnumWindowsCallback() = default;
};

class ShareCapturerContext;
