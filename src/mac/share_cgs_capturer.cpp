// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_cgs_capturer.h"

#include "platform/core_graphics.h"
#include "platform/core_graphics_images.h"
#include "src/app_share_config.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_util_mac.h"
#include "src/share_dump_time_usage.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>

namespace {

constexpr int CONTEXT_PIXEL_BYTES = 4;

void TraceDrawing(ShareDumpTimeUsage& usage, const platform::CGImageRef& image,
                  const platform::CGRect& place) {
    if ((AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_PERFORMANCE_TRACE) == 0)
        return;
    CmTraceInfo("[Performance]ShareCGSCapturer.CGContextDrawImage usagetime=", usage.Stop(),
                " image=", ShareUtilMac::CGImageToString(image).c_str(),
                " destRect=", ShareUtilMac::CGRectToString(place).c_str());
}

} // namespace

bool ShareCGSCapturer::init() {
    return CmCallGuarded("[ShareCGSCapturer::init]>>fail>>",
                         [this] { setCaptureDisplay(platform::CGMainDisplayID()); });
}

// ---- Sizes

void ShareCGSCapturer::initScreenSize() {
    const unsigned display = m_nCapturedDisplayId;
    const float scale = CMonitorEnumMac::screenScaleFactorForDisplayID(display);
    const platform::CGRect bounds = platform::CGDisplayBounds(display);
    m_fDisplayScale = scale;
    m_sizeDisplayImage =
        TVLSize{CmTruncate(static_cast<float>(platform::CGDisplayPixelsWide(display)) * scale),
                CmTruncate(static_cast<float>(platform::CGDisplayPixelsHigh(display)) * scale)};
    m_rectCapturedDisplay = bounds;
    updateCaptureSize();
    CmTraceInfo("[ShareCGSCapturer::initScreenSize] displayid=", display, " fDisplayScale = ", scale,
                " left = ", bounds.origin.x, " top = ", bounds.origin.y, " width = ", bounds.size.width,
                " height = ", bounds.size.height);
}

void ShareCGSCapturer::updateCaptureSize() {
    const platform::CGSize whole = platform::CGRect(m_rectCapturedDisplay).size;
    if (whole.width == 0 || whole.height == 0)
        return;
    const platform::CGSize part = platform::CGRect(m_rectCapture).size;
    const TVLSize image = m_sizeDisplayImage;
    const float scale = m_fCaptureScale;
    const TVLSize size{CmTruncate(static_cast<float>(image.cx) * scale * part.width / whole.width),
                       CmTruncate(static_cast<float>(image.cy) * scale * part.height / whole.height)};
    const TVLSize before = m_sizeBmpContext;
    if (size == before)
        return;
    m_sizeBmpContext = size;
    CmTraceInfo("ShareCGSCapturer.updateCaptureSize m_sizeBmpContext={", " w=", size.cx, " h=", size.cy);
}

void ShareCGSCapturer::updateCaptureRect(const TVLRect& rect) {
    const platform::CGRect wanted = ShareUtilMac::TVLRectToCGRect(rect);
    if (wanted == platform::CGRect(m_rectCapture))
        return;
    m_rectCapture = wanted;
    updateCaptureSize();
}

void ShareCGSCapturer::setScale(float scale) {
    {
        const std::lock_guard<std::mutex> lock(m_bmpContextLock);
        if (scale != m_fCaptureScale) {
            m_fCaptureScale = scale;
            updateCaptureSize();
        }
    }
    CmTraceInfo("ShareCGSCapturer.setScale m_fCaptureScale=", scale);
}

bool ShareCGSCapturer::setCaptureDisplay(unsigned display) {
    const std::lock_guard<std::mutex> lock(m_bmpContextLock);
    if (display != m_nCapturedDisplayId) {
        m_nCapturedDisplayId = display;
        initScreenSize();
    }
    return true;
}

TVLRect ShareCGSCapturer::getDisplayCaptureRect() const {
    return ShareUtilMac::CGRectToTVLRect(m_rectCapturedDisplay);
}

// ---- The frame

