// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/window_server.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

namespace platform {

/// So many earlier pictures a picture can be traced back to: the two frames of an engine take turns, and a
/// queue has up to five more on their way.
inline constexpr std::size_t MOST_PICTURE_STEPS = 8;
/// A step of more rectangles is told by the box around them.
inline constexpr std::size_t MOST_RECTS_OF_STEP = 32;

/// A number for Picture::serial. Any thread; never 0.
std::uint64_t NextPictureSerial() noexcept;

/// The steps of a picture in which `changed` is different from `before`, which has the same size, format and
/// part. Empty when `before` has no number.
std::vector<PictureStep> StepsAfter(const Picture& before, const PixelRegion& changed);

/// What is different in `picture` from the one with that number, perhaps more and never less; nothing when
/// that isn't known, and then all of it may be.
std::optional<PixelRegion> ChangesSince(const Picture& picture, std::uint64_t serial);

} // namespace platform
