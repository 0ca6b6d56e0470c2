// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_window_server.h"

#include "platform/simulated/desk.h"
#include "platform/simulated/simulated_stream.h"
#include "util/cm_guarded_call.h"

#include <utility>

/// The side of the simulated window server that its users see.
namespace platform {

namespace {

/// How long a look for the pointer may take.
constexpr std::chrono::nanoseconds POINTER_LIMIT = std::chrono::milliseconds(100);

/// At the end of a scope, when no lock is held, starts the thread if the scope gave it something to do.
class WakeAtEnd {
public:
    explicit WakeAtEnd(Desk& desk) : m_desk(desk) {}
    ~WakeAtEnd() { m_desk.Wake(); }
    WakeAtEnd(const WakeAtEnd&) = delete;
    WakeAtEnd& operator=(const WakeAtEnd&) = delete;

private:
    Desk& m_desk;
};

} // namespace

SimulatedWindowServer::SimulatedWindowServer(SimulatedDesktop desktop)
    : m_desk(Desk::Share(std::move(desktop))) {}

SimulatedWindowServer::~SimulatedWindowServer() {
    m_desk->Close();
}

const char* SimulatedWindowServer::Name() const {
    return "simulated";
}

LifeState SimulatedWindowServer::GetLife() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetLife);
    return entry.Fails() ? LifeState{Life::Lost, m_desk->Epoch()} : m_desk->GetLife(entry.lock);
}

Availability SimulatedWindowServer::GetCapability(Capability capability) const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetCapability);
    return entry.Fails() ? Availability::No : m_desk->GetCapability(capability, entry.lock);
}

Permission SimulatedWindowServer::GetPermission() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetPermission);
    return entry.Fails() ? Permission::Denied : m_desk->GetPermission(entry.lock);
}

void SimulatedWindowServer::AskPermission() {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::AskPermission);
    if (!entry.Fails())
        m_desk->AskPermission(entry.lock);
}

void SimulatedWindowServer::SetNoticeReceiver(std::shared_ptr<NoticeReceiver> receiver) {
    const WakeAtEnd wake(*m_desk);
    CmCallGuarded("[SimulatedWindowServer::SetNoticeReceiver]>>exception: ",
                  [&] { m_desk->SetReceiver(std::move(receiver)); });
}

std::shared_ptr<const DisplayList> SimulatedWindowServer::GetDisplays() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetDisplays);
    return entry.Fails() ? m_noDisplays : m_desk->GetDisplays(entry.lock);
}

std::shared_ptr<const WindowSnapshot> SimulatedWindowServer::GetWindows() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetWindows);
    return entry.Fails() ? m_noWindows : m_desk->GetWindows(entry.lock);
}

std::shared_ptr<const ApplicationList> SimulatedWindowServer::GetApplications() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetApplications);
    return entry.Fails() ? m_noApplications : m_desk->GetApplications(entry.lock);
}

bool SimulatedWindowServer::GetPointerPosition(CGPoint& position) const {
    const WakeAtEnd wake(*m_desk);
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetPointerPosition, POINTER_LIMIT);
    if (entry.Fails())
        return false;
    const std::optional<CGPoint> pointer = m_desk->GetPointer(entry.lock);
    if (pointer)
        position = *pointer;
    return pointer.has_value();
}

std::shared_ptr<const CursorImage> SimulatedWindowServer::GetCursor() const {
    const Desk::Entry entry = m_desk->Enter(SimulatedOperation::GetCursor);
    return entry.Fails() ? nullptr : m_desk->GetCursor(entry.lock);
}

std::uint64_t SimulatedWindowServer::GetMoment() const {
    return m_desk->GetMoment();
}

// Exceptions leave the lock behind before they are traced.

WindowPictureResult SimulatedWindowServer::TakeWindowPicture(const WindowPictureRequest& request) {
    const WakeAtEnd wake(*m_desk);
    WindowPictureResult result;
    CmCallGuarded("[SimulatedWindowServer::TakeWindowPicture]>>exception: ", [&] {
        const Desk::Entry entry =
            m_desk->EnterWaiting(SimulatedOperation::TakeWindowPicture, request.deadline);
        result = entry.Fails() ? WindowPictureResult{entry.outcome, nullptr}
                               : m_desk->TakeWindowPicture(request, entry.lock);
    });
    return result;
}

DisplayStreamResult SimulatedWindowServer::OpenDisplayStream(const DisplayStreamRequest& request) {
    const WakeAtEnd wake(*m_desk);
    DisplayStreamResult result;
    CmCallGuarded("[SimulatedWindowServer::OpenDisplayStream]>>exception: ",
                  [&] { result = OpenStream(request); });
    return result;
}

DisplayStreamResult SimulatedWindowServer::OpenStream(const DisplayStreamRequest& request) {
    std::shared_ptr<Desk::Reader> reader;
    {
        const Desk::Entry entry = m_desk->Enter(SimulatedOperation::OpenDisplayStream);
        if (entry.Fails())
            return {entry.outcome, nullptr};
        const PictureOutcome outcome = m_desk->OpenReader(request, reader, entry.lock);
        if (outcome != PictureOutcome::Ok)
            return {outcome, nullptr};
    }
    return {PictureOutcome::Ok, std::make_unique<SimulatedStream>(m_desk, std::move(reader))};
}

void SimulatedWindowServer::Rest() {
    { const Desk::Entry entry = m_desk->Enter(SimulatedOperation::Rest); }
    m_desk->Rest();
}

bool SimulatedWindowServer::BringToFront(pid_t pid) {
    bool brought = false;
    CmCallGuarded("[SimulatedWindowServer::BringToFront]>>exception: ", [&] {
        const Desk::Entry entry = m_desk->Enter(SimulatedOperation::BringToFront);
        brought = !entry.Fails() && m_desk->BringToFront(pid, entry.lock);
    });
    return brought;
}

} // namespace platform
