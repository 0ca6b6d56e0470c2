// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace platform::x11 {

/// The names that are looked up in the server once for each connection. The order is that of ATOM_NAMES.
enum class AtomName : std::size_t {
    WM_STATE,
    WM_NAME_UTF8, // _NET_WM_NAME
    UTF8_STRING,
    NET_WM_PID,
    NET_WM_STATE,
    NET_WM_STATE_HIDDEN,
    NET_WM_STATE_ABOVE,
    NET_WM_DESKTOP,
    NET_CURRENT_DESKTOP,
    NET_WM_WINDOW_TYPE,
    TYPE_DESKTOP,
    TYPE_DOCK,
    TYPE_TOOLBAR,
    TYPE_MENU,
    TYPE_UTILITY,
    TYPE_SPLASH,
    TYPE_DIALOG,
    TYPE_DROPDOWN_MENU,
    TYPE_POPUP_MENU,
    TYPE_TOOLTIP,
    TYPE_NOTIFICATION,
    TYPE_COMBO,
    TYPE_DND,
    TYPE_NORMAL,
    NET_WM_WINDOW_OPACITY,
    NET_WM_STRUT,
    NET_WM_STRUT_PARTIAL,
    GTK_FRAME_EXTENTS,
    NET_ACTIVE_WINDOW,
    NET_CLIENT_LIST,
    NET_CLIENT_LIST_STACKING,
    NET_SUPPORTING_WM_CHECK,
    XROOTPMAP_ID,
    ESETROOT_PMAP_ID,
    NET_WM_CM_S0, // with the number of the screen
    EDID,
    Count
};

/// As they are in the server, without the screen's number.
extern const char* const ATOM_NAMES[static_cast<std::size_t>(AtomName::Count)];

} // namespace platform::x11
