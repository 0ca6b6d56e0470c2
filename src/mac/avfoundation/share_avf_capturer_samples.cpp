// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "src/mac/share_util_mac.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <algorithm>
#include <cstring>
#include <utility>

namespace {

constexpr std::size_t PIXEL_BYTES = 4;

constexpr unsigned NO_DATA_TRACE_PERIOD = 200;
constexpr unsigned SHORT_ROWS_TRACE_PERIOD = 500;

bool MayBeSeen(const platform::CMSampleBuffer* sample, const std::optional<ShareSampleGate>& gate) {
    if (!gate)
        return true;
    const platform::CMSampleBufferGenerations walked{gate->generation, gate->generation};
    return gate->generation != 0 && platform::CMSampleBufferGetGenerations(sample) == walked &&
           ShareUtilMac::RectIsEqual(gate->display, platform::CMSampleBufferGetDisplayRect(sample));
}

/// A sample's picture, open for reading while this lives.
class OpenPicture {
public:
    explicit OpenPicture(platform::CVPixelBufferRef image) : m_image(std::move(image)) {
        if (platform::CVPixelBufferLockBaseAddress(m_image.get(), platform::kCVPixelBufferLock_ReadOnly) !=
            platform::kCVReturnSuccess)
            m_image = nullptr;
    }
    ~OpenPicture() {
        platform::CVPixelBufferUnlockBaseAddress(m_image.get(), platform::kCVPixelBufferLock_ReadOnly);
    }
    OpenPicture(const OpenPicture&) = delete;
    OpenPicture& operator=(const OpenPicture&) = delete;

    bool IsOpen() const { return m_image != nullptr; }
    const std::uint8_t* Pixels() const { return platform::CVPixelBufferGetBaseAddress(m_image.get()); }
    std::size_t Width() const { return platform::CVPixelBufferGetWidth(m_image.get()); }
    std::size_t Height() const { return platform::CVPixelBufferGetHeight(m_image.get()); }
    std::size_t RowBytes() const { return platform::CVPixelBufferGetBytesPerRow(m_image.get()); }

private:
    platform::CVPixelBufferRef m_image;
};

void WriteFrame(IShareFrame& frame, const OpenPicture& picture, const std::uint8_t* pixels,
                std::size_t rowBytes) {
    const std::size_t height = picture.Height();
    frame.SetFrameSize(static_cast<int>(picture.Width()), static_cast<int>(height));
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_ARGB);
    frame.SetFrameLineBytes(static_cast<int>(rowBytes));
    frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    CShareFrame::DropNoteOf(frame);
    // Memory that was attached to the frame doesn't grow with it.
    const std::size_t length =
        std::min(static_cast<std::size_t>(CShareFrame::BackedDataLen(frame)), rowBytes * height);
    unsigned char* const data = frame.GetFrameData();
    if (data != nullptr && length != 0)
        std::memcpy(data, pixels, length);
}

} // namespace

void ShareAVFCapturer::captureOutput(platform::AVCaptureVideoDataOutput*,
                                     const platform::CMSampleBufferRef& sampleBuffer,
                                     platform::AVCaptureConnection*) {
    if (!isRunning()) {
        CmTraceWarning("[ShareAVFCapturer captureOutput] capture session has stopped, capture session = ",
                       SessionAddress());
        return;
    }
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (m_sampleBufferQueue.size() == KEPT_SAMPLES)
        m_sampleBufferQueue.pop_front();
    m_sampleBufferQueue.push_back(sampleBuffer);
}

unsigned ShareAVFCapturer::captureToIShareFrame(IShareFrame* frame) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    if (m_sampleBufferQueue.empty()) {
        static CCmRepeatedTraceSite site(NO_DATA_TRACE_PERIOD);
        CmTraceRepeated(site, CM_TRACE_WARNING, "[ShareAVFCapturer captureToIShareFrame] no capture data");
        return static_cast<unsigned>(SHARE_CAPTURE_NO_DATA);
    }
    while (!m_sampleBufferQueue.empty()) {
        const platform::CMSampleBufferRef sample = std::move(m_sampleBufferQueue.front());
        m_sampleBufferQueue.pop_front();
        if (const std::optional<int> code = CopySample(sample.get(), frame))
            return static_cast<unsigned>(*code);
        CmTraceWarning("[ShareAVFCapturer captureToIShareFrame] access image buffer failed");
    }
    return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
}

/// Nothing for a sample that doesn't open.
std::optional<int> ShareAVFCapturer::CopySample(const platform::CMSampleBuffer* sample, IShareFrame* frame) {
    const bool mayBeSeen = MayBeSeen(sample, m_gate);
    m_isStackUntold = !mayBeSeen && platform::CMSampleBufferGetGenerations(sample).before == 0;
    if (!mayBeSeen)
        return std::nullopt;
    const OpenPicture picture(platform::CMSampleBufferGetImageBuffer(sample));
    if (!picture.IsOpen())
        return std::nullopt;
    const std::uint8_t* const pixels = picture.Pixels();
    if (pixels == nullptr || frame == nullptr)
        return SHARE_CAPTURE_FAILED;
    const std::size_t rowBytes = picture.RowBytes();
    if (rowBytes < picture.Width() * PIXEL_BYTES) {
        TraceShortRows(rowBytes, picture.Width());
        return SHARE_CAPTURE_FAILED;
    }
    WriteFrame(*frame, picture, pixels, rowBytes);
    return SHARE_CAPTURE_OK;
}

/// Each capturer tells of it once for certain, all together now and then.
void ShareAVFCapturer::TraceShortRows(std::size_t rowBytes, std::size_t width) {
    static CCmRepeatedTraceSite site(SHORT_ROWS_TRACE_PERIOD);
    CCmRepeatedTraceSite first;
    CmTraceRepeated(std::exchange(m_bIsFistTrace, false) ? first : site, CM_TRACE_WARNING,
                    "[ShareAVFCapturer captureToIShareFrame] bytesPerRow < width * 4", rowBytes, ", width",
                    width);
}

void ShareAVFCapturer::clearSampleBufferQueue() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_sampleBufferQueue.clear();
}
