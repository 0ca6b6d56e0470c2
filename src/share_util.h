// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

#include <string>

/// Small helpers without a platform.
class ShareUtil {
public:
    /// "{left:…,top:…,right:…,bottom:…,width:…,height:…}"
    static std::string TVLRectToString(const TVLRect& rect);

    /// `to` minus `from`, as 32 bits make of it.
    static int Extent(int from, int to);

    /// `a` plus `b`, as 32 bits make of it.
    static int Sum(int a, int b);

    /// Milliseconds of the monotonic clock, cut to 32 bits; never 0, so that a stamped frame can be told from
    /// one that is not.
    static unsigned GetCaptureFrameTimeStamp();
};
