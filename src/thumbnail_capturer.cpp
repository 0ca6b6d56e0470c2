// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capturer.h"

#include "platform/core_graphics.h"
#include "platform/window_services.h"
#include "src/mac/share_util_mac.h"
#include "src/share_util.h"

#include <algorithm>
#include <cstddef>

namespace {

/// Windows may appear between the question for their number and the one for their list.
constexpr int LIST_SLACK = 8;

std::vector<int> ListOnScreenWindows(platform::CGSConnectionID connection) {
    int count = 0;
    platform::CGSGetOnScreenWindowCount(connection, 0, &count);
    std::vector<int> windows(static_cast<std::size_t>(count) + LIST_SLACK);
    int read = 0;
    platform::CGSGetOnScreenWindowList(connection, 0, count + LIST_SLACK, windows.data(), &read);
    windows.resize(static_cast<std::size_t>(std::min(count + LIST_SLACK, read)));
    return windows;
}

bool IsPickerWindow(platform::CGSConnectionID connection, unsigned window) {
    int level = -1;
    platform::CGSGetWindowLevel(connection, window, &level);
    return !ShareUtilMac::need_skip_window(window, level) &&
           level != platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey);
}

} // namespace

std::vector<unsigned> ListPickerWindows() {
    const platform::CGSConnectionID connection = platform::CGSDefaultConnection();
    std::vector<unsigned> wanted;
    for (const int id : ListOnScreenWindows(connection)) {
        const auto window = static_cast<unsigned>(id);
        if (IsPickerWindow(connection, window))
            wanted.push_back(window);
    }
    return wanted;
}

CThumbnailCapturer::~CThumbnailCapturer() = default;

bool CThumbnailCapturer::init() {
    return true;
}

void CThumbnailCapturer::stop() {}

bool CThumbnailCapturer::captureAppImage(unsigned pid, ImageData& image) {
    unsigned best = 0;
    int bestArea = 0;
    for (const unsigned window : ListPickerWindows()) {
        if (ShareUtil::GetPIDOfWindowHandle(window) != pid)
            continue;
        TVLRect rect{};
        ShareUtil::GetWindowRect(window, rect);
        const int area = ShareUtil::Area(rect);
        if (area <= bestArea)
            continue;
        best = window;
        bestArea = area;
    }
    return bestArea > 0 && captureWindowImage(best, image);
}
