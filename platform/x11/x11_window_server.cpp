// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_window_server.h"

#include "platform/x11/x11_hub.h"
#include "platform/x11/x11_session.h"
#include "platform/x11/x11_stream.h"
#include "util/cm_clock.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <optional>
#include <utility>

/// The side of the X11 window server that its users see.
namespace platform {

namespace {

/// How long a look for the pointer may take.
constexpr std::chrono::nanoseconds POINTER_LIMIT = std::chrono::milliseconds(100);

} // namespace

using x11::View;
using x11::X11Session;

X11WindowServer::X11WindowServer(std::string display) : m_hub(x11::X11Hub::Share(std::move(display))) {}

X11WindowServer::~X11WindowServer() {
    m_hub->Close();
}

const char* X11WindowServer::Name() const {
    return "x11";
}

LifeState X11WindowServer::GetLife() const {
    return m_hub->Life();
}

Availability X11WindowServer::GetCapability(Capability capability) const {
    return m_hub->Of(capability);
}

Permission X11WindowServer::GetPermission() const {
    return Permission::NotNeeded;
}

void X11WindowServer::AskPermission() {}

void X11WindowServer::SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) {
    CmCallGuarded("[X11WindowServer::SetNoticeReceiver]>>exception: ",
                  [&] { m_hub->SetReceiver(std::move(receiver)); });
}

std::shared_ptr<const DisplayList> X11WindowServer::GetDisplays() const {
    return m_hub->Displays();
}

std::shared_ptr<const WindowSnapshot> X11WindowServer::GetWindows() const {
    return m_hub->Windows();
}

std::shared_ptr<const ApplicationList> X11WindowServer::GetApplications() const {
    return m_hub->Applications();
}

// What runs on the other thread may run when nobody waits any more, so it owns what it writes to.

bool X11WindowServer::GetPointerPosition(CGPoint& position) const {
    const auto found = std::make_shared<std::optional<CGPoint>>();
    PictureOutcome outcome = PictureOutcome::Failed;
    CmCallGuarded("[X11WindowServer::GetPointerPosition]>>exception: ", [&] {
        outcome = m_hub->RunHereOrThere(CmSteadyNow() + POINTER_LIMIT,
                                        [found](X11Session& session) { *found = session.PointerPosition(); });
    });
    if (outcome != PictureOutcome::Ok || !*found)
        return false;
    position = **found;
    return true;
}

std::shared_ptr<const CursorImage> X11WindowServer::GetCursor() const {
    return m_hub->Cursor();
}

std::uint64_t X11WindowServer::GetMoment() const {
    return m_hub->Moment();
}

WindowPictureResult X11WindowServer::TakeWindowPicture(const WindowPictureRequest& request) {
    WindowPictureResult result;
    CmCallGuarded("[X11WindowServer::TakeWindowPicture]>>exception: ", [&] {
        struct Taking {
            const WindowPictureRequest request;
            WindowPictureResult result;
        };
        const auto taking = std::make_shared<Taking>(Taking{request, {}});
        result.outcome = m_hub->RunHereOrThere(request.deadline, [taking](X11Session& session) {
            taking->result = session.TakeWindowPicture(taking->request);
        });
        if (result.outcome == PictureOutcome::Ok)
            result = std::move(taking->result);
    });
    return result;
}

DisplayStreamResult X11WindowServer::OpenDisplayStream(const DisplayStreamRequest& request) {
    DisplayStreamResult result;
    CmCallGuarded("[X11WindowServer::OpenDisplayStream]>>exception: ", [&] {
        const View view = m_hub->Look();
        const bool isListed = std::any_of(view.displays->begin(), view.displays->end(),
                                          [&](const auto& each) { return each.id == request.display; });
        result.outcome = PictureOutcome::Lost;
        if (view.life.life != Life::Alive)
            return;
        if (view.Of(Capability::Streams) != Availability::Yes)
            result.outcome = PictureOutcome::Unsupported;
        else if (!isListed)
            result.outcome = PictureOutcome::Gone;
        else if (x11::StreamReaderPtr reader = m_hub->NewReader(request))
            result = {PictureOutcome::Ok, std::make_unique<x11::X11Stream>(m_hub, std::move(reader))};
    });
    return result;
}

void X11WindowServer::Rest() {
    m_hub->Rest();
}

bool X11WindowServer::BringToFront(pid_t pid) {
    const auto brought = std::make_shared<bool>(false);
    PictureOutcome outcome = PictureOutcome::Failed;
    CmCallGuarded("[X11WindowServer::BringToFront]>>exception: ", [&] {
        outcome = m_hub->Run(CmSteadyNow() + DEFAULT_IMAGE_DEADLINE,
                             [brought, pid](X11Session& session) { *brought = session.BringToFront(pid); });
    });
    return outcome == PictureOutcome::Ok && *brought;
}

} // namespace platform
