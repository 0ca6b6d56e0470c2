// SPDX-License-Identifier: Apache-2.0
#include "src/share_engine_factories.h"

#include "src/app_share_config.h"
#include "src/mac/app_enum_mac.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_capturer_app_mac.h"
#include "src/mac/share_capturer_desktop_mac.h"
#include "src/mac/share_capturer_window_mac.h"
#include "src/mac/share_pointing_mouse_mac.h"
#include "src/share_capturer_dummy.h"
#include "src/share_pointing_mouse.h"
#include "src/share_source_dummy.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

/// The exported makers of capturers, source lists and pointing objects. Each decides anew, at every call,
/// whether it makes a dummy or the platform's own.

namespace {

IShareCapturer* BuildCapturer(SHARE_CAPTURER_TYPE type,
                              const std::shared_ptr<ShareCapturerContext>& context) {
    const bool isDummyWanted = AppShareConfig::Instance()->IsDummyCaptureEnabled();
    switch (type) {
        case SHARE_CAPTURER_TYPE_DESKTOP:
            if (isDummyWanted)
                return new CShareCapturerDummy(context);
            return new CShareCapturerDesktopMac(context);
        case SHARE_CAPTURER_TYPE_APP:
            if (isDummyWanted)
                return new CShareCapturerDummy(context);
            return new CShareCapturerAppMac(context);
        case SHARE_CAPTURER_TYPE_WINDOW:
            if (isDummyWanted)
                return new CShareCapturerDummy(context);
            return new CShareCapturerWindowMac(context);
        case SHARE_CAPTURER_TYPE_DUMMY:
            return new CShareCapturerDummy(context);
    }
    return nullptr;
}

IShareSourceEnumerator* BuildEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE type, bool watchChanges) {
    const bool isDummyWanted = AppShareConfig::Instance()->IsDummySourceEnabled();
    switch (type) {
        case SHARE_SOURCE_ENUMERATOR_TYPE_APP:
            if (isDummyWanted)
                return new CShareSourceEnumeratorDummyApp;
            return new CAppEnumMac(watchChanges);
        case SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR:
            if (isDummyWanted)
                return new CShareSourceEnumeratorDummyDesktop;
            return new CMonitorEnumMac(watchChanges);
    }
    return nullptr;
}

ISharePointing* BuildPointing(SHARE_POINTING_TYPE type, unsigned baseDisplay) {
    if (type != SHARE_POINTING_TYPE_MOUSE)
        return nullptr;
    if (AppShareConfig::Instance()->IsDummyPointEnabled()) {
        CmTraceDebug("CreateSharePointing() create dummy object ");
        return new CSharePointingMouseDummy(baseDisplay);
    }
    CmTraceDebug("CreateSharePointing() create object ");
    return new CSharePointingMouseMac(baseDisplay);
}

} // namespace

IShareCapturer* CreateShareCapture(SHARE_CAPTURER_TYPE type, std::shared_ptr<ShareCapturerContext>& context) {
    CmTraceInfo("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=", static_cast<int>(type));
    IShareCapturer* capturer = nullptr;
    CmCallGuarded("[CreateShareCapture]>>fail>>", [&] { capturer = BuildCapturer(type, context); });
    return capturer;
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

IShareSourceEnumerator* CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE type, bool bWatchChanges) {
    CmTraceDebug("[CreateShareSourceEnumerator]>>type=", static_cast<int>(type));
    IShareSourceEnumerator* enumerator = nullptr;
    CmCallGuarded("[CreateShareSourceEnumerator]>>fail>>",
                  [&] { enumerator = BuildEnumerator(type, bWatchChanges); });
    return enumerator;
}

int DestroyShareSourceEnumerator(IShareSourceEnumerator* enumerator) {
    CmTraceInfo("[DestroyShareSourceEnumerator]>>pEnumerator=", static_cast<const void*>(enumerator));
    if (enumerator == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    delete enumerator;
    return SHARE_RESULT_OK;
}

ISharePointing* CreateSharePointing(SHARE_POINTING_TYPE type, unsigned baseDisplay) {
    CmTraceDebug("CreateSharePointing(", static_cast<int>(type), ", ", baseDisplay, ")");
    ISharePointing* pointing = nullptr;
    CmCallGuarded("CreateSharePointing() fail ", [&] { pointing = BuildPointing(type, baseDisplay); });
    return pointing;
}

int DestroySharePointing(ISharePointing* pointing) {
    CmTraceInfo("DestroySharePointing(", static_cast<const void*>(pointing), ")");
    delete pointing;
    return SHARE_RESULT_OK;
}
