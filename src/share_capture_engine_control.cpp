// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_impl.h"
#include "src/share_engine_factories.h"
#include "src/share_ref.h"
#include "util/cm_trace.h"

#include <utility>

/// What the client tells a running or stopped engine. Whatever touches the capturer goes through
/// RunOnCaptureThread, so that it never runs beside a pass.

/// Runs `call(capturer)` on the worker. -4 at once without a capturer, `whenGone` when there is none by then.
template <class Call>
int CShareCaptureEngine::_PostToCapturer(Call call, int whenGone) {
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    return _HandToCaptureThread([this, call = std::move(call), whenGone] {
        const CCmMutexGuard guard(_CapturerMutex());
        const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
        return static_cast<unsigned>(capturer != nullptr ? call(*capturer) : whenGone);
    });
}

int CShareCaptureEngine::SetCaptureFps(unsigned fps) {
    return _PostToCapturer([this, fps](IShareCapturer& capturer) {
        m_spShareCapturerContext->SetCaptureFps(static_cast<int>(fps));
        const int inForce = m_spShareCapturerContext->GetCaptureFps();
        if (const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker())
            worker->SetFps(static_cast<unsigned>(inForce));
        return capturer.SetFPS(inForce);
    });
}

int CShareCaptureEngine::SetFilterSelf(bool filter) {
    return _PostToCapturer([filter](IShareCapturer& capturer) { return capturer.SetFilterSelf(filter); });
}

int CShareCaptureEngine::SetCaptureThreadCount(unsigned count) {
    if (count == 0)
        return SHARE_RESULT_INVALID_PARAM;
    return _PostToCapturer(
        [count](IShareCapturer& capturer) { return capturer.SetCaptureThreadCount(count); });
}

int CShareCaptureEngine::AddSharedWindow(unsigned window) {
    if (window == SHARE_INVALID_WINDOW)
        return SHARE_RESULT_INVALID_PARAM;
    return _PostToCapturer([this, window](IShareCapturer& capturer) {
        const int result = capturer.AddSharedWindow(window);
        if (m_eSHARE_CAPTURE_ENGINE_TYPE == SHARE_CAPTURE_ENGINE_TYPE_WINDOW)
            _UpdateShareCaptureSize();
        return result;
    });
}

int CShareCaptureEngine::RemoveSharedWindow(unsigned window) {
    if (window == SHARE_INVALID_WINDOW)
        return SHARE_RESULT_INVALID_PARAM;
    return _PostToCapturer(
        [window](IShareCapturer& capturer) { return capturer.RemoveSharedWindow(window); });
}

int CShareCaptureEngine::AddUnSharedWindow(unsigned window) {
    if (window == SHARE_INVALID_WINDOW)
        return SHARE_RESULT_INVALID_PARAM;
    return _PostToCapturer([window](IShareCapturer& capturer) { return capturer.AddUnSharedWindow(window); });
}

int CShareCaptureEngine::RemoveUnSharedWindow(unsigned window) {
    if (window == SHARE_INVALID_WINDOW)
        return SHARE_RESULT_INVALID_PARAM;
    return _PostToCapturer(
        [window](IShareCapturer& capturer) { return capturer.RemoveUnSharedWindow(window); });
}

int CShareCaptureEngine::AddUnSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::AddUnSharedProcess]>> pid=", pid);
    return _PostToCapturer([pid](IShareCapturer& capturer) { return capturer.AddUnSharedProcess(pid); });
}

int CShareCaptureEngine::RemoveUnSharedProcess(unsigned pid) {
    if (pid == SHARE_INVALID_PROCESS)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::RemoveUnSharedProcess]>> pid=", pid);
    return _PostToCapturer([pid](IShareCapturer& capturer) { return capturer.RemoveUnSharedProcess(pid); });
}

int CShareCaptureEngine::AddSharedProcess(unsigned) {
    return SHARE_RESULT_NOT_AVAILABLE;
}

int CShareCaptureEngine::RemoveSharedProcess(unsigned) {
    return SHARE_RESULT_NOT_AVAILABLE;
}

int CShareCaptureEngine::SelectSharedDisplay(unsigned) {
    return SHARE_RESULT_NOT_AVAILABLE;
}

bool CShareCaptureEngine::IsAppShared(unsigned pid) {
    return pid != SHARE_INVALID_PROCESS && m_spShareCapturerContext->IsAppShared(pid);
}

bool CShareCaptureEngine::IsWindowShared(unsigned window) {
    return window != SHARE_INVALID_WINDOW && m_spShareCapturerContext->IsWindowShared(window);
}

int CShareCaptureEngine::AddCaptureShareSource(IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    const int type = source->GetSourceType();
    CmTraceInfo("[CShareCaptureEngine::AddCaptureShareSource]>>",
                ",pIShareSource=", static_cast<const void*>(source),
                ",sourceId=", source->GetSourceUniqueId(), ",eShareSourceType=", type);
    // Holds its own reference: the client may let go of the source as soon as this call has returned.
    return _PostToCapturer(
        [this, held = ShareRef<IShareSource>(source), type](IShareCapturer& capturer) {
            const int result = capturer.AddCaptureShareSource(held.Get());
            if (result != SHARE_RESULT_OK) {
                CmTraceError("[CShareCaptureEngine::AddCaptureShareSource]>>fail",
                             ",pIShareSource=", static_cast<const void*>(held.Get()),
                             ",eShareSourceType=", type);
                return result;
            }
            _UpdateShareCaptureSize();
            CmTraceInfo("[CShareCaptureEngine::AddCaptureShareSource]>>success",
                        ",pIShareSource=", static_cast<const void*>(held.Get()), ",eShareSourceType=", type);
            return result;
        },
        SHARE_RESULT_NO_CAPTURER);
}

