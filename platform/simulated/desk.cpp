// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desk.h"

#include "platform/desktop_notices.h"

#include <algorithm>
#include <memory>
#include <utility>

namespace platform {

namespace {

std::vector<WindowInfo> InfosOf(const std::vector<SimulatedWindow>& windows) {
    std::vector<WindowInfo> infos;
    infos.reserve(windows.size());
    for (const SimulatedWindow& window : windows)
        infos.push_back(window.info);
    return infos;
}

bool SameTitles(const std::vector<WindowInfo>& one, const std::vector<WindowInfo>& other) {
    return std::equal(
        one.begin(), one.end(), other.begin(), other.end(),
        [](const WindowInfo& first, const WindowInfo& second) { return first.title == second.title; });
}

PicturePtr CursorPicture(const SimulatedCursor::Representation& representation,
                         std::chrono::nanoseconds now) {
    SimulatedPixels pixels = NewPixels(representation.width, representation.height);
    PaintContent(representation.content, 0, {0, 0, pixels.width, pixels.height}, pixels);
    const CGSize size{static_cast<float>(pixels.width) / representation.scale,
                      static_cast<float>(pixels.height) / representation.scale};
    return std::make_shared<const Picture>(
        MakePicture(pixels, {PixelFormat::BGRA, 0, {{}, size}, representation.scale}, now));
}

} // namespace

Desk::Desk(SimulatedDesktop desktop) : m_beginning(CmSteadyNow()) {
    m_generations.emplace_back(m_beginning, m_generation);
    Change([&desktop](SimulatedDesktop& now) { now = std::move(desktop); });
}

// ---- The script's side

void Desk::Change(const std::function<void(SimulatedDesktop&)>& change) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    std::vector<SimulatedWindow> before = m_desktop.windows;
    m_moment = NewMoment(); // first: a change that throws may have done a part
    change(m_desktop);
    Mend(m_desktop);
    for (SimulatedWindow& window : m_desktop.windows) {
        if (window.info.id == 0)
            window.info.id = FreshWindowId();
        m_usedIds.insert(window.info.id);
    }
    MoveOriginToMainDisplay(m_desktop);
    m_painter.Forget(m_desktop);
    if (!SameStack(InfosOf(before), InfosOf(m_desktop.windows)))
        m_formerWindows = std::move(before);
    Settle();
}

CGWindowID Desk::AddWindow(SimulatedWindow window) {
    CGWindowID id = 0;
    Change([&](SimulatedDesktop& desktop) {
        if (m_usedIds.count(window.info.id) != 0)
            return;
        if (window.info.id == 0)
            window.info.id = FreshWindowId();
        id = window.info.id;
        PutAtFrontOfItsLevel(desktop, std::move(window));
    });
    return id;
}

CGWindowID Desk::FreshWindowId() const {
    return m_usedIds.empty() ? 1 : *m_usedIds.rbegin() + 1;
}

CGDirectDisplayID Desk::AddDisplay(SimulatedDisplay display) {
    CGDirectDisplayID id = 0;
    Change([&](SimulatedDesktop& desktop) {
        if (FindDisplay(desktop, display.id) != nullptr)
            return;
        desktop.displays.push_back(std::move(display));
        Mend(desktop);
        id = desktop.displays.back().id;
    });
    return id;
}

void Desk::ChangeLife(std::optional<Life> from, Life to) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    if (!from || m_life.life == *from)
        SetLifeNow(to);
}

void Desk::SetPermission(Permission permission) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    if (m_permission == permission)
        return;
    m_permission = permission;
    Tell(NoticeKind::PermissionChanged);
    Settle();
}

void Desk::SetCapability(Capability capability, Availability availability) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_capabilities[capability] = availability;
    Settle();
}

void Desk::SetPointerModes(bool without, bool with) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_withoutPointer = without;
    m_withPointer = with;
}

void Desk::SetPictureLag(Nanoseconds lag) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_lag = lag;
}

void Desk::TellMoments(bool tells) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_tellsMoments = tells;
}

void Desk::SetLie(SimulatedLie lie, bool tells) {
    if (InForkedChild())
        return;
    const Lock lock = m_point.Acquire();
    m_moment = NewMoment();
    if (tells)
        m_lies.insert(lie);
    else
        m_lies.erase(lie);
    m_painter.KeepOldPixels(Tells(SimulatedLie::OldPixelsKept));
    m_painter.ForgetChanges(Tells(SimulatedLie::ChangesForgotten));
    Settle();
}

// ---- What the server tells

Availability Desk::AvailabilityOf(Capability capability) const {
    const auto set = m_capabilities.find(capability);
    const Availability availability = set != m_capabilities.end() ? set->second : Availability::Yes;
    return availability == Availability::AfterPermission && HasPermission() ? Availability::Yes
                                                                            : availability;
}

bool Desk::HasPermission() const {
    return m_permission == Permission::NotNeeded || m_permission == Permission::Granted;
}

void Desk::AskPermission(const Lock&) {
    if (m_permission != Permission::NotAsked || m_life.life != Life::Alive)
        return;
    m_permission = Permission::Asking;
    Tell(NoticeKind::PermissionChanged);
}

