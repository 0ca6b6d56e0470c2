// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/cg_image.h"
#include "platform/core_types.h"
#include "src/mac/share_capturer_cgs.h"
#include "src/share_atomic.h"

#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

#include <mutex>

/// Draws one image of a list of windows into a frame: a capturer by itself, without anything shared or kept
/// out, and without a pointer. The caller says which windows, which rectangle and how large.
///
/// Frame:    RGBA without alpha, the capture rectangle scaled by the capture scale; what no window covers is
///           black.
/// Lifetime: keeps a bitmap context on the memory of the frame that it drew into last, and touches that only
///           in a capture that is given the same memory.
/// Threads:  any for what takes the lock: captures into frames, setScale, setCaptureDisplay. The rest one at
/// a
///           time, beside which those may run.
/// Units:    rectangles in global points, sizes in pixels.
/// Errors:   SHARE_CAPTURE_RESULT codes, false, or null. Nothing throws.
class ShareCGSCapturer {
public:
    ShareCGSCapturer() = default;
    ~ShareCGSCapturer() = default;
    ShareCGSCapturer(const ShareCGSCapturer&) = delete;
    ShareCGSCapturer& operator=(const ShareCGSCapturer&) = delete;

    /// Sent once, before anything else.
    bool init();
    void initScreenSize();
    /// Has the bitmap context lie on that memory, `dataLen` bytes. False when there is none then.
    bool initCapturerByData(unsigned char* data, int dataLen);

    /// 0 with the frame filled, or -1.
    unsigned captureScreenRect(const TVLRect& rect, int windowCount, const unsigned* windows,
                               IShareFrame* frame);
    /// Null without a picture. Takes no lock.
    platform::CGImageRef captureScreenRect(const TVLRect& rect, int windowCount, const unsigned* windows);

    // The caller has the lock, or nobody else is there.
    void updateCaptureFrame(IShareFrame& frame);
    void updateCaptureRect(const TVLRect& rect);
    void updateCaptureSize();

    /// Pixels of the frame for each of the display.
    void setScale(float scale);
    platform::CGImageRef createScreenShotFor(int windowCount, const unsigned* windows) const;
    bool isCaptureWholeDesktop() const;

    /// Always true.
    bool setCaptureDisplay(unsigned display);
    unsigned getCaptureDisplay() const { return m_nCapturedDisplayId; }
    /// The bounds of the display.
    TVLRect getDisplayCaptureRect() const;
    /// The whole display in pixels.
    TVLSize getDisplayCaptureSize() const { return m_sizeDisplayImage; }
    TVLSize getFrameSize() const { return m_sizeBmpContext; }
    int getCaptureFormat() const { return SHARE_FRAME_FORMAT_RGBA; }

private:
    bool HasContextOn(IShareFrame& frame) const;
    unsigned _captureWindows(int windowCount, const unsigned* windows);

    ShareRelaxed<unsigned> m_nCapturedDisplayId;
    platform::CGContextRef m_bmpContext; // on m_pIShareFrameData
    ShareRelaxedSize m_sizeBmpContext;
    ShareRelaxedSize m_sizeDisplayImage;
    std::mutex m_bmpContextLock;
    ShareRelaxedCGRect m_rectCapture;
    ShareRelaxedCGRect m_rectCapturedDisplay;
    ShareRelaxed<float> m_fCaptureScale{1.0F};
    ShareRelaxed<float> m_fDisplayScale{1.0F}; // pixels per point
    unsigned char* m_pIShareFrameData = nullptr;
};
