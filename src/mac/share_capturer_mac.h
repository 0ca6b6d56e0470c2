// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

#include <memory>

class ShareCapturerContext;

/// A way of capturing: what a capturer owns one of, without knowing which.
///
/// Lifetime: held by std::shared_ptr, so that a capture on a queue keeps its back-end. The capturer gives it
/// up at
///           one point, after which no capture begins.
/// Threads:  captureToIShareFrame and setMaxSize on the capture thread; onDisplayPlugin, onDisplayPlugout and
///           onScreenResolutionChanged on the notice thread, perhaps beside a capture. Each back-end guards
///           itself.
/// Units:    displays in global points, frames in pixels.
/// Errors:   nothing throws. A back-end that could not be set up gives -1 or -302 from its captures.
class ShareCapturerMac {
public:
    ShareCapturerMac() = default;
    virtual ~ShareCapturerMac() = default;
    ShareCapturerMac(const ShareCapturerMac&) = delete;
    ShareCapturerMac& operator=(const ShareCapturerMac&) = delete;

    /// Null everywhere: pictures go through captureToIShareFrame.
    virtual unsigned char* capture() = 0;
    /// A SHARE_CAPTURE_RESULT, as unsigned. With a 0, the frame has size, format, line length, pixels,
    /// timestamp and meta information.
    virtual unsigned captureToIShareFrame(IShareFrame* frame) = 0;
    virtual bool setCaptureDisplay(unsigned display) = 0;
    virtual unsigned getCaptureDisplay() = 0;
    /// Sent before each capture: returns at once when the size is the one in force.
    virtual void setMaxSize(TVLSize size) = 0;
    virtual platform::CGRect getCaptureRect() = 0;
    virtual unsigned getSharedAppCount() = 0;
    virtual TVLSize getFrameSize() = 0;
    /// A SHARE_FRAME_FORMAT; 0 where a back-end has none to tell.
    virtual int getCaptureFormat() { return SHARE_FRAME_FORMAT_NONE; }
    /// Not 0 when the pointer is in the last frame or need not be added.
    virtual unsigned char pointerCaptured() = 0;
    /// A SHARE_RESULT, as unsigned.
    virtual unsigned setCaptureThreadCount(unsigned count) = 0;
    virtual bool IsWindowAreaBaseContentSupport() = 0;

    // What a capturer sends besides. A back-end that does not answer one of the later four does nothing and
    // gives 0.

    /// Makes the object ready; false leaves it unfit for use. Sent once, before anything else.
    virtual bool init(const std::shared_ptr<ShareCapturerContext>& context) = 0;
    /// Gives the rate in force.
    virtual int setFPS(int fps) {
        (void)fps;
        return 0;
    }
    // 1 when the change concerned the captured display.
    virtual int onDisplayPlugin(unsigned display) {
        (void)display;
        return 0;
    }
    virtual int onDisplayPlugout(unsigned display) {
        (void)display;
        return 0;
    }
    virtual int onScreenResolutionChanged(unsigned display) {
        (void)display;
        return 0;
    }
};
