// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_impl.h"
#include "src/share_frame.h"
#include "util/cm_trace.h"

#include <cstring>
#include <optional>

/// The small switches of IShareCaptureEngine::Config.

namespace {

/// The switch's value, if the data has exactly its size. A bool is read as a byte, so that any byte is
/// welcome.
template <class Stored>
std::optional<Stored> ReadValue(const void* data, unsigned size) {
    if (size != sizeof(Stored))
        return std::nullopt;
    Stored value{};
    std::memcpy(&value, data, sizeof value);
    return value;
}

} // namespace

int CShareCaptureEngine::Config(SHARE_CAPTURE_ENGINE_CONFIG selector, void* data, unsigned size) {
    if (data == nullptr || size == 0)
        return SHARE_RESULT_INVALID_PARAM;
    switch (selector) {
        case SHARE_CAPTURE_ENGINE_CONFIG_MAG_MAX_EXCLUDE_WINDOW_COUNT: {
            const std::optional<int> count = ReadValue<int>(data, size);
            if (!count)
                return SHARE_RESULT_INVALID_PARAM;
            AppShareConfig::Instance()->SetMagCapturerMaxExcludeWindowCount(*count);
            return SHARE_RESULT_OK;
        }
        case SHARE_CAPTURE_ENGINE_CONFIG_SHARE_CONTENT_TYPE: {
            const std::optional<unsigned> type = ReadValue<unsigned>(data, size);
            return type ? _ConfigContentType(*type) : SHARE_RESULT_INVALID_PARAM;
        }
        default: {
            const std::optional<unsigned char> on = ReadValue<unsigned char>(data, size);
            return on ? _ConfigSwitch(selector, *on) : SHARE_RESULT_INVALID_PARAM;
        }
    }
}

int CShareCaptureEngine::_ConfigContentType(unsigned type) {
    CmTraceInfo("[CShareCaptureEngine::Config] SHARE_CONTENT_TYPE=", type);
    if (type > 1)
        return SHARE_RESULT_INVALID_PARAM;
    AppShareConfig::Instance()->m_nShareContentType = static_cast<int>(type);
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::_ConfigSwitch(SHARE_CAPTURE_ENGINE_CONFIG selector, unsigned value) {
    AppShareConfig& config = *AppShareConfig::Instance();
    const bool on = value != 0;
    switch (selector) {
        case SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME:
            CmTraceInfo("[CShareCaptureEngine::Config] SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME=", value);
            m_bCheckDupFrame = on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_WINDOW_BASE_AREA:
            CmTraceInfo("[CShareCaptureEngine::Config] SHARE_CAPTURE_ENGINE_CONFIG_WINDOW_BASE_AREA=", value);
            m_spShareCapturerContext->m_bNoWindowBaseArea = !on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME:
            m_bForceFrame = on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_EXCLUDE_MENUBAR:
            CmTraceInfo("[CShareCaptureEngine::Config] SHARE_CAPTURE_ENGINE_CONFIG_EXCLUDE_MENUBAR=", value);
            m_spShareCapturerContext->m_bExcludeMenuBar = on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_DISABLE_SYSTEM_ANIMATION:
            CmTraceInfo("[CShareCaptureEngine::Config] DISABLE_SYSTEM_ANIMATION=", value);
            config.m_bDisableSystemAnimation = on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_MAG_CATCH_EXCEPTION:
            CmTraceInfo(
                "[CShareCaptureEngine::Config] SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_MAG_CATCH_EXCEPTION=",
                value);
            config.m_bEnableMagCatchException = on;
            return SHARE_RESULT_OK;
        case SHARE_CAPTURE_ENGINE_CONFIG_ENABLE_IPC_SCREEN_CAPTURER:
            CmTraceInfo("[CShareCaptureEngine::Config] ENABLE_IPC_SCREEN_CAPTURER=", value);
            config.m_bEnableIpcScreenCapturer = on;
            return SHARE_RESULT_OK;
        default:
            return SHARE_RESULT_INVALID_PARAM;
    }
}