bool Desk::BringToFront(pid_t pid, const Lock&) {
    if (m_life.life != Life::Alive || !IsAvailable(Capability::Activation))
        return false;
    std::vector<SimulatedWindow> before = m_desktop.windows;
    if (!RaiseWindowsOf(m_desktop, pid))
        return false;
    m_formerWindows = std::move(before);
    Settle();
    return true;
}

void Desk::Tell(const Notice& notice) {
    if (m_receiver != nullptr)
        m_receiver->OnNotice(notice);
}

void Desk::Tell(NoticeKind kind) {
    Notice notice;
    notice.kind = kind;
    Tell(notice);
}

void Desk::SetLifeNow(Life life) {
    if (m_life.life == life)
        return;
    if (m_life.life == Life::Lost)
        m_epoch = ++m_life.epoch;
    m_life.life = life;
    m_stallEnds.reset();
    Tell(NoticeKind::LifeChanged);
    Settle();
}

/// After every change: tells what is to be told and wakes who waits for it.
void Desk::Settle() {
    m_moment = NewMoment();
    // A server that doesn't answer tells of nothing either.
    if (m_life.life != Life::Stalled && !m_closed) {
        PublishDisplays();
        PublishWindows();
        PublishApplications();
        PublishCursor();
        ++m_looks;
        EndReaders();
        TellReaders();
    }
    m_threadWanted = m_stallEnds.has_value() || (m_receiver != nullptr && !m_readers.empty());
    m_point.NotifyAll();
}

void Desk::PublishDisplays() {
    auto displays = std::make_shared<DisplayList>();
    if (m_life.life != Life::Lost)
        *displays = ListDisplays(m_desktop);
    if (*displays == *m_displays)
        return;
    const std::vector<Notice> notices = DisplayNotices(*m_displays, *displays);
    m_displays = std::move(displays);
    for (const Notice& notice : notices)
        Tell(notice);
}

std::vector<WindowInfo> Desk::ListWindows() const {
    if (m_life.life == Life::Lost || AvailabilityOf(Capability::Windows) == Availability::AfterPermission)
        return {};
    if (IsAvailable(Capability::Windows))
        return InfosOf(m_desktop.windows);
    std::vector<WindowInfo> infos;
    for (const DisplayInfo& display : *m_displays) {
        WindowInfo info;
        info.id = WindowOfDisplay(display.id);
        info.level = SIMULATED_LEVEL_DESKTOP;
        info.frame = display.bounds;
        info.title = display.productName;
        infos.push_back(std::move(info));
    }
    return infos;
}

void Desk::PublishWindows() {
    std::vector<WindowInfo> windows = ListWindows();
    const bool restacked = !SameStack(windows, m_stack);
    if (restacked) {
        const Nanoseconds now = CmSteadyNow();
        while (m_generations.size() > 1 && m_generations[1].first <= now - m_lag)
            m_generations.erase(m_generations.begin());
        m_generations.emplace_back(now, ++m_generation);
    }
    const std::vector<WindowInfo> former = std::exchange(m_stack, windows);
    const bool unknown = std::any_of(m_desktop.windows.begin(), m_desktop.windows.end(),
                                     [](const SimulatedWindow& each) { return !each.known; });
    if (unknown && !windows.empty())
        return;
    if (m_windows->Generation() == m_generation && SameTitles(m_windows->Windows(), windows))
        return;
    if (restacked && Tells(SimulatedLie::StaleList))
        windows = former;
    m_windows = std::make_shared<WindowSnapshot>(m_generation, std::move(windows));
}

void Desk::PublishApplications() {
    const bool tells = m_life.life != Life::Lost && IsAvailable(Capability::Applications);
    m_applications = std::make_shared<ApplicationList>(tells ? m_desktop.applications : ApplicationList());
    if (!tells)
        return; // that they can't be seen doesn't mean that they have ended
    const std::vector<Notice> notices = ApplicationNotices(m_knownApplications, *m_applications);
    m_knownApplications = *m_applications;
    for (const Notice& notice : notices) {
        Tell(notice);
        if (notice.kind == NoticeKind::ApplicationEnded && Tells(SimulatedLie::EndToldTwice))
            Tell(notice);
    }
}

void Desk::PublishCursor() {
    const bool lost = m_life.life == Life::Lost;
    m_pointer = lost ? std::nullopt : m_desktop.pointer;
    if (m_cursorSource != m_desktop.cursor) {
        m_cursorSource = m_desktop.cursor;
        m_cursorImage = nullptr;
        if (m_cursorSource && !m_cursorSource->representations.empty()) {
            auto image = std::make_shared<CursorImage>();
            image->serial = ++m_lastSerial;
            image->hotSpot = m_cursorSource->hotSpot;
            for (const SimulatedCursor::Representation& each : m_cursorSource->representations)
                image->representations.push_back(CursorPicture(each, CmSteadyNow()));
            m_cursorImage = std::move(image);
        }
    }
    m_cursor = lost ? nullptr : m_cursorImage;
}

std::optional<CGPoint> Desk::GetPointer(const Lock&) const {
    return IsAvailable(Capability::Pointer) ? m_pointer : std::nullopt;
}

std::shared_ptr<const CursorImage> Desk::GetCursor(const Lock&) const {
    return IsAvailable(Capability::Cursor) ? m_cursor : nullptr;
}

} // namespace platform
