// SPDX-License-Identifier: Apache-2.0
#include "screen_capturer.h"

#include "pixel_copy.h"

#include <algorithm>
#include <cstdint>
#include <limits>

namespace {

ColourBytes ColoursOf(X11PixelOrder order) {
    switch (order) {
        case X11PixelOrder::RGBX:
            return {0, 1, 2};
        case X11PixelOrder::XRGB:
            return {1, 2, 3};
        case X11PixelOrder::XBGR:
            return {3, 2, 1};
        case X11PixelOrder::BGRX:
            break;
    }
    return {2, 1, 0};
}

// The largest size of the same shape inside the limit; never larger than the picture, never empty.
TVLSize FitInto(TVLSize picture, TVLSize limit) {
    if (picture.cx <= limit.cx && picture.cy <= limit.cy) {
        return picture;
    }
    const std::int64_t width = picture.cx;
    const std::int64_t height = picture.cy;
    if (width * limit.cy > height * limit.cx) {
        return {limit.cx, std::max(1, static_cast<int>(height * limit.cx / width))};
    }
    return {std::max(1, static_cast<int>(width * limit.cy / height)), limit.cy};
}

// False when the frame got no memory for the picture.
bool FillFrame(IShareFrame& frame, const X11Picture& picture, TVLSize size, const ColourBytes& order) {
    frame.Reset();
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA); // which the library can dump, too
    frame.SetFrameSize(size);
    if (frame.GetFrameData() == nullptr) {
        return false;
    }
    CopyAsRgba({picture.pixels, picture.lineBytes, picture.width, picture.height}, order,
               {frame.GetFrameData(), frame.GetFrameLineBytes(), size.cx, size.cy});

    // Frames are used again and keep the stamp of their last picture; at 0 the engine puts a new one.
    frame.SetTimestamp(0);
    // The root window is the whole desktop and begins at its origin. The pointer is not in its pixels.
    frame.SetMetaInfo({{0, 0, picture.width, picture.height}, false});
    return true;
}

} // namespace

ScreenCapturer::ScreenCapturer(X11Grabber& grabber)
    : m_grabber(grabber),
      m_maxSize{std::numeric_limits<int>::max(), std::numeric_limits<int>::max()},
      m_reportedSize{grabber.GetWidth(), grabber.GetHeight()} {}

int ScreenCapturer::Capture(IShareFrame* frame) {
    if (frame == nullptr) {
        return SHARE_CAPTURE_FAILED;
    }
    X11Picture picture{};
    if (!m_grabber.Grab(picture)) {
        ReportLoss();
        return SHARE_CAPTURE_FAILED;
    }
    // Before the frame is laid out: on hearing of a new size, the engine gives its frames that size.
    const TVLSize size{picture.width, picture.height};
    ReportSize(size);
    const bool filled =
        FillFrame(*frame, picture, FitInto(size, m_maxSize), ColoursOf(m_grabber.GetPixelOrder()));
    return filled ? SHARE_CAPTURE_OK : SHARE_CAPTURE_FAILED;
}

int ScreenCapturer::SetCaptureMaxSize(TVLSize size) {
    if (size.cx <= 0 || size.cy <= 0) {
        return SHARE_RESULT_INVALID_PARAM;
    }
    m_maxSize = size;
    return SHARE_RESULT_OK;
}

int ScreenCapturer::GetCurrentCaptureSourceSize(TVLSize& size) {
    size = m_reportedSize;
    return SHARE_RESULT_OK;
}

int ScreenCapturer::GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) {
    x = 0;
    y = 0;
    width = m_reportedSize.cx;
    height = m_reportedSize.cy;
    return SHARE_RESULT_OK;
}

void ScreenCapturer::ReportSize(TVLSize size) {
    if (size == m_reportedSize) {
        return;
    }
    m_reportedSize = size;
    if (GetSink() != nullptr) {
        GetSink()->OnCapturedDisplaySizedChanged(size);
    }
}

void ScreenCapturer::ReportLoss() {
    if (m_lossReported || m_grabber.IsConnected()) {
        return;
    }
    m_lossReported = true;
    if (GetSink() != nullptr) {
        GetSink()->OnCapturedDisplayChanged(false);
    }
}
