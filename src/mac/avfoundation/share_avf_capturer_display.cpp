// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "src/mac/avfoundation/share_avf_session_change.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <screenshare/share_graphic_util.h>

#include <algorithm>
#include <new>
#include <optional>
#include <utility>

namespace {

constexpr auto NOTHING_TO_SCALE = static_cast<unsigned>(-311);
constexpr double SMALLEST_SCALE = 0.4;

using ConfigLock = std::lock_guard<std::recursive_mutex>;

/// False without memory; then nothing has changed.
bool SetAlphaFirst(platform::AVCaptureVideoDataOutput& output) {
    try {
        // Made beforehand: nothing that can fail comes between the defaults and this.
        std::optional<platform::AVVideoSettings> settings(std::in_place);
        settings->emplace(platform::kCVPixelBufferPixelFormatTypeKey, platform::kCVPixelFormatType_32ARGB);
        output.setVideoSettings(std::nullopt);
        settings->merge(output.videoSettings());
        output.setVideoSettings(settings);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

void FixRate(platform::AVCaptureConnection& connection, int fps, const void* self) {
    const platform::CMTime duration = platform::CMTimeMakeWithSeconds(1.0 / fps, 10000);
    if (connection.isVideoMinFrameDurationSupported())
        connection.setVideoMinFrameDuration(duration);
    else
        CmTraceWarning(
            "[ShareAVFCapturer updateVideoFormat] video connection can't support MinFrameDuration "
            "feature",
            ", self = ", self);
    if (connection.isVideoMaxFrameDurationSupported())
        connection.setVideoMaxFrameDuration(duration);
    else
        CmTraceWarning(
            "[ShareAVFCapturer updateVideoFormat] video connection can't support MaxFrameDuration "
            "feature",
            ", self = ", self);
}

} // namespace

// ---- Rate and format

int ShareAVFCapturer::setFPS(int fps) {
    if (fps < 0)
        return m_nFPS;
    CmTraceInfo("[ShareAVFCapturer setFPS to ]", fps);
    const ConfigLock lock(m_mutexConfig);
    m_nFPS = fps;
    updateVideoFormat();
    if (m_screenInput != nullptr)
        m_screenInput->setMinFrameDuration(platform::CMTimeMake(1, fps));
    return fps;
}

int ShareAVFCapturer::updateVideoFormat() {
    const int width = m_capture_width;
    const int height = m_capture_height;
    CmTraceInfo("[ShareAVFCapturer updateVideoFormat]  width = ", width, ", height = ", height,
                " ,self = ", this);
    if (width <= 0 || height <= 0)
        return SHARE_RESULT_INVALID_PARAM;
    const ConfigLock lock(m_mutexConfig);
    if (!isValid() || m_videoOutput == nullptr)
        return FAILED;
    const ShareAVFSessionChange change(*m_captureSession);
    const auto connections = m_videoOutput->connections();
    if (!connections.empty())
        FixRate(*connections.front(), m_nFPS, this);
    return SetAlphaFirst(*m_videoOutput) ? OK : FAILED;
}

// ---- Display and size

unsigned ShareAVFCapturer::setScale(TVLSize size) {
    CmTraceInfo("[ShareAVFCapturer setScale to ]", size.cx, " * ", size.cy);
    const ConfigLock lock(m_mutexConfig);
    m_capture_scaled_width = size.cx;
    m_capture_scaled_height = size.cy;
    const int width = m_capture_width;
    const TVLSize fit = TvlGraphicUtil::TvlGetMaxCapSize({width, m_capture_height}, size);
    if (m_screenInput == nullptr)
        return NOTHING_TO_SCALE;
    const double scale = std::max(SMALLEST_SCALE, static_cast<double>(fit.cx) / width);
    if (static_cast<double>(m_screenInput->scaleFactor()) == scale)
        return NOTHING_TO_SCALE;
    m_screenInput->setScaleFactor(static_cast<float>(scale));
    const float taken = m_screenInput->scaleFactor();
    int code = FAILED;
    // Held against what was wanted and not against what a float makes of it: most scales are refused here
    // although the input has them, and m_fScaleFactor stays.
    if (static_cast<double>(taken) == scale) {
        m_fScaleFactor = taken;
        code = OK;
    }
    CmTraceInfo("[ShareAVFCapturer setScale returned with ]", code);
    return static_cast<unsigned>(code);
}

int ShareAVFCapturer::initDisplay(bool bDisplayChanged) {
    const ConfigLock lock(m_mutexConfig);
    const TVLRect image = CMonitorEnumMac::screenImageRectForDisplayID(m_CaptureDisplayId);
    const TVLSize size{ShareUtil::Extent(image.left, image.right),
                       ShareUtil::Extent(image.top, image.bottom)};
    m_capture_width = size.cx;
    m_capture_height = size.cy;
    if (size.cx == 0 || size.cy == 0) {
        CmTraceError("[ShareAVFCapturer initDisplay Failed] m_capture_width = ", size.cx,
                     ", m_capture_height = ", size.cy);
        return FAILED;
    }
    if (!isValid())
        return FAILED;
    // One that an earlier change could not replace would go on showing the display before.
    const bool isOfDisplay = m_screenInput != nullptr && m_screenInput->displayID() == m_CaptureDisplayId;
    if (isOfDisplay && !bDisplayChanged) {
        FollowResolution(size);
        return OK;
    }
    if (m_screenInput != nullptr) {
        CmTraceInfo("[ShareAVFCapturer initDisplay displayed changed]");
        m_captureSession->removeInput(m_screenInput);
    }
    CmTraceInfo("[ShareAVFCapturer initDisplay screen input]");
    m_screenInput = platform::AVCaptureScreenInput::initWithDisplayID(m_CaptureDisplayId);
    if (m_screenInput == nullptr)
        return FAILED;
    AddScreenInput();
    CmTraceInfo("[ShareAVFCapturer initDisplay returned with ]", OK);
    return OK;
}

/// The display has another resolution; when it has turned, what was asked for turns with it.
void ShareAVFCapturer::FollowResolution(TVLSize display) {
    CmTraceInfo("[ShareAVFCapturer initDisplay resolution changed]");
    TVLSize scaled{m_capture_scaled_width, m_capture_scaled_height};
    // Wider than int, which has no room for the lowest height by a width of -1.
    if (scaled.cx != 0 && scaled.cy != 0 &&
        display.cx / display.cy == static_cast<long long>(scaled.cy) / scaled.cx)
        std::swap(scaled.cx, scaled.cy);
    setScale(scaled);
}

void ShareAVFCapturer::AddScreenInput() {
    const ShareAVFSessionChange change(*m_captureSession);
    if (m_capture_scaled_width != 0 && m_capture_scaled_height != 0)
        setScale({m_capture_scaled_width, m_capture_scaled_height});
    m_screenInput->setMinFrameDuration(platform::CMTimeMake(1, m_nFPS));
    m_screenInput->setRemovesDuplicateFrames(true);
    m_screenInput->setCapturesCursor(m_bCapturesCursor);
    const unsigned display = m_CaptureDisplayId;
    if (!m_captureSession->canAddInput(m_screenInput)) {
        CmTraceInfo("[ShareAVFCapturer createVideoInputAndOutput] cannot add display, display_id = ",
                    display);
        return;
    }
    m_captureSession->addInput(m_screenInput);
    CmTraceInfo("[ShareAVFCapturer createVideoInputAndOutput] open display success, display_id = ", display);
}

int ShareAVFCapturer::setInputDisplay(unsigned display) {
    const ConfigLock lock(m_mutexConfig);
    const bool bChanged = display != m_CaptureDisplayId;
    m_CaptureDisplayId = display;
    if (!isValid())
        return FAILED;
    if (isRunning())
        m_captureSession->stopRunning();
    const TVLSize before{m_capture_width, m_capture_height};
    int code = initDisplay(bChanged);
    // While it stands still, so that nothing of the new picture is lost.
    if (bChanged || TVLSize{m_capture_width, m_capture_height} != before)
        clearSampleBufferQueue();
    if (!isRunning() && !StartSession())
        code = FAILED;
    return code;
}
