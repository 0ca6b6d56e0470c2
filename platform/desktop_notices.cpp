// SPDX-License-Identifier: Apache-2.0
#include "platform/desktop_notices.h"

#include <algorithm>

namespace platform {

namespace {

const DisplayInfo* Find(const DisplayList& displays, CGDirectDisplayID id) {
    const auto found =
        std::find_if(displays.begin(), displays.end(), [id](const auto& each) { return each.id == id; });
    return found != displays.end() ? &*found : nullptr;
}

bool IsMain(const DisplayList& displays, CGDirectDisplayID id) {
    return !displays.empty() && displays.front().id == id;
}

unsigned ChangesOf(const DisplayInfo& before, const DisplayInfo& after) {
    unsigned flags = 0;
    if (before.bounds.origin != after.bounds.origin)
        flags |= DisplayMoved | DisplayDesktopShapeChanged;
    if (before.bounds.size != after.bounds.size)
        flags |= DisplaySetMode | DisplayDesktopShapeChanged;
    if (before.scale != after.scale)
        flags |= DisplaySetMode;
    return flags;
}

Notice DisplayNotice(CGDirectDisplayID display, unsigned flags) {
    Notice notice;
    notice.kind = NoticeKind::DisplayChanged;
    notice.display = display;
    notice.flags = flags;
    return notice;
}

bool Lists(const ApplicationList& applications, pid_t pid) {
    return std::any_of(applications.begin(), applications.end(),
                       [pid](const ApplicationInfo& each) { return each.pid == pid; });
}

/// A notice for each of `some` that isn't among `others`.
void AddNotices(std::vector<Notice>& notices, NoticeKind kind, const ApplicationList& some,
                const ApplicationList& others) {
    for (const ApplicationInfo& application : some) {
        if (Lists(others, application.pid))
            continue;
        Notice notice;
        notice.kind = kind;
        notice.pid = application.pid;
        notices.push_back(notice);
    }
}

} // namespace

std::vector<Notice> DisplayNotices(const DisplayList& before, const DisplayList& after) {
    std::vector<Notice> notices;
    for (const DisplayInfo& display : before) {
        if (Find(after, display.id) == nullptr)
            notices.push_back(DisplayNotice(display.id, DisplayRemoved | DisplayDisabled));
    }
    for (const DisplayInfo& display : after) {
        const DisplayInfo* const former = Find(before, display.id);
        unsigned flags = former != nullptr ? ChangesOf(*former, display) : DisplayAdded | DisplayEnabled;
        if (IsMain(after, display.id) && !IsMain(before, display.id))
            flags |= DisplaySetMain;
        if (flags != 0)
            notices.push_back(DisplayNotice(display.id, flags));
    }
    return notices;
}

std::vector<Notice> ApplicationNotices(const ApplicationList& before, const ApplicationList& after) {
    std::vector<Notice> notices;
    AddNotices(notices, NoticeKind::ApplicationEnded, before, after);
    AddNotices(notices, NoticeKind::ApplicationLaunched, after, before);
    return notices;
}

} // namespace platform
