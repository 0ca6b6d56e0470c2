// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_kinds.h"

#include "src/share_engine_factories.h"
#include "util/cm_trace.h"

#include <utility>

namespace {

SHARE_CAPTURER_TYPE CapturerTypeOf(SHARE_TYPE shareType) {
    return static_cast<SHARE_CAPTURER_TYPE>(shareType);
}

} // namespace

CShareCaptureOwnCapturerEngine::CShareCaptureOwnCapturerEngine(SHARE_CAPTURE_ENGINE_TYPE kind,
                                                               SHARE_TYPE shareType) {
    m_spShareCapturerContext->SetShareType(shareType);
    _SetOwnCapturer(MakeOwnCapturer(CapturerTypeOf(shareType), m_spShareCapturerContext));
    m_eSHARE_CAPTURE_ENGINE_TYPE = kind;
}

CShareCaptureOwnCapturerEngine::~CShareCaptureOwnCapturerEngine() {
    if (const std::shared_ptr<IShareCapturer> own = _GetOwnCapturer()) {
        own->RemoveSink(this);
        _SetOwnCapturer(nullptr);
    }
}

int CShareCaptureOwnCapturerEngine::SetExternalIShareCapturer(IShareCapturer*) {
    return SHARE_RESULT_FAILED;
}

int CShareCaptureOwnCapturerEngine::EnableExternalISharePointing(bool) {
    return SHARE_RESULT_FAILED;
}

template <class Call>
int CShareCaptureOwnCapturerEngine::_CallOwnCapturer(Call call, bool thenUpdateSize) {
    return _HandToCaptureThread([this, call = std::move(call), thenUpdateSize] {
        const std::shared_ptr<IShareCapturer> capturer = _GetOwnCapturer();
        if (capturer == nullptr)
            return static_cast<unsigned>(SHARE_RESULT_FAILED);
        const int result = call(*capturer);
        if (result == SHARE_RESULT_OK && thenUpdateSize)
            _UpdateShareCaptureSize();
        return static_cast<unsigned>(result);
    });
}

CShareCaptureDesktopEngine::CShareCaptureDesktopEngine()
    : CShareCaptureOwnCapturerEngine(SHARE_CAPTURE_ENGINE_TYPE_DESKTOP, SHARE_TYPE_DESKTOP) {}

int CShareCaptureDesktopEngine::SelectSharedDisplay(unsigned display) {
    if (display == SHARE_INVALID_DISPLAY)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::SelectSharedDisplay]>> displayId=", display);
    return _CallOwnCapturer(
        [display](IShareCapturer& capturer) { return capturer.SelectSharedDisplay(display); }, true);
}

CShareCaptureAppEngine::CShareCaptureAppEngine()
    : CShareCaptureOwnCapturerEngine(SHARE_CAPTURE_ENGINE_TYPE_APP, SHARE_TYPE_APP) {}

int CShareCaptureAppEngine::AddSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::AddSharedProcess]>> pid=", pid);
    return _CallOwnCapturer([pid](IShareCapturer& capturer) { return capturer.AddSharedProcess(pid); }, true);
}

/// No size follows a removal: it shows up through the capturer's own notifications.
int CShareCaptureAppEngine::RemoveSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::RemoveSharedProcess]>> pid=", pid);
    return _CallOwnCapturer([pid](IShareCapturer& capturer) { return capturer.RemoveSharedProcess(pid); },
                            false);
}

CShareCaptureWindowEngine::CShareCaptureWindowEngine()
    : CShareCaptureOwnCapturerEngine(SHARE_CAPTURE_ENGINE_TYPE_WINDOW, SHARE_TYPE_WINDOW) {}
