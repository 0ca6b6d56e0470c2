// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

/// Judges a picture that a viewer gets by the colour of its pixels alone.
///
/// The scene is painted for it: kept content has red 0, as has whatever stands in for something hidden; what
/// must not be seen is as red as can be. So any red at all is something of the latter, blended and scaled or
/// not. Threads: one at a time; nothing is kept. Units: points of the desktop, pixels of the frame.

enum class PrivacyRole {
    Kept,
    KeptOut,
};

struct PrivacyWindow {
    PrivacyRole role = PrivacyRole::KeptOut;
    platform::CGRect frame;
    std::uint32_t rgb = 0; ///< What a kept one is painted with, all over.
    float alpha = 1.0F;
    bool givesPixels = true;
};

/// The desktop as it was when the frame was taken, the front window first.
using PrivacyMoment = std::vector<PrivacyWindow>;

/// A picture of four bytes a pixel. Doesn't own its pixels.
struct PrivacyFrame {
    const std::uint8_t* pixels = nullptr;
    std::size_t stride = 0;
    int width = 0;
    int height = 0;
    /// Which byte of a pixel is which.
    int red = 0;
    int green = 1;
    int blue = 2;
    /// What of the desktop the frame shows.
    platform::CGRect rect;
};

/// Pixels by what they are and show.
struct PrivacyFindings {
    /// Wholly inside a visible window that is kept out, more than a pixel from every edge that is cut to
    /// whole points, and with nothing translucent of the kept in front.
    long forbidden = 0;
    /// Those of them that show red. The verdict.
    long leaks = 0;

    // Red pixels that are no leak, or can't be told to be one.
    long redNearEdges = 0;
    /// Kept windows that are not opaque, down to alpha 0, let through what lies behind them.
    long redThroughKept = 0;
    /// Where nothing red is, and never was by what the moment says.
    long redElsewhere = 0;

    /// Where an opaque kept window is in front of everything, and those that show it: life.
    long keptInFront = 0;
    long keptShown = 0;

    PrivacyFindings& operator+=(const PrivacyFindings& other);
};

PrivacyFindings JudgePrivacy(const PrivacyMoment& moment, const PrivacyFrame& frame);

/// One line for a log.
std::string ToString(const PrivacyFindings& findings);
