// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <cstdint>
#include <memory>
#include <string>

namespace platform {

namespace x11 {
class X11Hub;
}

/// An X11 server, through one connection that one thread of its own owns. No header of the X libraries is
/// needed to use it.
class X11WindowServer final : public WindowServer {
public:
    /// `display` as in the variable DISPLAY, which an empty one means. Doesn't connect yet: the first
    /// operation does, and again whenever the server was lost.
    explicit X11WindowServer(std::string display = {});
    ~X11WindowServer() override;
    X11WindowServer(const X11WindowServer&) = delete;
    X11WindowServer& operator=(const X11WindowServer&) = delete;

    const char* Name() const override;
    LifeState GetLife() const override;
    Availability GetCapability(Capability capability) const override;
    Permission GetPermission() const override; ///< X asks nobody.
    void AskPermission() override;
    void SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) override;
    std::shared_ptr<const DisplayList> GetDisplays() const override;
    std::shared_ptr<const WindowSnapshot> GetWindows() const override;
    std::shared_ptr<const ApplicationList> GetApplications() const override;
    bool GetPointerPosition(CGPoint& position) const override;
    std::shared_ptr<const CursorImage> GetCursor() const override;
    std::uint64_t GetMoment() const override;
    WindowPictureResult TakeWindowPicture(const WindowPictureRequest& request) override;
    DisplayStreamResult OpenDisplayStream(const DisplayStreamRequest& request) override;
    void Rest() override;
    bool BringToFront(pid_t pid) override;

private:
    const std::shared_ptr<x11::X11Hub> m_hub;
};

/// What SCREENSHARE_PLATFORM's "auto" means: X11 when a display answers that shows what people see, else
/// null. Under a Wayland session an X server answers but shows black; that is told in one trace line.
std::shared_ptr<WindowServer> MakeX11WindowServerIfSeen();

} // namespace platform
