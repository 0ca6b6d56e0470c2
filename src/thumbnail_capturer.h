// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_thumbnail.h>

#include <vector>

/// The windows on screen that may stand for their application in a picker, front first: neither parts of the
/// desktop nor the dock.
std::vector<unsigned> ListPickerWindows();

/// Turns a window or an application into one bitmap in memory.
///
/// Threads:  one at a time.
/// Lifetime: the pixels of an image hold until the next capture, or the end of the capturer.
/// Errors:   false, with nothing traced. May throw std::bad_alloc.
class CThumbnailCapturer {
public:
    CThumbnailCapturer() = default;
    virtual ~CThumbnailCapturer();
    CThumbnailCapturer(const CThumbnailCapturer&) = delete;
    CThumbnailCapturer& operator=(const CThumbnailCapturer&) = delete;

    virtual bool init();
    virtual void stop();
    /// The largest window of the process; of equal ones the one nearest to the front.
    virtual bool captureAppImage(unsigned pid, ImageData& image);
    virtual bool captureWindowImage(unsigned window, ImageData& image) = 0;
};
