// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_window_mac.h"

#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

namespace {

/// Has no name among the types of sources, since no list offers any: clients make sources of windows
/// themselves.
constexpr int SOURCE_OF_A_WINDOW = 3;

bool IsWindow(IShareSource* source) {
    return source != nullptr && static_cast<int>(source->GetSourceType()) == SOURCE_OF_A_WINDOW;
}

} // namespace

CShareCapturerWindowMac::CShareCapturerWindowMac(const std::shared_ptr<ShareCapturerContext>& context)
    : CShareCapturerFollowingMac(context, SHARE_TYPE_WINDOW) {}

int CShareCapturerWindowMac::AddCaptureShareSource(IShareSource* source) {
    if (!IsWindow(source))
        return SHARE_RESULT_FAILED;
    const unsigned long id = source->GetSourceUniqueId();
    CmTraceInfo("[CShareCapturerWindowMac::AddCaptureShareSource] ssid=", id);
    if (BackEndOrNew() == nullptr)
        return SHARE_RESULT_FAILED;
    return AddSharedWindow(static_cast<unsigned>(id));
}

int CShareCapturerWindowMac::RemoveCaptureShareSource(IShareSource* source) {
    if (!IsWindow(source))
        return SHARE_RESULT_FAILED;
    const unsigned long id = source->GetSourceUniqueId();
    CmTraceInfo("[CShareCapturerWindowMac::RemoveCaptureShareSource] window=", id);
    return CShareCapturer::RemoveSharedWindow(static_cast<unsigned>(id));
}

int CShareCapturerWindowMac::AddSharedWindow(unsigned window) {
    CmCallGuarded("[CShareCapturerWindowMac::AddSharedWindow]>>fail>>",
                  [&] { _UpdateSharedDisplay2WindowHandle(window); });
    return CShareCapturer::AddSharedWindow(window);
}

void CShareCapturerWindowMac::_UpdateSharedDisplay2WindowHandle(unsigned window) {
    const unsigned display = ShareUtil::GetWindowDisplayID(window);
    if (const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd())
        backEnd->setCaptureDisplay(display);
    SelectSharedMonitor(display);
}

int CShareCapturerWindowMac::Capture(IShareFrame* frame) {
    return FollowAndCapture(frame);
}
