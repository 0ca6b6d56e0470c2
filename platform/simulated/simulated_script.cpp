// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desk.h"
#include "platform/simulated/simulated_window_server.h"

#include <algorithm>
#include <utility>

/// The script's side of the simulated window server.
namespace platform {

template <class Fn>
bool SimulatedWindowServer::ChangeDisplay(CGDirectDisplayID id, const Fn& change) {
    bool found = false;
    Change([&](SimulatedDesktop& desktop) {
        if (SimulatedDisplay* const display = FindDisplay(desktop, id)) {
            change(*display);
            found = true;
        }
    });
    return found;
}

template <class Fn>
bool SimulatedWindowServer::ChangeWindow(CGWindowID id, const Fn& change) {
    bool found = false;
    Change([&](SimulatedDesktop& desktop) {
        if (SimulatedWindow* const window = FindWindow(desktop, id)) {
            change(*window);
            found = true;
        }
    });
    return found;
}

void SimulatedWindowServer::Change(const std::function<void(SimulatedDesktop&)>& change) {
    m_desk->Change(change);
}

void SimulatedWindowServer::Show(SimulatedDesktop desktop) {
    Change([&desktop](SimulatedDesktop& now) { now = std::move(desktop); });
}

// ---- Displays

CGDirectDisplayID SimulatedWindowServer::AddDisplay(SimulatedDisplay display) {
    return m_desk->AddDisplay(std::move(display));
}

bool SimulatedWindowServer::RemoveDisplay(CGDirectDisplayID display) {
    bool removed = false;
    Change([&](SimulatedDesktop& desktop) {
        removed = std::erase_if(desktop.displays,
                                [display](const SimulatedDisplay& each) { return each.id == display; }) != 0;
        for (SimulatedDisplay& each : desktop.displays) {
            if (each.mirrors == display)
                each.mirrors = 0;
        }
    });
    return removed;
}

bool SimulatedWindowServer::MoveDisplay(CGDirectDisplayID display, CGPoint origin) {
    bool moved = false;
    Change([&](SimulatedDesktop& desktop) {
        SimulatedDisplay* const found = FindDisplay(desktop, display);
        moved = found != nullptr;
        if (!moved)
            return;
        if (found != &desktop.displays.front()) {
            found->bounds.origin = origin;
            return;
        }
        for (SimulatedDisplay& each : desktop.displays) {
            if (each.id != display)
                each.bounds.origin = {each.bounds.origin.x - origin.x, each.bounds.origin.y - origin.y};
        }
    });
    return moved;
}

bool SimulatedWindowServer::ResizeDisplay(CGDirectDisplayID display, CGSize size) {
    return ChangeDisplay(display, [&](SimulatedDisplay& each) { each.bounds.size = size; });
}

bool SimulatedWindowServer::ScaleDisplay(CGDirectDisplayID display, float scale) {
    return ChangeDisplay(display, [&](SimulatedDisplay& each) { each.scale = scale; });
}

bool SimulatedWindowServer::ReserveEdges(CGDirectDisplayID display, SimulatedEdges reserved) {
    return ChangeDisplay(display, [&](SimulatedDisplay& each) { each.reserved = reserved; });
}

bool SimulatedWindowServer::SetMainDisplay(CGDirectDisplayID display) {
    bool found = false;
    Change([&](SimulatedDesktop& desktop) {
        const auto place = std::find_if(
            desktop.displays.begin(), desktop.displays.end(),
            [&](const SimulatedDisplay& each) { return each.id == display && each.mirrors == 0; });
        found = place != desktop.displays.end();
        if (found)
            std::rotate(desktop.displays.begin(), place, place + 1);
    });
    return found;
}

bool SimulatedWindowServer::SetBackground(CGDirectDisplayID display, SimulatedContent background) {
    return ChangeDisplay(display, [&](SimulatedDisplay& each) { each.background = std::move(background); });
}

bool SimulatedWindowServer::MirrorDisplay(CGDirectDisplayID display, CGDirectDisplayID mirrored) {
    bool done = false;
    Change([&](SimulatedDesktop& desktop) {
        SimulatedDisplay* const mirror = FindDisplay(desktop, display);
        const SimulatedDisplay* const other = FindDisplay(desktop, mirrored);
        const bool canMirror = other != nullptr && other != mirror && other->mirrors == 0;
        done = mirror != nullptr && (mirrored == 0 || canMirror);
        if (done)
            mirror->mirrors = mirrored;
    });
    return done;
}

// ---- Windows

CGWindowID SimulatedWindowServer::AddWindow(SimulatedWindow window) {
    return m_desk->AddWindow(std::move(window));
}

bool SimulatedWindowServer::CloseWindow(CGWindowID window) {
    bool closed = false;
    Change([&](SimulatedDesktop& desktop) {
        closed = std::erase_if(desktop.windows,
                               [window](const SimulatedWindow& each) { return each.info.id == window; }) != 0;
    });
    return closed;
}

bool SimulatedWindowServer::MoveWindow(CGWindowID window, CGPoint origin) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.frame.origin = origin; });
}

bool SimulatedWindowServer::SetFrame(CGWindowID window, const CGRect& frame) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.frame = frame; });
}

bool SimulatedWindowServer::SetContent(CGWindowID window, SimulatedContent content) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.content = std::move(content); });
}

bool SimulatedWindowServer::SetTitle(CGWindowID window, std::string title) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.title = std::move(title); });
}

bool SimulatedWindowServer::SetOwner(CGWindowID window, pid_t owner) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.owner = owner; });
}

