// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "x11_grabber.h"

#include <screenshare/share_engine.h>

/// The client's own capturer: fills frames with what an X server shows.
///
/// Threads: the engine's worker while it runs, the client's before and after; never both, so nothing is
/// locked here.
class ScreenCapturer final : public CShareCapturerBase {
public:
    /// The grabber stays the caller's and outlives the capturer.
    explicit ScreenCapturer(X11Grabber& grabber);

    int Capture(IShareFrame* frame) override;
    int SetCaptureMaxSize(TVLSize size) override;
    int GetCurrentCaptureSourceSize(TVLSize& size) override;
    int GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) override;
    /// Grabs whenever it is asked to: any rate will do.
    int SetFPS(int) override { return SHARE_RESULT_OK; }

private:
    void ReportSize(TVLSize size);
    void ReportLoss();

    X11Grabber& m_grabber;
    TVLSize m_maxSize;
    TVLSize m_reportedSize;
    bool m_lossReported = false;
};
