// SPDX-License-Identifier: Apache-2.0
#include "tools/desktop_lists.h"

#include "platform/utf8.h"
#include "src/mac/monitor_enum_mac.h"

#include <screenshare/share_engine.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <memory>

namespace {

struct DestroyEnumerator {
    void operator()(IShareSourceEnumerator* enumerator) const { DestroyShareSourceEnumerator(enumerator); }
};

struct ReleaseSource {
    void operator()(IShareSource* source) const { source->Release(); }
};
using SourceHandle = std::unique_ptr<IShareSource, ReleaseSource>;

std::vector<SourceHandle> ApplicationSources() {
    const std::unique_ptr<IShareSourceEnumerator, DestroyEnumerator> enumerator(
        CreateShareSourceEnumerator(SHARE_SOURCE_ENUMERATOR_TYPE_APP, false));
    if (enumerator == nullptr)
        return {};
    enumerator->Refresh();
    int count = 0;
    enumerator->GetNumber(count);
    std::vector<SourceHandle> sources;
    for (int i = 0; i < count; ++i) {
        IShareSource* source = nullptr;
        if (enumerator->GetSource(i, &source) == SHARE_RESULT_OK)
            sources.emplace_back(source);
    }
    return sources;
}

bool IsListed(const std::vector<ListedApplication>& applications, unsigned pid) {
    return std::any_of(applications.begin(), applications.end(),
                       [pid](const ListedApplication& application) { return application.pid == pid; });
}

void CountWindows(std::vector<ListedApplication>& applications) {
    for (const platform::CGWindowDescription& window : ListWindows()) {
        for (ListedApplication& application : applications) {
            if (application.pid == static_cast<unsigned>(window.kCGWindowOwnerPID))
                ++application.windows;
        }
    }
}

} // namespace

std::vector<ListedMonitor> ListMonitors() {
    std::uint32_t count = 0;
    platform::CGGetOnlineDisplayList(0, nullptr, &count);
    std::vector<platform::CGDirectDisplayID> displays(count);
    platform::CGGetOnlineDisplayList(count, displays.data(), &count);
    // One may have gone since it was counted.
    if (count < displays.size())
        displays.resize(count);

    std::vector<ListedMonitor> monitors;
    monitors.reserve(displays.size());
    for (const platform::CGDirectDisplayID display : displays)
        monitors.push_back({display, platform::DisplayProductName(display),
                            platform::CGDisplayBounds(display),
                            CMonitorEnumMac::screenScaleFactorForDisplayID(display)});
    return monitors;
}

std::vector<platform::CGWindowDescription> ListWindows() {
    return platform::CGWindowListCopyWindowInfo(platform::kCGWindowListOptionOnScreenOnly);
}

std::vector<ListedApplication> ListApplications() {
    std::vector<ListedApplication> applications;
    for (const SourceHandle& source : ApplicationSources()) {
        const auto pid = static_cast<unsigned>(source->GetSourceUniqueId());
        std::array<char, SHARE_SOURCE_TEXT_SIZE + 1> name{};
        // Without a name it has ended since it was listed.
        if (IsListed(applications, pid) ||
            source->GetName(name.data(), SHARE_SOURCE_TEXT_SIZE) != SHARE_RESULT_OK)
            continue;
        // A long name is cut, perhaps within a character.
        applications.push_back({pid, platform::MendedUtf8(name.data()), 0});
    }
    CountWindows(applications);
    return applications;
}
