// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

namespace platform {

/// The window server that is not there: there is nothing to see and nothing can be done. It is lost for good,
/// so it never has anything to tell and keeps no receiver.
class NoneWindowServer final : public WindowServer {
public:
    const char* Name() const override;

    LifeState GetLife() const override;
    Availability GetCapability(Capability capability) const override;
    Permission GetPermission() const override;
    void AskPermission() override;
    void SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) override;

    std::shared_ptr<const DisplayList> GetDisplays() const override;
    std::shared_ptr<const WindowSnapshot> GetWindows() const override;
    std::shared_ptr<const ApplicationList> GetApplications() const override;
    bool GetPointerPosition(CGPoint& position) const override;
    std::shared_ptr<const CursorImage> GetCursor() const override;

    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override;
    DisplayStreamResult OpenDisplayStream(const DisplayStreamRequest& request) override;
    void Rest() override;
    bool BringToFront(pid_t pid) override;

private:
    // Made once, so that no look-up needs memory.
    const std::shared_ptr<const DisplayList> m_noDisplays = std::make_shared<DisplayList>();
    const std::shared_ptr<const WindowSnapshot> m_noWindows = std::make_shared<WindowSnapshot>();
    const std::shared_ptr<const ApplicationList> m_noApplications = std::make_shared<ApplicationList>();
};

} // namespace platform