/// Whether what was drawn on last is this frame as it has to be. The same address alone says little: an
/// earlier frame may be gone and a smaller one have its place.
bool ShareCGSCapturer::HasContextOn(IShareFrame& frame) const {
    const TVLSize wanted = m_sizeBmpContext;
    if (m_pIShareFrameData == nullptr || m_pIShareFrameData != frame.GetFrameData() ||
        platform::CGBitmapContextGetWidth(m_bmpContext.get()) != wanted.cx ||
        platform::CGBitmapContextGetHeight(m_bmpContext.get()) != wanted.cy)
        return false; // from here on it is a size that a picture can have
    TVLSize size{};
    frame.GetFrameSize(size);
    const std::int64_t needed = std::int64_t{CONTEXT_PIXEL_BYTES} * wanted.cx * wanted.cy;
    return size == wanted && frame.GetFrameDataFormat() == SHARE_FRAME_FORMAT_RGBA &&
           frame.GetFrameDataLen() == needed && CShareFrame::BackedDataLen(frame) >= needed;
}

void ShareCGSCapturer::updateCaptureFrame(IShareFrame& frame) {
    CShareFrame::DropNoteOf(frame);
    if (HasContextOn(frame))
        return;
    frame.Reset();
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.SetFrameSize(m_sizeBmpContext);
    unsigned char* const data = frame.GetFrameData();
    m_pIShareFrameData = initCapturerByData(data, CShareFrame::BackedDataLen(frame)) ? data : nullptr;
}

bool ShareCGSCapturer::initCapturerByData(unsigned char* data, int dataLen) {
    m_bmpContext = nullptr; // in any case: its memory may be gone
    if (m_nCapturedDisplayId == SHARE_INVALID_DISPLAY)
        return false;
    const TVLSize size = m_sizeBmpContext;
    const int rowBytes = CmTruncate(static_cast<double>(size.cx) * CONTEXT_PIXEL_BYTES);
    m_bmpContext =
        platform::CGBitmapContextCreate(data, static_cast<std::size_t>(std::max(dataLen, 0)), size.cx,
                                        size.cy, 8, rowBytes, platform::kCGImageAlphaNoneSkipLast);
    platform::CGContextSetInterpolationQuality(m_bmpContext.get(), platform::kCGInterpolationHigh);
    return m_bmpContext != nullptr;
}

// ---- Captures

bool ShareCGSCapturer::isCaptureWholeDesktop() const {
    return platform::CGRectEqualToRect(m_rectCapture, m_rectCapturedDisplay);
}

platform::CGImageRef ShareCGSCapturer::createScreenShotFor(int windowCount, const unsigned* windows) const {
    if (windowCount < 1 || windows == nullptr)
        return nullptr;
    const unsigned options = isCaptureWholeDesktop() ? platform::kCGWindowImageBoundsIgnoreFraming
                                                     : platform::kCGWindowImageDefault;
    return platform::CGWindowListCreateImageFromArray(
        m_rectCapture, {windows, static_cast<std::size_t>(windowCount)}, options);
}

unsigned ShareCGSCapturer::captureScreenRect(const TVLRect& rect, int windowCount, const unsigned* windows,
                                             IShareFrame* frame) {
    auto result = static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    if (frame == nullptr)
        return result;
    CmCallGuarded("[ShareCGSCapturer::captureScreenRect]>>fail>>", [&] {
        const std::lock_guard<std::mutex> lock(m_bmpContextLock);
        updateCaptureRect(rect);
        updateCaptureFrame(*frame);
        const unsigned drawn = _captureWindows(windowCount, windows);
        if (drawn == SHARE_CAPTURE_OK)
            frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
        result = drawn;
    });
    return result;
}

unsigned ShareCGSCapturer::_captureWindows(int windowCount, const unsigned* windows) {
    const platform::CGImageRef image =
        m_bmpContext != nullptr ? createScreenShotFor(windowCount, windows) : nullptr;
    if (image == nullptr)
        return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    const TVLSize size = m_sizeBmpContext;
    const platform::CGRect whole{{0, 0}, {static_cast<float>(size.cx), static_cast<float>(size.cy)}};
    // Frames are used again, and even the whole desktop may have places without a window.
    platform::CGContextClearRect(m_bmpContext.get(), whole);
    ShareDumpTimeUsage usage;
    platform::CGContextDrawImage(m_bmpContext.get(), whole, image.get());
    TraceDrawing(usage, image, whole);
    return SHARE_CAPTURE_OK;
}

platform::CGImageRef ShareCGSCapturer::captureScreenRect(const TVLRect& rect, int windowCount,
                                                         const unsigned* windows) {
    platform::CGImageRef image;
    CmCallGuarded("[ShareCGSCapturer::captureScreenRect]>>fail>>", [&] {
        updateCaptureRect(rect);
        image = createScreenShotFor(windowCount, windows);
    });
    return image;
}
