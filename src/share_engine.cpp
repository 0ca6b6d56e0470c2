// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_impl.h"
#include "src/share_capture_engine_kinds.h"
#include "src/share_engine_factories.h"
#include "util/cm_trace.h"

#include <screenshare/share_engine.h>

#include <cstring>
#include <exception>
#include <memory>
#include <mutex>

namespace {

/// How many hold the library: the client and each engine. It marks the first one in and the last one out;
/// nothing is built up or torn down by it.
class UseCount {
public:
    void Add() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_count++ == 0)
            CmTraceInfo("InitShareLib");
    }

    /// One release too many leaves the count at all bits set, and the next use at 0 again.
    void Subtract() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        if (m_count-- == 1)
            CmTraceInfo("UninitShareLib");
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
    LibraryUse().Subtract();
}

IShareCaptureEngine* CreateShareCaptureEngine(SHARE_CAPTURE_ENGINE_TYPE type) {
    CmTraceInfo("[CreateShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=", static_cast<int>(type));
    try {
        return BuildEngine(type);
    } catch (const std::exception& error) {
        CmTraceError("[CreateShareCaptureEngine]>>fail>>", error.what());
        return nullptr;
    }
}

int DestroyShareCaptureEngine(IShareCaptureEngine* engine) {
    if (engine == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    CmTraceInfo("[DestroyShareCaptureEngine]>>eSHARE_CAPTURE_ENGINE_TYPE=",
                static_cast<int>(engine->GetCaptureEngineType()));
    // Stop refuses only where it would have to wait for itself; the engine then has to live on.
    if (engine->Stop() != SHARE_RESULT_OK)
        return SHARE_RESULT_FAILED;
    delete engine;
    return SHARE_RESULT_OK;
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

IShareCapturer* CreateShareCapture(SHARE_CAPTURER_TYPE type, std::shared_ptr<ShareCapturerContext>&) {
    CmTraceInfo("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=", static_cast<int>(type));
    return nullptr;
}

int DestroyShareCapture(IShareCapturer* capturer) {
    CmTraceInfo("[DestroyShareCapture]>>pIShareCapturer=", static_cast<const void*>(capturer));
    if (capturer == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    delete capturer;
    return SHARE_RESULT_OK;
}

std::shared_ptr<IShareCapturer> MakeOwnCapturer(SHARE_CAPTURER_TYPE type,
                                                std::shared_ptr<ShareCapturerContext>& context) {
    IShareCapturer* capturer = CreateShareCapture(type, context);
    if (capturer == nullptr)
        return nullptr;
    return std::shared_ptr<IShareCapturer>(capturer, [](IShareCapturer* last) { DestroyShareCapture(last); });
}

ISharePointing* CreateSharePointing(SHARE_POINTING_TYPE type, unsigned baseDisplay) {
    CmTraceDebug("CreateSharePointing(", static_cast<int>(type), ", ", baseDisplay, ")");
    return nullptr;
}

int DestroySharePointing(ISharePointing* pointing) {
    CmTraceInfo("DestroySharePointing(", static_cast<const void*>(pointing), ")");
    delete pointing;
    return SHARE_RESULT_OK;
}
