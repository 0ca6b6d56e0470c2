// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"

#include "platform/notices.h"
#include "platform/window_server.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <memory>

namespace platform {

namespace {

CGRect CountedFromBottom(const CGRect& rect, CGFloat mainHeight) {
    return {{rect.origin.x, mainHeight - (rect.origin.y + rect.size.height)}, rect.size};
}

NoticeKinds KindOf(NSNotificationName name) {
    return NoticeKindBit(name == NSWorkspaceDidLaunchApplicationNotification ? NoticeKind::ApplicationLaunched
                                                                             : NoticeKind::ApplicationEnded);
}

NoticeKey KeyOf(const void* observer, NSNotificationName name) {
    return {reinterpret_cast<std::uintptr_t>(observer), static_cast<std::uintptr_t>(name)};
}

} // namespace

std::vector<NSScreen> NSScreen::screens() noexcept {
    std::vector<NSScreen> screens;
    const bool whole = CmCallGuarded("[NSScreen::screens]>>exception: ", [&] {
        const std::shared_ptr<const DisplayList> displays = WindowServerInUse()->GetDisplays();
        for (const DisplayInfo& display : *displays) {
            const CGFloat mainHeight = displays->front().bounds.size.height;
            NSScreen screen;
            screen.m_description.NSScreenNumber = display.id;
            screen.m_frame = CountedFromBottom(display.bounds, mainHeight);
            screen.m_visibleFrame = CountedFromBottom(display.visibleBounds, mainHeight);
            screen.m_scale = display.scale;
            screens.push_back(screen);
        }
    });
    return whole ? std::move(screens) : std::vector<NSScreen>();
}

bool NSNotificationCenter::addObserver(const void* observer,
                                       std::function<void(const NSNotification&)> selector,
                                       NSNotificationName name) noexcept {
    if (selector == nullptr)
        return false;
    bool added = false;
    CmCallGuarded("[NSNotificationCenter::addObserver]>>exception: ", [&] {
        added = AddNoticeHandler(KindOf(name), KeyOf(observer, name),
                                 [selector = std::move(selector), name](const Notice& notice) {
                                     selector({name, {notice.pid}});
                                 });
    });
    return added;
}

void NSNotificationCenter::removeObserver(const void* observer) noexcept {
    for (const NSNotificationName name :
         {NSWorkspaceDidLaunchApplicationNotification, NSWorkspaceDidTerminateApplicationNotification}) {
        while (RemoveNoticeHandler(KindOf(name), KeyOf(observer, name))) {
        }
    }
}

NSWorkspace* NSWorkspace::sharedWorkspace() noexcept {
    static constinit NSWorkspace workspace;
    return &workspace;
}

std::optional<NSRunningApplication> NSRunningApplication::runningApplicationWithProcessIdentifier(
    pid_t pid) noexcept {
    std::optional<NSRunningApplication> application;
    CmCallGuarded("[NSRunningApplication]>>exception: ", [&] {
        const std::shared_ptr<const ApplicationList> applications = WindowServerInUse()->GetApplications();
        const auto found = std::find_if(applications->begin(), applications->end(),
                                        [pid](const ApplicationInfo& each) { return each.pid == pid; });
        if (found != applications->end())
            application = NSRunningApplication(pid, found->name);
    });
    return application;
}

bool NSRunningApplication::activateWithOptions(unsigned) const noexcept {
    return WindowServerInUse()->BringToFront(m_pid);
}

} // namespace platform
