// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "src/mac/share_util_mac.h"
#include "util/cm_guarded_call.h"

#include <screenshare/share_engine.h>

/// The exported walk over the windows, for a client's picker.

namespace {

unsigned ListOption(unsigned mode) {
    constexpr unsigned WITHOUT_DESKTOP = platform::kCGWindowListExcludeDesktopElements;
    return mode >= SHARE_WINDOW_ENUM_ALL ? WITHOUT_DESKTOP
                                         : WITHOUT_DESKTOP | platform::kCGWindowListOptionOnScreenOnly;
}

bool IsWanted(const platform::CGWindowDescription& window, unsigned mode) {
    if (window.kCGWindowSharingState == platform::kCGWindowSharingNone)
        return false;
    if (mode >= SHARE_WINDOW_ENUM_ALL)
        return true;
    if (ShareUtilMac::need_skip_window(window.kCGWindowNumber, window.kCGWindowLayer))
        return false;
    return mode != SHARE_WINDOW_ENUM_NORMAL ||
           window.kCGWindowLayer != platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey);
}

} // namespace

int TvlEnumWindows(ITvlEnumWindowsCallback* callback, unsigned mode) {
    if (callback == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    const bool walked = CmCallGuarded("[TvlEnumWindows]>>fail>>", [&] {
        for (const platform::CGWindowDescription& window :
             platform::CGWindowListCopyWindowInfo(ListOption(mode))) {
            if (IsWanted(window, mode) && !callback->OnWindow(window.kCGWindowNumber))
                return;
        }
    });
    return walked ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}