bool SimulatedWindowServer::SetLevel(CGWindowID window, int level) {
    bool found = false;
    Change([&](SimulatedDesktop& desktop) {
        if (SimulatedWindow* const each = FindWindow(desktop, window)) {
            each->info.level = level;
            found = RaiseInItsLevel(desktop, window);
        }
    });
    return found;
}

bool SimulatedWindowServer::SetAlpha(CGWindowID window, float alpha) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.alpha = alpha; });
}

bool SimulatedWindowServer::SetSharing(CGWindowID window, SharingState sharing) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.sharing = sharing; });
}

bool SimulatedWindowServer::SetOnScreen(CGWindowID window, bool onScreen) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.info.onScreen = onScreen; });
}

bool SimulatedWindowServer::SetShadow(CGWindowID window, SimulatedEdges shadow) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.shadow = shadow; });
}

bool SimulatedWindowServer::SetKnown(CGWindowID window, bool known) {
    return ChangeWindow(window, [&](SimulatedWindow& each) { each.known = known; });
}

bool SimulatedWindowServer::RaiseWindow(CGWindowID window) {
    bool raised = false;
    Change([&](SimulatedDesktop& desktop) { raised = RaiseInItsLevel(desktop, window); });
    return raised;
}

bool SimulatedWindowServer::LowerWindow(CGWindowID window) {
    bool lowered = false;
    Change([&](SimulatedDesktop& desktop) { lowered = LowerInItsLevel(desktop, window); });
    return lowered;
}

bool SimulatedWindowServer::PutWindowAbove(CGWindowID window, CGWindowID below) {
    bool put = false;
    Change([&](SimulatedDesktop& desktop) { put = PutAbove(desktop, window, below); });
    return put;
}

// ---- Applications, pointer, cursor

bool SimulatedWindowServer::StartApplication(ApplicationInfo application) {
    bool started = false;
    Change([&](SimulatedDesktop& desktop) {
        ApplicationList& running = desktop.applications;
        started = std::none_of(running.begin(), running.end(),
                               [&](const ApplicationInfo& each) { return each.pid == application.pid; });
        if (started)
            running.push_back(std::move(application));
    });
    return started;
}

bool SimulatedWindowServer::EndApplication(pid_t pid) {
    bool ended = false;
    Change([&](SimulatedDesktop& desktop) {
        ended = std::erase_if(desktop.applications,
                              [pid](const ApplicationInfo& each) { return each.pid == pid; }) != 0;
        if (ended)
            std::erase_if(desktop.windows,
                          [pid](const SimulatedWindow& each) { return each.info.owner == pid; });
    });
    return ended;
}

void SimulatedWindowServer::SetPointer(std::optional<CGPoint> position) {
    Change([&](SimulatedDesktop& desktop) { desktop.pointer = position; });
}

void SimulatedWindowServer::SetCursor(std::optional<SimulatedCursor> cursor) {
    Change([&](SimulatedDesktop& desktop) { desktop.cursor = std::move(cursor); });
}

// ---- Life and rights

void SimulatedWindowServer::SetPermission(Permission permission) {
    m_desk->SetPermission(permission);
}

void SimulatedWindowServer::SetCapability(Capability capability, Availability availability) {
    m_desk->SetCapability(capability, availability);
}

void SimulatedWindowServer::SetPointerModes(bool without, bool with) {
    m_desk->SetPointerModes(without, with);
}

void SimulatedWindowServer::TellMoments(bool tells) {
    m_desk->TellMoments(tells);
}

void SimulatedWindowServer::SetPictureLag(std::chrono::nanoseconds lag) {
    m_desk->SetPictureLag(lag);
}

void SimulatedWindowServer::Stall() {
    m_desk->ChangeLife(Life::Alive, Life::Stalled);
}

void SimulatedWindowServer::Answer() {
    m_desk->ChangeLife(Life::Stalled, Life::Alive);
}

void SimulatedWindowServer::Lose() {
    m_desk->ChangeLife(std::nullopt, Life::Lost);
}

void SimulatedWindowServer::FindAgain() {
    m_desk->ChangeLife(Life::Lost, Life::Alive);
}

// ---- Failures, delays, counts

void SimulatedWindowServer::FailNext(SimulatedOperation operation, PictureOutcome outcome) {
    FailNth(operation, 1, outcome);
}

void SimulatedWindowServer::FailNth(SimulatedOperation operation, unsigned nth, PictureOutcome outcome) {
    m_desk->Script().Fail(operation, nth, 1, outcome);
}

void SimulatedWindowServer::FailAlways(SimulatedOperation operation, PictureOutcome outcome) {
    m_desk->Script().Fail(operation, 1, OperationScript::ALL, outcome);
}

void SimulatedWindowServer::DelayNext(SimulatedOperation operation, std::chrono::nanoseconds delay) {
    m_desk->Script().Delay(operation, 1, 1, delay);
}

void SimulatedWindowServer::DelayAlways(SimulatedOperation operation, std::chrono::nanoseconds delay) {
    m_desk->Script().Delay(operation, 1, OperationScript::ALL, delay);
}

void SimulatedWindowServer::DoAt(SimulatedOperation operation, unsigned nth, std::function<void()> action) {
    m_desk->Script().Do(operation, nth, std::move(action));
}

void SimulatedWindowServer::Heal(SimulatedOperation operation) {
    m_desk->Script().Heal(operation);
}

unsigned SimulatedWindowServer::CallsOf(SimulatedOperation operation) const {
    return m_desk->Script().CallsOf(operation);
}

void SimulatedWindowServer::Lie(SimulatedLie lie, bool tells) {
    m_desk->SetLie(lie, tells);
}

} // namespace platform
