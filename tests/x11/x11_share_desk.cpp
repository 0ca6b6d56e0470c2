// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_share_desk.h"

#include <cstdio>
#include <string>
#include <thread>

namespace {

/// Short beside the time between two frames: what came is seen before the next one.
constexpr std::chrono::milliseconds STEP{5};

} // namespace

X11ShareDesk::X11ShareDesk(const X11DeskOptions& options) : m_desk(std::make_shared<X11Desk>(options)) {}

/// As toolkits open menus: past the window manager.
std::optional<platform::CGWindowID> X11ShareDesk::AddPopup(pid_t owner, const platform::CGRect& frame,
                                                           std::uint32_t rgb) {
    X11Client* const client = m_desk->Application(owner);
    if (client == nullptr)
        return std::nullopt;
    char form[80];
    std::snprintf(form, sizeof form, "%d %d %d %d %06x override", static_cast<int>(frame.origin.x),
                  static_cast<int>(frame.origin.y), static_cast<int>(frame.size.width),
                  static_cast<int>(frame.size.height), static_cast<unsigned>(rgb));
    return client->Create("popup" + std::to_string(++m_popups), form);
}

void X11ShareDesk::CloseOwnWindow(pid_t owner) {
    X11Client* const client = m_desk->Application(owner);
    if (client != nullptr)
        client->Tell("destroy application");
}

/// An engine here works by the clock of the machine, so this can but watch it for that long.
void X11ShareDesk::Run(IShareCaptureEngine& /*engine*/, std::chrono::milliseconds time) {
    std::this_thread::sleep_for(time);
}

void X11ShareDesk::Step(IShareCaptureEngine& engine) {
    Run(engine, STEP);
}
