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
    m_nPublicationsSeen.reset();
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
    const std::uint64_t publications = m_shareCapturerContext->Publications();
    if (m_nPublicationsSeen == publications)
        return false;
    TVLRegion visible;
    m_shareCapturerContext->GetVisiableRegion(visible);
    const bool isOther = !m_bFirstChecking && m_rgnVisibleCache.AllRects() != visible.AllRects();
    m_bFirstChecking = false;
    Remember(visible, publications);
    return isOther;
}

void ShareUtilMacMonitorDraging::Remember(const TVLRegion& visible, std::uint64_t publications) {
    m_nPublicationsSeen.reset();
    m_rgnVisibleCache.CopyRgn(visible);
    TVLRect box{};
    if (m_rgnVisibleCache.GetRgnBox(box)) // without memory it would be no copy
        m_nPublicationsSeen = publications;
}
