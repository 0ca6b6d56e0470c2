// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capture_engine_impl.h"

/// An engine that is bound to a capturer of its own. What each kind opens and closes stands with the kind;
/// feeding it with a client's capturer or pointer is closed on all of them.
class CShareCaptureOwnCapturerEngine : public CShareCaptureEngine {
public:
    int SetExternalIShareCapturer(IShareCapturer* capturer) override;
    int EnableExternalISharePointing(bool enable) override;
    ~CShareCaptureOwnCapturerEngine() override;

protected:
    CShareCaptureOwnCapturerEngine(SHARE_CAPTURE_ENGINE_TYPE kind, SHARE_TYPE shareType);

    /// Runs `call(capturer)` on the worker and, if it succeeds and `thenUpdateSize`, reports the new size. -4
    /// without a capturer.
    template <class Call>
    int _CallOwnCapturer(Call call, bool thenUpdateSize);
};

/// Shares one monitor.
class CShareCaptureDesktopEngine : public CShareCaptureOwnCapturerEngine {
public:
    CShareCaptureDesktopEngine();
    int SelectSharedDisplay(unsigned display) override;
};

/// Shares all windows of some processes.
class CShareCaptureAppEngine : public CShareCaptureOwnCapturerEngine {
public:
    CShareCaptureAppEngine();
    int AddSharedProcess(unsigned pid) override;
    int RemoveSharedProcess(unsigned pid) override;
};

/// Shares some windows.
class CShareCaptureWindowEngine : public CShareCaptureOwnCapturerEngine {
public:
    CShareCaptureWindowEngine();
};
