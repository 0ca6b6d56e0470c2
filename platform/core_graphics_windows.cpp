// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"

#include "platform/notices.h"
#include "platform/window_pins.h"
#include "platform/window_server.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <memory>

namespace platform {

namespace {

static_assert(static_cast<int>(SharingState::None) == kCGWindowSharingNone &&
                  static_cast<int>(SharingState::ReadOnly) == kCGWindowSharingReadOnly &&
                  static_cast<int>(SharingState::ReadWrite) == kCGWindowSharingReadWrite,
              "sharing states pass as they are");

std::string NameOf(pid_t owner, const ApplicationList& applications) {
    const auto found =
        std::find_if(applications.begin(), applications.end(),
                     [owner](const ApplicationInfo& application) { return application.pid == owner; });
    return found != applications.end() ? found->name : std::string();
}

CGWindowDescription Describe(const WindowInfo& window, const ApplicationList& applications) {
    CGWindowDescription description;
    description.kCGWindowNumber = window.id;
    description.kCGWindowLayer = window.level;
    description.kCGWindowBounds = window.frame;
    description.kCGWindowSharingState = static_cast<CGWindowSharingType>(window.sharing);
    description.kCGWindowAlpha = window.alpha;
    description.kCGWindowOwnerPID = window.owner;
    description.kCGWindowOwnerName = NameOf(window.owner, applications);
    description.kCGWindowName = window.title;
    description.kCGWindowIsOnscreen = window.onScreen;
    return description;
}

bool IsWanted(const WindowInfo& window, unsigned option) {
    if ((option & kCGWindowListOptionOnScreenOnly) != 0 && !window.onScreen)
        return false;
    return (option & kCGWindowListExcludeDesktopElements) == 0 || window.level >= 0;
}

} // namespace

std::vector<CGWindowDescription> CGWindowListCopyWindowInfo(unsigned option) noexcept {
    std::vector<CGWindowDescription> descriptions;
    const bool whole = CmCallGuarded("[CGWindowListCopyWindowInfo]>>exception: ", [&] {
        const std::shared_ptr<WindowServer> server = WindowServerInUse();
        const std::shared_ptr<const ApplicationList> applications = server->GetApplications();
        const std::shared_ptr<const WindowSnapshot> windows = server->GetWindows();
        for (const WindowInfo& window : windows->Windows()) {
            if (IsWanted(window, option))
                descriptions.push_back(Describe(window, *applications));
        }
    });
    return whole ? std::move(descriptions) : std::vector<CGWindowDescription>();
}

std::vector<CGWindowDescription> CGWindowListCreateDescriptionFromArray(
    std::span<const CGWindowID> windows) noexcept {
    std::vector<CGWindowDescription> descriptions;
    const bool whole = CmCallGuarded("[CGWindowListCreateDescriptionFromArray]>>exception: ", [&] {
        const std::shared_ptr<const ApplicationList> applications = WindowServerInUse()->GetApplications();
        const std::shared_ptr<const WindowSnapshot> known = WindowsForLookUp();
        for (const CGWindowID id : windows) {
            if (const WindowInfo* const window = known->Find(id))
                descriptions.push_back(Describe(*window, *applications));
        }
    });
    return whole ? std::move(descriptions) : std::vector<CGWindowDescription>();
}

} // namespace platform
