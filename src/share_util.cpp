// SPDX-License-Identifier: Apache-2.0
#include "src/share_util.h"

#include "util/cm_clock.h"

#include <cstdint>

int ShareUtil::Extent(int from, int to) {
    return static_cast<int>(static_cast<std::uint32_t>(to) - static_cast<std::uint32_t>(from));
}

int ShareUtil::Sum(int a, int b) {
    return static_cast<int>(static_cast<std::uint32_t>(a) + static_cast<std::uint32_t>(b));
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
