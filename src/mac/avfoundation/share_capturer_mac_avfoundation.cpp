// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_mac_avfoundation.h"

#include "src/app_share_config.h"
#include "src/share_dump_time_usage.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <utility>

ShareCapturerAVFoundation::~ShareCapturerAVFoundation() {
    CmTraceInfo("[ShareCapturerAVFoundation::dealloc]");
    EndSession();
}

bool ShareCapturerAVFoundation::init(const std::shared_ptr<ShareCapturerContext>& context) {
    return CmCallGuarded("[ShareCapturerAVFoundation::init]>>fail>>", [&] {
        KeepContext(context);
        initCapturer();
        m_fScale = 1.0F;
    });
}

void ShareCapturerAVFoundation::initCapturer() {
    CmTraceInfo("[ShareCapturerAVFoundation::initCapturer]");
    if (Session() == nullptr)
        return;
    Session()->initShareAVFCapturer();
    const int code = Session()->startRun();
    if (code != SHARE_RESULT_OK)
        CmTraceInfo("[ShareCapturerAVFoundation::initCapturer failed with ] ", code);
}

void ShareCapturerAVFoundation::initCapturerByData(unsigned char*, unsigned long) {
    CmTraceInfo("[ShareCapturerAVFoundation::initCapturerByData]");
}

bool ShareCapturerAVFoundation::setCaptureDisplay(unsigned display) {
    CmTraceInfo("[ShareCapturerAVFoundation::setCaptureDisplay] ", display);
    m_nCapturedDisplayId = display;
    if (Session() == nullptr)
        return true;
    int code = SHARE_RESULT_FAILED;
    CmCallGuarded("[ShareCapturerAVFoundation::setCaptureDisplay]>>fail>>",
                  [&] { code = Session()->setInputDisplay(display); });
    if (code == SHARE_RESULT_OK)
        return true;
    CmTraceError("[ShareCapturerAVFoundation::setCaptureDisplay ] ", display, " failed with ", code);
    return false;
}

platform::CGRect ShareCapturerAVFoundation::getCaptureRect() {
    return Session() != nullptr ? Session()->getCaptureRect() : platform::CGRect{};
}

unsigned ShareCapturerAVFoundation::captureToIShareFrame(IShareFrame* frame) {
    int result = SHARE_CAPTURE_FAILED;
    CmCallGuarded("[ShareCapturerAVFoundation::captureToIShareFrame]>>fail>>",
                  [&] { result = _captureToIShareFrame(frame); });
    return static_cast<unsigned>(result);
}

int ShareCapturerAVFoundation::_captureToIShareFrame(IShareFrame* frame) {
    ShareDumpTimeUsage total;
    if (IsDraging())
        return SHARE_CAPTURE_DRAGGING;
    const auto code = static_cast<int>(CopySample(frame));
    TVLRect box{};
    if (frame != nullptr)
        box = Stamp(*frame, true);
    if (code != SHARE_CAPTURE_OK || frame == nullptr)
        return code;
    if (!HideUnshared(*frame, box))
        return SHARE_CAPTURE_FAILED;
    if ((AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_PERFORMANCE_TRACE) != 0)
        CmTraceInfo("[Performance]ShareCapturerAVFoundation.captureToIShareFrame usageTime=", total.Stop());
    return Give();
}

bool ShareCapturerAVFoundation::HideUnshared(IShareFrame& frame, const TVLRect& box) const {
    const float scale = ScaleOf(frame, box);
    TVLRegion overlap;
    if (Context() != nullptr)
        Context()->GetOverlapRegion(overlap);
    return Hide(frame, std::move(overlap), box, scale, AppShareConfig::Instance()->m_nOverlapFillColor) &&
           HideAroundShare(frame, box, scale);
}
