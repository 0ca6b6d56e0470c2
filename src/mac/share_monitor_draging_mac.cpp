// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_monitor_draging_mac.h"

#include "src/share_capturer_context.h"
#include "util/cm_clock.h"
#include "util/cm_trace.h"

#include <vector>

namespace {

/// How long windows count as moving after their last change was seen.
constexpr unsigned long REST_MS = 500;

} // namespace

ShareUtilMacMonitorDraging::ShareUtilMacMonitorDraging(const std::shared_ptr<ShareCapturerContext>& context)
    : m_shareCapturerContext(context) {}

ShareUtilMacMonitorDraging::~ShareUtilMacMonitorDraging() = default;

void ShareUtilMacMonitorDraging::SetContext(const std::shared_ptr<ShareCapturerContext>& context) {
    m_shareCapturerContext = context;
}

bool ShareUtilMacMonitorDraging::IsDraging(const std::function<void()>& update) {
    const auto now = static_cast<unsigned long>(low_tick_policy::now() / 1000);
    const bool wasDraging = m_tickOnInvisibleRegionChanged != 0;
    if (wasDraging && now - m_tickOnInvisibleRegionChanged <= REST_MS)
        return true;
    m_tickOnInvisibleRegionChanged = 0;
    if (update)
        update();
    const bool isDraging = IsVisiableRegionChanged();
    if (isDraging)
        m_tickOnInvisibleRegionChanged = now;
    if (isDraging != wasDraging)
        CmTraceInfo("ShareUtilMacMonitorDraging::IsDraging status changed new=", isDraging,
                    ",old=", wasDraging);
    return isDraging;
}

bool ShareUtilMacMonitorDraging::IsVisiableRegionChanged() {
    if (m_shareCapturerContext == nullptr)
        return false;
    TVLRegion visible;
    m_shareCapturerContext->GetVisiableRegion(visible);
    if (m_bFirstChecking) {
        m_bFirstChecking = false;
        m_rgnVisibleCache.CopyRgn(visible);
        return false;
    }
    if (m_rgnVisibleCache.AllRects() == visible.AllRects())
        return false;
    m_rgnVisibleCache.CopyRgn(visible);
    return true;
}
