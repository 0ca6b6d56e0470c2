// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_app_mac.h"

#include "platform/app_kit.h"
#include "src/share_capturer_context.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

namespace {

/// An application that is ending is no longer found, and can't be brought to the front.
void BringToFront(unsigned pid) {
    constexpr unsigned EVEN_FROM_BEHIND =
        platform::NSApplicationActivateAllWindows | platform::NSApplicationActivateIgnoringOtherApps;
    const auto application =
        platform::NSRunningApplication::runningApplicationWithProcessIdentifier(static_cast<pid_t>(pid));
    CmTraceInfo("[CShareCapturerAppMac::AddSharedProcess] app is ", application ? "found" : "NULL");
    if (!application)
        return;
    const bool activated = application->activateWithOptions(EVEN_FROM_BEHIND);
    CmTraceInfo("[CShareCapturerAppMac::AddSharedProcess] activateWithOptions return with ", activated);
}

} // namespace

CShareCapturerAppMac::CShareCapturerAppMac(const std::shared_ptr<ShareCapturerContext>& context)
    : CShareCapturerFollowingMac(context, SHARE_TYPE_APP) {}

int CShareCapturerAppMac::AddCaptureShareSource(IShareSource* source) {
    if (source == nullptr || source->GetSourceType() != SHARE_SOURCE_TYPE_APP)
        return SHARE_RESULT_FAILED;
    const unsigned long id = source->GetSourceUniqueId();
    CmTraceInfo("[CShareCapturerAppMac::AddCaptureShareSource] ssid=", id);
    if (const int result = AddSharedProcess(static_cast<unsigned>(id)); result != SHARE_RESULT_OK)
        return result;
    // Past the desktop's own, which takes monitors only.
    return CShareCapturer::AddCaptureShareSource(source); // NOLINT(bugprone-parent-virtual-call)
}

int CShareCapturerAppMac::RemoveCaptureShareSource(IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_FAILED;
    const bool isApp = source->GetSourceType() == SHARE_SOURCE_TYPE_APP;
    const bool removed = !isApp || Withdraw(static_cast<unsigned>(source->GetSourceUniqueId()));
    if (BackEnd() == nullptr)
        return SHARE_RESULT_FAILED;
    if (!removed)
        CmTraceWarning("[CShareCapturerAppMac::RemoveCaptureShareSource] failed to remove shared app");
    // Past the desktop's own, which keeps the source.
    return CShareCapturer::RemoveCaptureShareSource(source); // NOLINT(bugprone-parent-virtual-call)
}

int CShareCapturerAppMac::AddSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEndOrNew();
    if (backEnd == nullptr)
        return SHARE_RESULT_FAILED;
    unsigned display = SHARE_INVALID_DISPLAY;
    const bool isAimed = CmCallGuarded("[CShareCapturerAppMac::AddSharedProcess]>>fail>>", [&] {
        display = ShareUtil::GetAppDisplayID(pid);
        backEnd->setCaptureDisplay(display);
    });
    if (!isAimed)
        return SHARE_RESULT_FAILED;
    if (m_shareCapturerContext == nullptr)
        return SHARE_RESULT_OK;
    int shared = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCapturerAppMac::AddSharedProcess]>>fail>>", [&] {
        shared = m_shareCapturerContext->AddSharedApp(pid);
        if (shared == SHARE_RESULT_OK)
            SelectSharedMonitor(display);
    });
    if (shared != SHARE_RESULT_OK) {
        CmTraceWarning("[CShareCapturerAppMac::AddSharedProcess] m_shareCapturerContext failed");
        return SHARE_RESULT_OK;
    }
    BringToFront(pid);
    return SHARE_RESULT_OK;
}

int CShareCapturerAppMac::RemoveSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    const bool removed = Withdraw(pid);
    if (BackEnd() == nullptr)
        return SHARE_RESULT_FAILED;
    if (!removed)
        CmTraceWarning("[CShareCapturerAppMac::RemoveSharedProcess] failed to remove shared app");
    CShareCapturer::RemoveCaptureShareSourceApp(pid);
    return SHARE_RESULT_OK;
}

/// Also where the caller is told that it failed, without a back-end: the next one would show the application.
bool CShareCapturerAppMac::Withdraw(unsigned pid) {
    return m_shareCapturerContext == nullptr ||
           m_shareCapturerContext->RemoveSharedApp(pid) == SHARE_RESULT_OK;
}

int CShareCapturerAppMac::SelectSharedDisplay(unsigned) {
    return SHARE_RESULT_NOT_SUPPORTED;
}

int CShareCapturerAppMac::Capture(IShareFrame* frame) {
    if (BackEnd() == nullptr)
        return SHARE_CAPTURE_FAILED;
    if (m_shareCapturerContext != nullptr && m_shareCapturerContext->GetSharedAppCount() == 0) {
        NotifyCaptureNoSharedApp();
        return SHARE_CAPTURE_FAILED;
    }
    return FollowAndCapture(frame);
}
