// SPDX-License-Identifier: Apache-2.0
#include "src/share_util.h"

#include "platform/window_services.h"
#include "src/mac/share_util_mac.h"
#include "util/cm_clock.h"
#include "util/cm_thread.h"

#include <algorithm>
#include <cstdint>

int ShareUtil::Extent(int from, int to) {
    return static_cast<int>(static_cast<std::uint32_t>(to) - static_cast<std::uint32_t>(from));
}

int ShareUtil::Sum(int a, int b) {
    return static_cast<int>(static_cast<std::uint32_t>(a) + static_cast<std::uint32_t>(b));
}

int ShareUtil::Area(const TVLRect& rect) {
    return static_cast<int>(static_cast<std::uint32_t>(Extent(rect.left, rect.right)) *
                            static_cast<std::uint32_t>(Extent(rect.top, rect.bottom)));
}

TVLRect ShareUtil::Intersect(const TVLRect& a, const TVLRect& b) {
    const TVLRect common{std::max(a.left, b.left), std::max(a.top, b.top), std::min(a.right, b.right),
                         std::min(a.bottom, b.bottom)};
    return common.left < common.right && common.top < common.bottom ? common : TVLRect{};
}

unsigned ShareUtil::GetPIDOfWindowHandle(unsigned window) {
    unsigned pid = SHARE_INVALID_PROCESS;
    FindPIDOfWindowHandle(window, pid);
    return pid;
}

bool ShareUtil::FindPIDOfWindowHandle(unsigned window, unsigned& pid) {
    pid = SHARE_INVALID_PROCESS;
    platform::CGSConnectionID owner = 0;
    const platform::CGError error =
        platform::CGSGetWindowOwner(platform::CGSDefaultConnection(), window, &owner);
    if (error == platform::kCGErrorFailure)
        return true;
    pid_t process = 0;
    if (error != platform::kCGErrorSuccess ||
        platform::CGSConnectionGetPID(owner, &process) != platform::kCGErrorSuccess)
        return false;
    pid = static_cast<unsigned>(process);
    return true;
}

void ShareUtil::GetWindowRect(unsigned window, TVLRect& rect) {
    platform::CGRect frame;
    platform::CGSGetScreenRectForWindow(platform::CGSDefaultConnection(), window, &frame);
    rect = ShareUtilMac::CGRectToTVLRect(frame);
}

unsigned ShareUtil::GetCurrentPID() {
    return CmProcessId();
}

unsigned ShareUtil::GetAppDisplayID(unsigned pid) {
    return ::GetAppDisplayID(static_cast<int>(pid));
}

unsigned ShareUtil::GetWindowDisplayID(unsigned window) {
    return ::GetWindowDisplayID(window);
}

std::string ShareUtil::TVLRectToString(const TVLRect& rect) {
    return "{left:" + std::to_string(rect.left) + ",top:" + std::to_string(rect.top) +
           ",right:" + std::to_string(rect.right) + ",bottom:" + std::to_string(rect.bottom) +
           ",width:" + std::to_string(Extent(rect.left, rect.right)) +
           ",height:" + std::to_string(Extent(rect.top, rect.bottom)) + "}";
}

unsigned ShareUtil::GetCaptureFrameTimeStamp() {
    const auto timestamp = static_cast<unsigned>(tick_policy::now() / 1000);
    return timestamp != 0 ? timestamp : 1;
}
