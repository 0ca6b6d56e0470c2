// SPDX-License-Identifier: Apache-2.0
#include "tools/desktop_lists.h"

#include "src/mac/monitor_enum_mac.h"

#include <cstdint>

std::vector<ListedMonitor> ListMonitors() {
    std::uint32_t count = 0;
    platform::CGGetOnlineDisplayList(0, nullptr, &count);
    std::vector<platform::CGDirectDisplayID> displays(count);
    platform::CGGetOnlineDisplayList(count, displays.data(), &count);
    // One may have gone since it was counted.
    if (count < displays.size())
        displays.resize(count);

    std::vector<ListedMonitor> monitors;
    monitors.reserve(displays.size());
    for (const platform::CGDirectDisplayID display : displays)
        monitors.push_back({display, platform::DisplayProductName(display),
                            platform::CGDisplayBounds(display),
                            CMonitorEnumMac::screenScaleFactorForDisplayID(display)});
    return monitors;
}

std::vector<platform::CGWindowDescription> ListWindows() {
    return platform::CGWindowListCopyWindowInfo(platform::kCGWindowListOptionOnScreenOnly);
}
