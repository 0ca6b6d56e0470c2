// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

#include <string>

/// Small helpers, and what the rest of the library asks about a window without knowing the platform.
/// Threads: any; nothing is kept. Errors: the default values told; a window server that fails or is gone is
/// no error.
class ShareUtil {
public:
    /// "{left:…,top:…,right:…,bottom:…,width:…,height:…}"
    static std::string TVLRectToString(const TVLRect& rect);

    /// `to` minus `from`, as 32 bits make of it.
    static int Extent(int from, int to);

    /// `a` plus `b`, as 32 bits make of it.
    static int Sum(int a, int b);

    /// Width times height, as 32 bits make of it.
    static int Area(const TVLRect& rect);

    /// What both cover; all zeros when that is nothing.
    static TVLRect Intersect(const TVLRect& a, const TVLRect& b);

    /// The owner's process id; 0x80000000 when it can't be found.
    static unsigned GetPIDOfWindowHandle(unsigned window);
    /// The same, and false when the question failed: a window of nobody's is an answer.
    static bool FindPIDOfWindowHandle(unsigned window, unsigned& pid);

    /// The window's frame in global points, all zeros when there is no such window.
    static void GetWindowRect(unsigned window, TVLRect& rect);

    static unsigned GetCurrentPID();

    /// The display that an application or a window lies on, see src/mac/share_util_mac.h.
    static unsigned GetAppDisplayID(unsigned pid);
    static unsigned GetWindowDisplayID(unsigned window);

    /// Milliseconds of the monotonic clock, cut to 32 bits; never 0, so that a stamped frame can be told from
    /// one that is not.
    static unsigned GetCaptureFrameTimeStamp();
};
