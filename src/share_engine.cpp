// SPDX-License-Identifier: Apache-2.0
#include "platform/platform_life.h"
#include "src/app_share_config.h"
#include "src/share_capture_engine_impl.h"
#include "src/share_capture_engine_kinds.h"
#include "src/thumbnail_capture_engine.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_engine.h>

#include <cstring>
#include <mutex>

/// The exported functions of the library's use, of engines and of settings.

namespace {

/// How many hold the library: the client and each engine. It marks the first one in and the last one out. No
/// object of the system is built up or torn down by it; only the platform's threads end with the last one.
class UseCount {
public:
    void Add() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_count++ == 0)
            CmTraceInfo("InitShareLib");
    }

    /// True for the last one out. One release too many leaves the count at all bits set, and the next use at
    /// 0 again.
    bool Subtract() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_count-- != 1)
            return false;
        CmTraceInfo("UninitShareLib");
        return true;
    }

    bool IsUsed() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_count != 0;
    }

private:
    std::mutex m_mutex;
    unsigned m_count = 0;
};

UseCount& LibraryUse() {
    static UseCount use;
    return use;
}

IShareCaptureEngine* BuildEngine(SHARE_CAPTURE_ENGINE_TYPE type) {
    switch (type) {
        case SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION:
            return new CShareCaptureEngine;
        case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
            return new CShareCaptureDesktopEngine;
        case SHARE_CAPTURE_ENGINE_TYPE_APP:
            return new CShareCaptureAppEngine;
        case SHARE_CAPTURE_ENGINE_TYPE_WINDOW:
            return new CShareCaptureWindowEngine;
    }
    return nullptr;
}

} // namespace

void UseShareLib() {
    LibraryUse().Add();
}

void ReleaseShareLib() {
    if (!LibraryUse().Subtract())
        return;
    // Without the count's mutex: Rest waits for callbacks, and one of them may be making an engine.
    platform::Rest();
    if (LibraryUse().IsUsed())
        platform::Wake();
}

int ShareEngineInit() {
    UseShareLib();
    return SHARE_RESULT_OK;
}

int ShareEngineUninit() {
    CThumbnailCaptureEngine::get().stop();
    ReleaseShareLib();
    return SHARE_RESULT_OK;
}

IShareCaptureEngine* CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE type) {
    CmTraceInfo("[CreateShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=", static_cast<int>(type));
    IShareCaptureEngine* engine = nullptr;
    CmCallGuarded("[CreateShareCaptureEngine]>>fail>>", [&] { engine = BuildEngine(type); });
    return engine;
}

int DestroyShareCaptureEngine(IShareCaptureEngine* engine) {
    if (engine == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    CmTraceInfo("[DestroyShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=",
                static_cast<int>(engine->GetCaptureEngineType()));
    // Until the engine is gone, which waits for its sink once more. The library has made it itself.
    const ShareWait wait = static_cast<const CShareCaptureEngine*>(engine)->WaitForCallbacks();
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[DestroyShareCaptureEngine]>>fail>>", [&] { result = engine->Stop(); });
    // Stop refuses only where it would have to wait for itself; the engine then has to live on.
    if (result != SHARE_RESULT_OK || !wait.MayBegin())
        return SHARE_RESULT_FAILED;
    delete engine;
    return SHARE_RESULT_OK;
}

int EnableScreenShareDump(bool bEnableScreenShareDump) {
    CmTraceInfo("[EnableScreenShareDump]>>bEnableScreenShareDump=", bEnableScreenShareDump);
    AppShareConfig::Instance()->m_bCaptureDumpData = bEnableScreenShareDump;
    return SHARE_RESULT_OK;
}

int EnableChangeAeroMode(bool bEnableChangeAeroMode) {
    CmTraceInfo("[EnableChangeAeroMode]>>bEnableChangeAeroMode=", bEnableChangeAeroMode);
    AppShareConfig::Instance()->m_bChangeAeroMode = bEnableChangeAeroMode;
    return SHARE_RESULT_OK;
}

int EnableScreenShareHWEncode() {
    return SHARE_RESULT_NOT_SUPPORTED;
}

int ShareConfig(SHARE_CONFIG selector, const void* value, unsigned value_size) {
    if (selector != SHARE_CONFIG_FLAG) {
        CmTraceWarning("[ShareConfig] don't support eSHARE_CONFIG");
        return SHARE_RESULT_OK;
    }
    if (value == nullptr) {
        CmTraceWarning("[ShareConfig][SHARE_CONFIG_FLAG] error params value=", value,
                       " value_size=", value_size);
        return SHARE_RESULT_OK;
    }
    unsigned flags = 0;
    std::memcpy(&flags, value, sizeof flags);
    AppShareConfig::Instance()->m_nShareConfigFlags = flags;
    return SHARE_RESULT_OK;
}
