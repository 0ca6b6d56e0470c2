// SPDX-License-Identifier: Apache-2.0
#include "platform/none/none_window_server.h"

namespace platform {

const char* NoneWindowServer::Name() const {
    return "none";
}

LifeState NoneWindowServer::GetLife() const {
    return {};
}

Availability NoneWindowServer::GetCapability(Capability) const {
    return Availability::No;
}

Permission NoneWindowServer::GetPermission() const {
    // Denied would have people look for a switch that doesn't exist.
    return Permission::NotNeeded;
}

void NoneWindowServer::AskPermission() {}

void NoneWindowServer::SetNoticeReceiver(std::shared_ptr<NoticeReceiver>) {}

std::shared_ptr<const DisplayList> NoneWindowServer::GetDisplays() const {
    return m_noDisplays;
}

std::shared_ptr<const WindowSnapshot> NoneWindowServer::GetWindows() const {
    return m_noWindows;
}

std::shared_ptr<const ApplicationList> NoneWindowServer::GetApplications() const {
    return m_noApplications;
}

bool NoneWindowServer::GetPointerPosition(CGPoint&) const {
    return false;
}

std::shared_ptr<const CursorImage> NoneWindowServer::GetCursor() const {
    return nullptr;
}

WindowPictureResult NoneWindowServer::TakeWindowPicture(const WindowPictureRequest&) {
    return {PictureOutcome::Unsupported, nullptr};
}

DisplayStreamResult NoneWindowServer::OpenDisplayStream(const DisplayStreamRequest&) {
    return {PictureOutcome::Unsupported, nullptr};
}

void NoneWindowServer::Rest() {}

bool NoneWindowServer::BringToFront(pid_t) {
    return false;
}

} // namespace platform
