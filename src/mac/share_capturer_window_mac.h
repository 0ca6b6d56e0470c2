// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_following_mac.h"

/// Captures chosen windows, from the display of the one that was added last.
///
/// Sources of windows are not kept: they are no more than a way to name a window, so their count stays 0 and
/// no sink hears of them.
class CShareCapturerWindowMac : public CShareCapturerFollowingMac {
public:
    /// Makes a context if it is given none.
    explicit CShareCapturerWindowMac(const std::shared_ptr<ShareCapturerContext>& context);

    /// Windows only.
    int AddCaptureShareSource(IShareSource* source) override;
    int RemoveCaptureShareSource(IShareSource* source) override;
    int Capture(IShareFrame* frame) override;
    /// Captures the window's display from here on, even if the window is then refused.
    int AddSharedWindow(unsigned window) override;

private:
    void _UpdateSharedDisplay2WindowHandle(unsigned window);
};
