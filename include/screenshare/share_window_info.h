// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

/// Bytes of a title with its terminating zero.
constexpr unsigned SHARE_WINDOW_TITLE_SIZE = 512;

/// What a picker shows and knows of a window. Plain data: it owns nothing, and a copy is a copy.
///
/// It may grow at its end in later versions, so it carries its size: the caller sets `structSize` to the
/// sizeof that it was built with. A library that knows more fields leaves those beyond it alone; fields that
/// the library doesn't know stay as they are, so start from zeros:
///
///     ShareWindowInfo info{};
///     info.structSize = sizeof info;
struct ShareWindowInfo {
    unsigned structSize; ///< Bytes; set by the caller, never changed.
    int ownerPid;        ///< Process id, 0 when it can't be told.
    /// Of the display that shows the largest part of it; of the main one where no display shows any of it,
    /// and 0 where there is no display.
    unsigned displayId;
    int onScreen; ///< 1 or 0; 0 also for what is minimised or on another workspace.
    TVLRect rect; ///< Global points, decorations in and shadows out, cut to whole ones.
    /// UTF-8, terminated, perhaps empty. One that is too long ends with the last whole character that fits;
    /// each byte that is no part of a character comes as U+FFFD.
    char title[SHARE_WINDOW_TITLE_SIZE];
};

extern "C" {

/// Tells of a window, such as TvlEnumWindows names.
///
/// Threads:  any, callbacks of the library included. Inside OnCaptureData the answer may be 100 ms old: of
///           the moment in which the share looked at the windows.
/// Memory:   `info` is the caller's; nothing is kept.
/// Errors:   0; -2 for null, window 0 and a `structSize` below that of the first version, which had the
///           fields up to `title`; -1 for a window that is gone, and without a window server. What fails
///           writes nothing, and nothing throws.
SCREENSHARE_API int ShareGetWindowInfo(unsigned window, ShareWindowInfo* info);

} // extern "C"
