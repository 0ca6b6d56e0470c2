// SPDX-License-Identifier: Apache-2.0
#include "platform/picture_changes.h"

#include <algorithm>
#include <atomic>
#include <utility>

namespace platform {

std::uint64_t NextPictureSerial() noexcept {
    static std::atomic<std::uint64_t> last{0};
    return ++last;
}

std::vector<PictureStep> StepsAfter(const Picture& before, const PixelRegion& changed) {
    if (before.serial == 0)
        return {};
    std::vector<PixelRect> rects = changed.Rects();
    if (rects.size() > MOST_RECTS_OF_STEP)
        rects.assign(1, changed.Bounds());
    std::vector<PictureStep> steps;
    steps.reserve(MOST_PICTURE_STEPS);
    steps.push_back({before.serial, std::move(rects)});
    const std::size_t kept = std::min(before.steps.size(), MOST_PICTURE_STEPS - 1);
    steps.insert(steps.end(), before.steps.begin(), before.steps.begin() + static_cast<std::ptrdiff_t>(kept));
    return steps;
}

std::optional<PixelRegion> ChangesSince(const Picture& picture, std::uint64_t serial) {
    PixelRegion changes;
    if (serial == 0)
        return std::nullopt;
    if (picture.serial == serial)
        return changes;
    for (const PictureStep& step : picture.steps) {
        for (const PixelRect& rect : step.changed)
            changes.Add(rect);
        if (step.serial == serial)
            return changes;
    }
    return std::nullopt;
}

} // namespace platform
