// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_following_mac.h"

#include "src/share_capturer_context.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"

#include <cstddef>
#include <map>
#include <utility>

CShareCapturerFollowingMac::CShareCapturerFollowingMac(const std::shared_ptr<ShareCapturerContext>& context,
                                                       SHARE_TYPE type)
    : CShareCapturerDesktopMac(context) {
    m_shareCapturerContext->SetShareType(type);
}

std::shared_ptr<ShareCapturerMac> CShareCapturerFollowingMac::BackEndOrNew() {
    if (BackEnd() == nullptr)
        InitCapturer();
    return BackEnd();
}

int CShareCapturerFollowingMac::FollowAndCapture(IShareFrame* frame) {
    if (BackEnd() == nullptr)
        return SHARE_CAPTURE_FAILED;
    const bool followed = CmCallGuarded("[CShareCapturerFollowingMac::FollowAndCapture]>>fail>>",
                                        [this] { FollowAppMonitors(); });
    return followed ? CShareCapturerDesktopMac::Capture(frame) : SHARE_CAPTURE_FAILED;
}

void CShareCapturerFollowingMac::FollowAppMonitors() {
    std::vector<unsigned> monitors;
    if (m_shareCapturerContext != nullptr)
        m_shareCapturerContext->GetAppMonitors(monitors);
    const std::size_t count = monitors.size();
    if (count > 0 && monitors != m_vecAppMonitors) {
        m_vecAppMonitors = std::move(monitors);
        if (const unsigned first = m_vecAppMonitors.front(); first != GetCurrentCaptureDisplayId())
            MoveTo(first);
    }
    NotifyCaptureAppsCrossMultiMonitor(count >= 2);
}

void CShareCapturerFollowingMac::MoveTo(unsigned display) {
    SelectSharedMonitor(display);
    std::map<unsigned, TVLRect> rects;
    m_shareCapturerContext->GetDisplayRects(rects);
    const auto found = rects.find(display);
    if (found == rects.end())
        return;
    const TVLRect& rect = found->second;
    NotifyCaptureSharedAppDisplayChange(display, rect.left, rect.top,
                                        ShareUtil::Extent(rect.left, rect.right),
                                        ShareUtil::Extent(rect.top, rect.bottom));
}
