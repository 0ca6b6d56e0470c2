// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_desktop_mac.h"

#include <memory>
#include <vector>

/// What captures applications or windows has in common: the display that is captured is the one that they lie
/// on.
///
/// Threads: following is the capture thread's; the rest is as in the base.
class CShareCapturerFollowingMac : public CShareCapturerDesktopMac {
protected:
    /// The context's share type becomes `type`; while the base is built it is a desktop share.
    CShareCapturerFollowingMac(const std::shared_ptr<ShareCapturerContext>& context, SHARE_TYPE type);

    /// Moves to the first of the displays that the last walk found, tells the sinks, and captures. With no
    /// display found the one that is captured stays. -1 without a back-end: none is made here.
    int FollowAndCapture(IShareFrame* frame);

    /// The back-end, made if there is none; null when it can't be made.
    std::shared_ptr<ShareCapturerMac> BackEndOrNew();

private:
    void FollowAppMonitors();
    void MoveTo(unsigned display);

    std::vector<unsigned> m_vecAppMonitors; // of the last pass; capture thread only
};