int CShareCaptureEngine::RemoveCaptureShareSource(IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    if (!_HasCapturer())
        return SHARE_RESULT_NO_CAPTURER;
    CmTraceInfo("[CShareCaptureEngine::RemoveCaptureShareSource]>>eShareSourceType=",
                static_cast<int>(source->GetSourceType()));
    return _PostToCapturer(
        [held = ShareRef<IShareSource>(source)](IShareCapturer& capturer) {
            return capturer.RemoveCaptureShareSource(held.Get());
        },
        SHARE_RESULT_NO_CAPTURER);
}

int CShareCaptureEngine::GetCaptureShareSourceCount() {
    const CCmMutexGuard guard(_CapturerMutex());
    const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    return capturer != nullptr ? capturer->GetCaptureShareSourceCount() : 0;
}

IShareSource* CShareCaptureEngine::GetCaptureShareSource(int index) {
    const CCmMutexGuard guard(_CapturerMutex());
    const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    return capturer != nullptr ? capturer->GetCaptureShareSource(index) : nullptr;
}

int CShareCaptureEngine::SetCaptureMode(SCREEN_CAPTURER_TYPE mode) {
    const SCREEN_CAPTURER_TYPE old = m_eCaptureMode;
    if (mode == old) {
        CmTraceWarning("[CShareCaptureEngine::SetCaptureMode] set same capture mode=",
                       static_cast<int>(mode));
        return SHARE_RESULT_OK;
    }
    if (mode != SCREEN_CAPTURER_TYPE_DEFAULT && mode != SCREEN_CAPTURER_TYPE_AVFOUNDATION &&
        mode != SCREEN_CAPTURER_TYPE_CGS_GCD && mode != SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX) {
        CmTraceError(
            "[CShareCaptureEngine::SetCaptureMode]>>fail with unsupport capture mode eSCREEN_CAPTURER_TYPE=",
            static_cast<int>(mode));
        return SHARE_RESULT_NOT_SUPPORTED;
    }
    AppShareConfig& config = *AppShareConfig::Instance();
    config.m_nScreenCapturerType = mode;
    if (mode == SCREEN_CAPTURER_TYPE_DEFAULT)
        config.m_bWin8EnableMag = false;
    CmTraceInfo("[CShareCaptureEngine::SetCaptureMode]>> old=", static_cast<int>(old),
                ",new=", static_cast<int>(mode));
    m_eCaptureMode = mode;
    const bool isHandedOver = CmCallGuarded("[CShareCaptureEngine::SetCaptureMode]>>fail>>", [this] {
        RunOnCaptureThread([this] {
            if (_ReCreateShareCapturer())
                return static_cast<unsigned>(SHARE_RESULT_OK);
            CmTraceError("[CShareCaptureEngine::SetCaptureMode] failed >> recreate share capturer");
            return static_cast<unsigned>(SHARE_RESULT_FAILED);
        });
    });
    if (isHandedOver)
        return SHARE_RESULT_OK;
    config.m_nScreenCapturerType = old; // the capturer is still the one of that mode
    m_eCaptureMode = old;
    return SHARE_RESULT_FAILED;
}

/// For as long as the own capturer is away to be replaced. What a client posts meanwhile finds the new one:
/// refused, a window that is to be kept out would stay in.
class CShareCaptureEngine::Replacing {
public:
    explicit Replacing(CShareCaptureEngine& engine) : m_engine(engine) {
        m_engine._MarkCapturerReplaced(m_engine._HasCapturer());
    }
    ~Replacing() { m_engine._MarkCapturerReplaced(false); }
    Replacing(const Replacing&) = delete;
    Replacing& operator=(const Replacing&) = delete;

private:
    CShareCaptureEngine& m_engine;
};

/// Builds the own capturer anew. It gets neither the engine as sink nor the sources: it has to stand on the
/// context.
bool CShareCaptureEngine::_ReCreateShareCapturer() {
    AppShareConfig::Instance()->m_bRecreateCapturer = false;
    const Replacing replacing(*this);
    if (const std::shared_ptr<IShareCapturer> old = _GetOwnCapturer()) {
        _SetOwnCapturer(nullptr);
        // Waits for a notification that is just walking the sinks, so none comes from a half-destroyed
        // capturer.
        old->RemoveSink(this);
    }
    SHARE_CAPTURER_TYPE type{};
    switch (m_eSHARE_CAPTURE_ENGINE_TYPE) {
        case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
            type = SHARE_CAPTURER_TYPE_DESKTOP;
            break;
        case SHARE_CAPTURE_ENGINE_TYPE_APP:
            type = SHARE_CAPTURER_TYPE_APP;
            break;
        case SHARE_CAPTURE_ENGINE_TYPE_WINDOW:
            type = SHARE_CAPTURER_TYPE_WINDOW;
            break;
        default:
            return false;
    }
    bool isReady = false;
    CmCallGuarded("[CShareCaptureEngine::_ReCreateShareCapturer]>>fail>>", [&] {
        const std::shared_ptr<IShareCapturer> capturer = MakeOwnCapturer(type, m_spShareCapturerContext);
        if (capturer == nullptr)
            return;
        _SetOwnCapturer(capturer);
        isReady = capturer->Reinit();
    });
    return isReady;
}

int CShareCaptureEngine::SetAppShareBackgroundColor(int rgb) {
    AppShareConfig::Instance()->m_nAppShareBackgroundColor = rgb;
    CmTraceInfo("[CShareCaptureEngine::SetAppShareBackgroundColor]>>rgbValue=", rgb);
    return SHARE_RESULT_OK;
}
