// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/mac/share_capturer_following_mac.h"

/// Captures the windows of chosen applications.
///
/// Each pass without a shared application tells the sinks so and gives -1.
class CShareCapturerAppMac : public CShareCapturerFollowingMac {
public:
    /// Makes a context if it is given none.
    explicit CShareCapturerAppMac(const std::shared_ptr<ShareCapturerContext>& context);

    /// Applications only.
    int AddCaptureShareSource(IShareSource* source) override;
    int RemoveCaptureShareSource(IShareSource* source) override;
    int Capture(IShareFrame* frame) override;
    /// Brings the application to the front. 0 also when that fails.
    int AddSharedProcess(unsigned pid) override;
    /// 0 whether or not it was shared.
    int RemoveSharedProcess(unsigned pid) override;
    /// -5: the applications choose the display.
    int SelectSharedDisplay(unsigned display) override;

private:
    /// False when it wasn't shared.
    bool Withdraw(unsigned pid);
};
